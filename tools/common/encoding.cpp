// SPDX-License-Identifier: BSD-2-Clause
#include "common/encoding.h"

#include <algorithm>
#include <array>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>

namespace tools {
namespace {

constexpr std::string_view kBase64 =
    "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
constexpr std::string_view kBase64Url =
    "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-_";
constexpr std::string_view kHex = "0123456789abcdef";

constexpr uint32_t kNoDigit = 64;

using Digits = std::array<uint8_t, 256>;
constexpr Digits digits_of(std::string_view alphabet) {
  Digits digits{};
  digits.fill(kNoDigit);
  for (size_t i = 0; i < alphabet.size(); ++i) {
    digits[static_cast<uint8_t>(alphabet[i])] = static_cast<uint8_t>(i);
  }
  return digits;
}
constexpr Digits kBase64Digits = digits_of(kBase64);
constexpr Digits kBase64UrlDigits = digits_of(kBase64Url);

/// Two digits for each number of twelve bits, found with one look.
using DigitPairs = std::array<std::array<char, 2>, 1 << 12>;
constexpr DigitPairs pairs_of(std::string_view alphabet) {
  DigitPairs pairs{};
  for (size_t i = 0; i < pairs.size(); ++i) pairs[i] = {alphabet[i >> 6], alphabet[i & 0x3F]};
  return pairs;
}
constexpr DigitPairs kBase64Pairs = pairs_of(kBase64);
constexpr DigitPairs kBase64UrlPairs = pairs_of(kBase64Url);

/// Up to three bytes, as one number.
uint64_t number_of(std::string_view bytes) {
  uint64_t bits = 0;
  for (size_t i = 0; i < 3; ++i) {
    bits = bits << 8 | (i < bytes.size() ? static_cast<uint8_t>(bytes[i]) : 0u);
  }
  return bits;
}

/// Six bytes, as one number; reads two more.
uint64_t number_of_six(const char *bytes) {
  uint64_t bits = 0;
  memcpy(&bits, bytes, sizeof(bits));
  if constexpr (std::endian::native == std::endian::little) bits = __builtin_bswap64(bits);
  return bits >> 16;
}

void put_digits(uint64_t bits, const DigitPairs &pairs, char *out) {
  memcpy(out, pairs[bits >> 12 & 0xFFF].data(), 2);
  memcpy(out + 2, pairs[bits & 0xFFF].data(), 2);
}

void append(std::string_view bytes, const DigitPairs &pairs, std::string *text) {
  const size_t start = text->size();
  text->resize(start + (bytes.size() + 2) / 3 * 4);
  char *out = text->data() + start;
  size_t at = 0;
  for (; at + sizeof(uint64_t) <= bytes.size(); at += 6, out += 8) {
    const uint64_t bits = number_of_six(bytes.data() + at);
    put_digits(bits >> 24, pairs, out);
    put_digits(bits, pairs, out + 4);
  }
  for (; at < bytes.size(); at += 3, out += 4) {
    put_digits(number_of(bytes.substr(at)), pairs, out);
  }
  text->resize(start + (bytes.size() * 4 + 2) / 3);
}

std::optional<Bytes> decode(std::string_view text, const Digits &digits) {
  if (text.size() % 4 == 1) return std::nullopt;
  Bytes bytes((text.size() + 3) / 4 * 3, '\0');
  char *out = bytes.data();
  uint32_t seen = 0;  // all digits, so that one look at the end finds what is none
  for (size_t at = 0; at < text.size(); at += 4) {
    uint32_t bits = 0;
    for (size_t i = at; i < at + 4; ++i) {
      const uint32_t digit = i < text.size() ? digits[static_cast<uint8_t>(text[i])] : 0;
      seen |= digit;
      bits = bits << 6 | digit;
    }
    for (int shift = 16; shift >= 0; shift -= 8) *out++ = static_cast<char>(bits >> shift & 0xFF);
  }
  const size_t len = text.size() * 3 / 4;
  const bool has_spare_bits = std::any_of(bytes.begin() + static_cast<std::ptrdiff_t>(len),
                                          bytes.end(), [](char byte) { return byte != '\0'; });
  if ((seen & kNoDigit) != 0 || has_spare_bits) return std::nullopt;
  bytes.resize(len);
  return bytes;
}

}  // namespace

std::string base64_encode(std::string_view bytes) {
  std::string text;
  append(bytes, kBase64Pairs, &text);
  while (text.size() % 4 != 0) text += '=';
  return text;
}

std::string base64url_encode(std::string_view bytes) {
  std::string text;
  base64url_append(bytes, &text);
  return text;
}

void base64url_append(std::string_view bytes, std::string *text) {
  append(bytes, kBase64UrlPairs, text);
}

std::optional<Bytes> base64_decode(std::string_view text) {
  if (text.size() % 4 != 0) return std::nullopt;
  for (int i = 0; i < 2 && text.ends_with('='); ++i) text.remove_suffix(1);
  return decode(text, kBase64Digits);
}

std::optional<Bytes> base64url_decode(std::string_view text) {
  return decode(text, kBase64UrlDigits);
}

std::string hex_encode(std::string_view bytes) {
  std::string text;
  for (const char byte : bytes) {
    text += kHex[static_cast<uint8_t>(byte) >> 4];
    text += kHex[static_cast<uint8_t>(byte) & 0x0F];
  }
  return text;
}

std::optional<Bytes> hex_decode(std::string_view text) {
  if (text.size() % 2 != 0) return std::nullopt;
  Bytes bytes;
  for (size_t i = 0; i < text.size(); i += 2) {
    size_t byte = 0;
    for (char c : text.substr(i, 2)) {
      if (c >= 'A' && c <= 'F') c = static_cast<char>(c - 'A' + 'a');
      const size_t value = kHex.find(c);
      if (value == std::string_view::npos) return std::nullopt;
      byte = byte << 4 | value;
    }
    bytes += static_cast<char>(byte);
  }
  return bytes;
}

Bytes little_endian(size_t value, int width) {
  Bytes bytes;
  for (int i = 0; i < width; ++i) bytes += static_cast<char>(value >> (8 * i) & 0xFF);
  return bytes;
}

}  // namespace tools
