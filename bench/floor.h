// SPDX-License-Identifier: BSD-2-Clause
/// What is under an exchange: work that it cannot do without, straight in OpenSSL.
#ifndef BENCH_FLOOR_H
#define BENCH_FLOOR_H

#include <string>
#include <vector>

#include "device.h"
#include "rsa_works.h"

namespace bench {

enum class Depth {
  kCryptography,  // and nothing else, all keys and contexts prepared
  kWithCopies,    // and an image block by block, payload and image moved through the heap
  kWithRules,     // as the agent has to do it: also with new keys, and each text read once
};

/// The work of an exchange that took place: of its request, its response, and the state document
/// whose hash the request has.
Work work_of(const MessageCase &message, const std::string &request, const std::string &response,
             size_t dsi_len, Depth depth);

/// Lengths of what an exchange verifies, decrypts, encrypts and signs.
struct JoseParts {
  std::vector<size_t> verified = {};
  size_t decrypted = 0;  // 0: nothing
  size_t encrypted = 0;
  size_t signed_len = 0;
};
JoseParts jose_parts_of(const std::string &request, const std::string &response);

/// Verifying and signing an envelope whose payload has so many characters in base64url.
Work verification_of(size_t payload_len, Keys keys);
Work signing_of(size_t payload_len, Keys keys);

}  // namespace bench

#endif
