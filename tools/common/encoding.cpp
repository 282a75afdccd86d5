// SPDX-License-Identifier: BSD-2-Clause
#include "common/encoding.h"

#include <cstdint>

namespace tools {
namespace {

constexpr std::string_view kBase64 =
    "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
constexpr std::string_view kBase64Url =
    "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-_";
constexpr std::string_view kHex = "0123456789abcdef";

std::string encode(std::string_view bytes, std::string_view alphabet) {
  std::string text;
  text.reserve((bytes.size() + 2) / 3 * 4);
  uint32_t bits = 0;
  int num_bits = 0;
  for (const char byte : bytes) {
    bits = bits << 8 | static_cast<uint8_t>(byte);
    for (num_bits += 8; num_bits >= 6; num_bits -= 6) {
      text += alphabet[bits >> (num_bits - 6) & 0x3F];
    }
  }
  if (num_bits > 0) text += alphabet[bits << (6 - num_bits) & 0x3F];
  return text;
}

std::optional<Bytes> decode(std::string_view text, std::string_view alphabet) {
  if (text.size() % 4 == 1) return std::nullopt;
  Bytes bytes;
  bytes.reserve(text.size() / 4 * 3 + 2);
  uint32_t bits = 0;
  int num_bits = 0;
  for (const char c : text) {
    const size_t value = alphabet.find(c);
    if (value == std::string_view::npos) return std::nullopt;
    bits = bits << 6 | static_cast<uint32_t>(value);
    num_bits += 6;
    if (num_bits >= 8) {
      num_bits -= 8;
      bytes += static_cast<char>(bits >> num_bits & 0xFF);
    }
  }
  const bool has_spare_bits = (bits & ((1u << num_bits) - 1)) != 0;
  if (has_spare_bits) return std::nullopt;
  return bytes;
}

}  // namespace

std::string base64_encode(std::string_view bytes) {
  std::string text = encode(bytes, kBase64);
  while (text.size() % 4 != 0) text += '=';
  return text;
}

std::string base64url_encode(std::string_view bytes) {
  return encode(bytes, kBase64Url);
}

std::optional<Bytes> base64_decode(std::string_view text) {
  if (text.size() % 4 != 0) return std::nullopt;
  for (int i = 0; i < 2 && text.ends_with('='); ++i) text.remove_suffix(1);
  return decode(text, kBase64);
}

std::optional<Bytes> base64url_decode(std::string_view text) {
  return decode(text, kBase64Url);
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
