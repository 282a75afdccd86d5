// SPDX-License-Identifier: BSD-2-Clause
// The agent's base64url against OpenSSL's block functions, whose buffers are made beforehand.
#include "crypto/base64.h"

#include <openssl/evp.h>

#include "groups.h"
#include "inside.h"
#include "ownership.h"
#include "tsm/crypto.h"

namespace bench {

void measure_base64(Bench &bench) {
  tee::test::Device device;
  const Inside inside(device);
  const struct {
    size_t len;
    const char *text;
  } sizes[] = {{256, "256 bytes"}, {64 << 10, "64 KiB"}, {1 << 20, "1 MiB"}};
  for (const auto &size : sizes) {
    const std::string bytes = tsm::random_bytes(size.len);
    const std::string text = tsm::base64url_encode(bytes);
    const std::string padded = tsm::base64_encode(bytes);
    std::vector<uint8_t> room(2 * size.len + 4);
    const Contestant encode = {[&] {
      const tee_ptr<char> encoded(
          base64urlEncodeAddEndZero(bytes_of(bytes), static_cast<uint32_t>(bytes.size())));
      keep(encoded);
    }};
    const Contestant decode = {[&] {
      secret_bytes decoded;
      decoded.len = base64urlDecodeStringRemoveEndZeroV2(
          text.data(), static_cast<uint32_t>(text.size()), &decoded.data);
      keep(decoded);
    }};
    const Contestant openssl_encode = {
        [&] { EVP_EncodeBlock(room.data(), bytes_of(bytes), static_cast<int>(bytes.size())); }};
    const Contestant openssl_decode = {
        [&] { EVP_DecodeBlock(room.data(), bytes_of(padded), static_cast<int>(padded.size())); }};
    const struct {
      const char *name;
      std::vector<Contestant> pair;
    } rows[] = {{"encode", {encode, openssl_encode}}, {"decode", {decode, openssl_decode}}};
    for (const auto &row : rows) {
      const Rounds rounds = compare(row.pair, bench.effort);
      bench.report.figures.push_back({.group = "base64url / OpenSSL",
                                      .name = std::string(row.name) + ", " + size.text,
                                      .value = rounds.ratio(0, 1),
                                      .unit = "x",
                                      .target = at_most(1.0),
                                      .detail = time_text(rounds.seconds(0).median) + " / " +
                                                time_text(rounds.seconds(1).median)});
    }
  }
}

}  // namespace bench
