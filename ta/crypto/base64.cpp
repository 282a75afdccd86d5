// SPDX-License-Identifier: BSD-2-Clause
#include "crypto/base64.h"

#include "failure.h"
#include "ownership.h"

// Characters are classified by comparing, a block at a time, and never looked up: what is encoded
// and decoded here may be a private key, and a table would show its bytes to whoever shares the
// cache.

namespace {

// Without vector registers the compiler writes out what happens to each character, and a block of
// sixteen costs four times the code of one of four.
#if defined(__SSE2__) || defined(__ARM_NEON)
constexpr uint32_t kNumCharacters = 16;
#else
constexpr uint32_t kNumCharacters = 4;
#endif
constexpr uint32_t kNumQuartets = kNumCharacters / 4;
constexpr uint32_t kBlockLen = kNumQuartets * 3;  // bytes behind that many characters

using characters = int8_t __attribute__((vector_size(kNumCharacters)));
using octets = uint8_t __attribute__((vector_size(kNumCharacters)));
using quartets = uint32_t __attribute__((vector_size(kNumCharacters)));  // the same, four by four

struct alphabet {
  int8_t value_62;
  int8_t value_63;
  char padding;  // 0: none
  int8_t distance_62 = 62 - value_62;
  int8_t distance_63 = 63 - value_63;
};
constexpr alphabet kStandard = {'+', '/', '='};
constexpr alphabet kUrl = {'-', '_', 0};

// Distance from a character to its value, in each range that is the same in all alphabets.
constexpr int8_t kUpper = 0 - 'A';
constexpr int8_t kLower = 26 - 'a';
constexpr int8_t kDigit = 52 - '0';

constexpr bool kLittleEndian = __BYTE_ORDER__ == __ORDER_LITTLE_ENDIAN__;

}  // namespace

// Between memory and numbers whose first byte is the lowest.
static inline quartets first_byte_lowest(quartets numbers) {
  if (kLittleEndian) return numbers;
  for (uint32_t i = 0; i < kNumQuartets; ++i) numbers[i] = __builtin_bswap32(numbers[i]);
  return numbers;
}

// ---- Encoding

static uint32_t load_big_endian(const uint8_t *bytes) {
  uint32_t number;
  memcpy(&number, bytes, sizeof number);
  return kLittleEndian ? __builtin_bswap32(number) : number;
}

// Reads one byte more than it encodes.
template <const alphabet &To>
static void encode_block(const uint8_t *bytes, char *text) {
  uint32_t groups[kNumQuartets];
#pragma GCC unroll 4
  for (uint32_t i = 0; i < kNumQuartets; ++i) groups[i] = load_big_endian(bytes + 3 * i);
  quartets bits;
  memcpy(&bits, groups, sizeof bits);
  const quartets pairs = bits >> 20 | ((bits << 8) & 0x0FFF0000);
  const quartets split = first_byte_lowest(((pairs >> 6) & 0x003F003F) | (pairs & 0x003F003F) << 8);
  characters values;
  memcpy(&values, &split, sizeof values);

  // Each range adds what its distance differs by from that of the one before.
  constexpr int8_t kStepLower = kUpper - kLower;
  constexpr int8_t kStepDigit = kLower - kDigit;
  constexpr int8_t kStep62 = kDigit - To.distance_62;
  constexpr int8_t kStep63 = To.distance_62 - To.distance_63;
  values += ((values > 25) & kStepLower) + ((values > 51) & kStepDigit) +
            ((values > 61) & kStep62) + ((values > 62) & kStep63) - kUpper;
  memcpy(text, &values, sizeof values);
}

static uint32_t num_characters_for(uint32_t num_bytes) {
  return (num_bytes * 8 + 5) / 6;
}

template <const alphabet &To>
static void encode_to(const uint8_t *data, uint32_t len, char *at) {
  const char *end = at + base64_room(len) - 1;
  for (; len > kBlockLen; len -= kBlockLen, data += kBlockLen, at += kNumCharacters) {
    encode_block<To>(data, at);
  }
  uint8_t last[kBlockLen + 1] = {};
  char last_text[kNumCharacters];
  if (len != 0) memcpy(last, data, len);
  encode_block<To>(last, last_text);
  memcpy(at, last_text, num_characters_for(len));
  at += num_characters_for(len);
  wipe(last, sizeof last);
  wipe(last_text, sizeof last_text);
  while (at != end) *at++ = To.padding;
}

template <const alphabet &To>
static char *encode(const uint8_t *data, uint32_t len) {
  const uint64_t room = base64_room(len);
  if (data == nullptr || room > UINT32_MAX) return nullptr;
  auto *text = reinterpret_cast<char *>(allocate_bytes(static_cast<uint32_t>(room)));
  if (text != nullptr) encode_to<To>(data, len, text);
  return text;
}

char *base64EncodeAddEndZero(const uint8_t *data, uint32_t len) {
  return encode<kStandard>(data, len);
}

char *base64urlEncodeAddEndZero(const uint8_t *data, uint32_t len) {
  char *text = encode<kUrl>(data, len);
  CHECK(text != nullptr, nullptr, "bad parameter");
  return text;
}

uint32_t base64url_encode_to(const data_part &bytes, char *text) {
  encode_to<kUrl>(static_cast<const uint8_t *>(bytes.data), bytes.len, text);
  return num_characters_for(bytes.len);
}

// ---- Decoding

namespace {

// What is left of a text in the standard alphabet, in `Also`, or in a mixture of both.
template <const alphabet &Also>
struct decoder {
  const char *at;
  const char *end;
  uint8_t *to;

  void take_blocks();
  void take_last_block();
  int gather(uint32_t *bits);
  bool take_group();
  void take_rest();
  void take_scattered();
};

}  // namespace

// One comparison: what stands behind `Last` wraps around to the negative numbers.
template <char First, char Last>
static inline characters in_range(characters text) {
  constexpr uint8_t kUp = INT8_MAX - Last;
  const auto moved = reinterpret_cast<characters>(reinterpret_cast<octets>(text) + kUp);
  return moved >= static_cast<int8_t>(INT8_MAX - (Last - First));
}

// What leads from each character to its value; 0 from one that has none.
template <const alphabet &Also>
static inline characters distances_of(characters text) {
  return (in_range<'A', 'Z'>(text) & kUpper) | (in_range<'a', 'z'>(text) & kLower) |
         (in_range<'0', '9'>(text) & kDigit) |
         ((text == kStandard.value_62) & kStandard.distance_62) |
         ((text == kStandard.value_63) & kStandard.distance_63) |
         ((text == Also.value_62) & Also.distance_62) |
         ((text == Also.value_63) & Also.distance_63);
}

static bool any_nonzero(characters flags) {
  uint64_t words[(sizeof flags + 7) / 8] = {};
  memcpy(words, &flags, sizeof flags);
  uint64_t any = 0;
  for (const uint64_t word : words) any |= word;
  return any != 0;
}

// Numbers of 24 bits, two at a time. Eight bytes are quicker, where what follows is yet to be
// written.
static inline void store_big_endian(const quartets &numbers, uint8_t *to) {
#pragma GCC unroll 2
  for (uint32_t i = 0; i < kNumQuartets; i += 2) {
    const bool is_last = i + 2 >= kNumQuartets;
    const uint32_t second = i + 1 < kNumQuartets ? numbers[i + 1] : 0;
    uint64_t both = uint64_t{numbers[i]} << 40 | uint64_t{second} << 16;
    if (kLittleEndian) both = __builtin_bswap64(both);
    memcpy(to + 3 * i, &both, is_last ? kBlockLen - 3 * i : sizeof both);
  }
}

// False, and nothing stored, when one of the block's characters has to be skipped.
template <const alphabet &Also>
static inline bool decode_block(const char *from, uint8_t *to) {
  characters text;
  memcpy(&text, from, sizeof text);
  const characters distances = distances_of<Also>(text);
  if (any_nonzero(distances == 0)) return false;
  const characters values = text + distances;
  quartets split;
  memcpy(&split, &values, sizeof split);
  split = first_byte_lowest(split);
  const quartets pairs = (split & 0x00FF00FF) << 6 | ((split >> 8) & 0x00FF00FF);
  const quartets bits = (pairs & 0xFFF) << 12 | pairs >> 16;
  store_big_endian(bits, to);
  return true;
}

// The usual case: stops before the first block that has something to skip in it.
template <const alphabet &Also>
void decoder<Also>::take_blocks() {
  while (static_cast<size_t>(end - at) >= kNumCharacters && decode_block<Also>(at, to)) {
    at += kNumCharacters;
    to += kBlockLen;
  }
}

// The usual end: less than a block, with nothing to skip in it.
template <const alphabet &Also>
void decoder<Also>::take_last_block() {
  const auto left = static_cast<size_t>(end - at);
  if (left == 0 || left >= kNumCharacters) return;
  char text[kNumCharacters];
  uint8_t bytes[kBlockLen];
  memset(text, 'A', sizeof text);
  memcpy(text, at, left);
  if (decode_block<Also>(text, bytes)) {
    memcpy(to, bytes, left * 3 / 4);
    to += left * 3 / 4;
    at = end;
  }
  wipe(text, sizeof text);
  wipe(bytes, sizeof bytes);
}

// The next four values, or as many as there are, however far apart they stand. Returns how many.
template <const alphabet &Also>
int decoder<Also>::gather(uint32_t *bits) {
  int num_values = 0;
  *bits = 0;
  while (num_values < 4 && at != end) {
    const auto left = static_cast<size_t>(end - at);
    const uint32_t len = left < kNumCharacters ? static_cast<uint32_t>(left) : kNumCharacters;
    characters text = {};
    memcpy(&text, at, len);
    const characters distances = distances_of<Also>(text);
    uint32_t used = 0;
    for (; used < len && num_values < 4; ++used) {
      if (distances[used] == 0) continue;
      *bits |= static_cast<uint32_t>(text[used] + distances[used]) << (18 - 6 * num_values++);
    }
    at += used;
  }
  return num_values;
}

// False, and nothing taken, when there are fewer than four values.
template <const alphabet &Also>
bool decoder<Also>::take_group() {
  const char *start = at;
  uint32_t bits = 0;
  if (gather(&bits) < 4) {
    at = start;
    return false;
  }
  for (int i = 0; i < 3; ++i) *to++ = static_cast<uint8_t>(bits >> (16 - 8 * i));
  return true;
}

// Fewer than four values; a last one alone gives no byte.
template <const alphabet &Also>
void decoder<Also>::take_rest() {
  uint32_t bits = 0;
  const int num_values = gather(&bits);
  for (int i = 0; i < num_values - 1; ++i) *to++ = static_cast<uint8_t>(bits >> (16 - 8 * i));
}

template <const alphabet &Also>
void decoder<Also>::take_scattered() {
  while (take_group()) take_blocks();
  take_rest();
}

template <const alphabet &Also>
static uint32_t decode(const char *text, uint32_t len, uint32_t spare, uint8_t **bytes,
                       const char *as = __builtin_FUNCTION()) {
  if (text == nullptr) return 0;
  // floor(3 len / 4) + 3 len mod 4, without the product.
  const uint32_t rest = 3 * (len % 4);
  *bytes = allocate_bytes(len / 4 * 3 + rest / 4 + rest % 4 + spare);
  CHECK_AS(as, *bytes != nullptr, 0, "decode base64 but not memory");
  decoder<Also> in = {text, text + len, *bytes};
  in.take_blocks();
  in.take_last_block();
  if (in.at != in.end) in.take_scattered();
  return static_cast<uint32_t>(in.to - *bytes);
}

static uint32_t text_len(const char *text) {
  return text != nullptr ? static_cast<uint32_t>(strlen(text)) : 0;
}

uint32_t base64DecodeStringRemoveEndZero(const char *text, uint8_t **bytes) {
  return decode<kStandard>(text, text_len(text), 0, bytes);
}

uint32_t base64urlDecodeStringRemoveEndZero(const char *text, uint8_t **bytes) {
  return decode<kUrl>(text, text_len(text), 0, bytes);
}

uint32_t base64urlDecodeStringRemoveEndZeroV2(const char *text, uint32_t len, uint8_t **bytes) {
  return decode<kUrl>(text, len, 0, bytes);
}

uint32_t base64urlDecodeStringAddEndZeroV2(const char *text, uint32_t len, uint8_t **bytes) {
  return decode<kUrl>(text, len, 1, bytes);
}

uint32_t base64urlDecodePiece(char *text, uint32_t *len, bool is_last, uint8_t *to) {
  decoder<kUrl> in = {text, text + *len, to};
  do in.take_blocks();
  while (in.take_group());
  *len = 0;
  if (is_last) {
    in.take_rest();
    return static_cast<uint32_t>(in.to - to);
  }
  for (; in.at != in.end; ++in.at) {
    const characters one = {static_cast<signed char>(*in.at)};
    if (distances_of<kUrl>(one)[0] != 0) text[(*len)++] = *in.at;
  }
  return static_cast<uint32_t>(in.to - to);
}
