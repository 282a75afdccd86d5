// SPDX-License-Identifier: BSD-2-Clause
// Base64: encoders against the TSM's, decoders against what a reader of a few lines makes of any
// bytes.
#include "common/encoding.h"
#include "crypto/base64.h"
#include "support/inside.h"

namespace fuzz {

static int sextet(char c, bool url) {
  static const std::string_view kLetters =
      "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
  if (url && c == '-') c = '+';
  if (url && c == '_') c = '/';
  const size_t at = kLetters.find(c);
  return at == std::string_view::npos ? -1 : static_cast<int>(at);
}

// What is not in the alphabet is passed over, and bits that fill no byte are dropped.
static std::string decode_plainly(std::string_view text, bool url) {
  std::string bytes;
  unsigned bits = 0;
  unsigned num_bits = 0;
  for (const char c : text) {
    const int value = sextet(c, url);
    if (value < 0) continue;
    bits = bits << 6 | static_cast<unsigned>(value);
    num_bits += 6;
    if (num_bits < 8) continue;
    num_bits -= 8;
    bytes += static_cast<char>(bits >> num_bits);
  }
  return bytes;
}

template <class Decoder, class... Input>
static std::string decode(Decoder decoder, Input... input) {
  uint8_t *bytes = nullptr;
  const uint32_t len = decoder(input..., &bytes);
  return take_bytes(bytes, len);
}

static void check_encoders(std::string_view bytes, uint32_t len) {
  const std::string text = take_text(base64EncodeAddEndZero(u8(bytes), len));
  const std::string url = take_text(base64urlEncodeAddEndZero(u8(bytes), len));
  require(text == tools::base64_encode(bytes), "the encoding is the TSM's");
  require(url == tools::base64url_encode(bytes), "so is that for URLs");
  require(decode(base64DecodeStringRemoveEndZero, ExactText(text).get()) == bytes &&
              decode(base64urlDecodeStringRemoveEndZero, ExactText(url).get()) == bytes,
          "what was encoded is decoded");
}

static void check_decoders(std::string_view slice, uint32_t len) {
  const ExactText text(slice.substr(0, slice.find('\0')));
  require(decode(base64DecodeStringRemoveEndZero, text.get()) == decode_plainly(text.get(), false),
          "base64 is read as it stands");
  require(
      decode(base64urlDecodeStringRemoveEndZero, text.get()) == decode_plainly(text.get(), true),
      "base64url is read as it stands");
  require(decode(base64urlDecodeStringRemoveEndZeroV2, slice.data(), len) ==
              decode_plainly(slice, true),
          "a slice is read up to its end");
  uint8_t *bytes = nullptr;
  const uint32_t bytes_len = base64urlDecodeStringAddEndZeroV2(slice.data(), len, &bytes);
  require(bytes != nullptr && bytes[bytes_len] == 0, "a NUL stands behind a text");
  require(take_bytes(bytes, bytes_len) == decode_plainly(slice, true), "that is read likewise");
}

// In pieces of `size` characters: what was left over of a piece stands before the next.
static std::string decode_pieces(std::string_view left, size_t size) {
  std::string bytes(left.size() + 3, 0);
  std::string piece;
  size_t num_bytes = 0;
  do {
    piece += left.substr(0, size);
    left.remove_prefix(std::min(size, left.size()));
    auto len = static_cast<uint32_t>(piece.size());
    num_bytes += base64urlDecodePiece(piece.data(), &len, left.empty(),
                                      reinterpret_cast<uint8_t *>(bytes.data()) + num_bytes);
    require(len <= 3, "less than a group is left over");
    piece.resize(len);
  } while (!left.empty());
  return bytes.substr(0, num_bytes);
}

void check(std::string_view input) {
  const Inside inside;
  const device::Buffer exact(input);
  // All that a block of the encoder may be cut to at the end.
  for (size_t len = input.size(); len + 16 > input.size(); --len) {
    check_encoders(exact.bytes().substr(0, len), static_cast<uint32_t>(len));
    if (len == 0) break;
  }
  check_decoders(exact.bytes(), static_cast<uint32_t>(input.size()));
  for (const size_t size : {1U, 2U, 7U, 64U}) {
    require(decode_pieces(exact.bytes(), size) == decode_plainly(exact.bytes(), true),
            "pieces give what the whole gives");
  }
}

}  // namespace fuzz
