// SPDX-License-Identifier: BSD-2-Clause
// The agent's base64url against OpenSSL's block functions, whose buffers are made beforehand. The
// bound is OpenSSL's with a buffer of the TEE's heap.
#include "crypto/base64.h"

#include <openssl/evp.h>

#include <memory>

#include "inside.h"
#include "ownership.h"
#include "suite.h"
#include "tsm/protocol/crypto.h"

namespace bench {
namespace {

struct Texts {
  explicit Texts(size_t len) : bytes(tsm::random_bytes(len)) {}

  Inside inside;
  const std::string bytes;
  const std::string text = tsm::base64url_encode(bytes);
  const std::string padded = tsm::base64_encode(bytes);
  std::vector<uint8_t> room = std::vector<uint8_t>(2 * bytes.size() + 4);
};

Comparison encoders(size_t len) {
  const auto texts = std::make_shared<Texts>(len);
  const auto encode = [texts] {
    const tee_ptr<char> encoded(base64urlEncodeAddEndZero(
        bytes_of(texts->bytes), static_cast<uint32_t>(texts->bytes.size())));
    benchmark::DoNotOptimize(encoded.get());
  };
  const auto openssl = [texts] {
    EVP_EncodeBlock(texts->room.data(), bytes_of(texts->bytes),
                    static_cast<int>(texts->bytes.size()));
  };
  const auto with_buffer = [texts, openssl] {
    const tee_ptr<uint8_t> room(allocate_bytes(static_cast<uint32_t>(texts->text.size() + 1)));
    benchmark::DoNotOptimize(room.get());
    openssl();
  };
  return {{{"agent", encode},
           {.name = "OpenSSL", .run = openssl, .target = 1.0},
           {kBound, with_buffer}}};
}

Comparison decoders(size_t len) {
  const auto texts = std::make_shared<Texts>(len);
  const auto decode = [texts] {
    secret_bytes decoded;
    decoded.len = base64urlDecodeStringRemoveEndZeroV2(
        texts->text.data(), static_cast<uint32_t>(texts->text.size()), &decoded.data);
    benchmark::DoNotOptimize(decoded.data);
  };
  const auto openssl = [texts] {
    EVP_DecodeBlock(texts->room.data(), bytes_of(texts->padded),
                    static_cast<int>(texts->padded.size()));
  };
  const auto with_buffer = [texts, openssl] {
    secret_bytes room;
    room.len = static_cast<uint32_t>(texts->bytes.size());
    room.data = allocate_bytes(room.len);
    benchmark::DoNotOptimize(room.data);
    openssl();
  };
  return {{{"agent", decode},
           {.name = "OpenSSL", .run = openssl, .target = 1.0},
           {kBound, with_buffer}}};
}

}  // namespace

void add_base64(Suite &suite) {
  const struct {
    size_t len;
    const char *text;
  } sizes[] = {{256, "256 bytes"}, {64 << 10, "64 KiB"}, {1 << 20, "1 MiB"}};
  for (const auto &size : sizes) {
    suite.compare(std::string("base64/encode, ") + size.text, [=] { return encoders(size.len); });
    suite.compare(std::string("base64/decode, ") + size.text, [=] { return decoders(size.len); });
  }
}

}  // namespace bench
