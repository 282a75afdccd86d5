// SPDX-License-Identifier: BSD-2-Clause
// Base64: encoders against OpenSSL's, decoders against it on what it takes, and against a reader of
// a few lines on everything else.
#include <openssl/evp.h>

#include <vector>

#include "crypto/base64.h"
#include "support/inside.h"

namespace {

using fuzz::require;

std::string encode_with_openssl(std::string_view bytes) {
  std::vector<uint8_t> text(bytes.size() / 3 * 4 + 5);
  const int len = EVP_EncodeBlock(text.data(), reinterpret_cast<const uint8_t *>(bytes.data()),
                                  static_cast<int>(bytes.size()));
  return {reinterpret_cast<const char *>(text.data()), static_cast<size_t>(len)};
}

std::string as_url(std::string text) {
  text.resize(std::min(text.size(), text.find('=')));
  for (char &c : text) c = c == '+' ? '-' : c == '/' ? '_' : c;
  return text;
}

int sextet(char c, bool url) {
  static const std::string_view kLetters =
      "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
  if (url && c == '-') c = '+';
  if (url && c == '_') c = '/';
  const size_t at = kLetters.find(c);
  return at == std::string_view::npos ? -1 : static_cast<int>(at);
}

// What is not in the alphabet is passed over, and bits that fill no byte are dropped.
std::string decode_plainly(std::string_view text, bool url) {
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

std::string decode(std::string_view text) {
  uint8_t *bytes = nullptr;
  const uint32_t len = base64DecodeStringRemoveEndZero(fuzz::ExactText(text).get(), &bytes);
  return fuzz::take_bytes(bytes, len);
}

std::string decode_url(std::string_view text) {
  uint8_t *bytes = nullptr;
  const uint32_t len = base64urlDecodeStringRemoveEndZero(fuzz::ExactText(text).get(), &bytes);
  return fuzz::take_bytes(bytes, len);
}

std::string decode_slice(std::string_view text) {
  const fuzz::ExactBytes exact(text);
  uint8_t *bytes = nullptr;
  const uint32_t len = base64urlDecodeStringRemoveEndZeroV2(
      reinterpret_cast<const char *>(exact.get()), static_cast<uint32_t>(text.size()), &bytes);
  return fuzz::take_bytes(bytes, len);
}

std::string decode_slice_to_text(std::string_view text) {
  const fuzz::ExactBytes exact(text);
  uint8_t *bytes = nullptr;
  const uint32_t len = base64urlDecodeStringAddEndZeroV2(
      reinterpret_cast<const char *>(exact.get()), static_cast<uint32_t>(text.size()), &bytes);
  require(bytes != nullptr && bytes[len] == 0, "a NUL stands behind a text");
  return fuzz::take_bytes(bytes, len);
}

void check_encoders(std::string_view bytes) {
  const fuzz::ExactBytes exact(bytes);
  const auto len = static_cast<uint32_t>(bytes.size());
  const std::string text = fuzz::take_text(base64EncodeAddEndZero(exact.get(), len));
  const std::string url = fuzz::take_text(base64urlEncodeAddEndZero(exact.get(), len));
  require(text == encode_with_openssl(bytes), "the encoding is OpenSSL's");
  require(url == as_url(text), "the URL encoding differs by its alphabet and padding");
  require(decode(text) == bytes && decode_url(url) == bytes, "what was encoded is decoded");
}

void check_decoders(std::string_view text) {
  const std::string_view to_nul = text.substr(0, text.find('\0'));
  require(decode(to_nul) == decode_plainly(to_nul, false), "base64 is read as it stands");
  require(decode_url(to_nul) == decode_plainly(to_nul, true), "base64url is read as it stands");
  require(decode_slice(text) == decode_plainly(text, true), "a slice is read up to its end");
  require(decode_slice_to_text(text) == decode_plainly(text, true), "so is one that is a text");
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  fuzz::Inside &inside = fuzz::Inside::instance();
  const std::string_view input = fuzz::as_view(data, size);
  check_encoders(input);
  check_decoders(input);
  inside.require_clean();
  return 0;
}
