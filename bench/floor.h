// SPDX-License-Identifier: BSD-2-Clause
/// What is under an exchange: work that it cannot do without, straight in OpenSSL.
///
/// The keys have the form of the real ones: the device's TEE key is modulus and exponents alone, an
/// AIK has its primes. What is worked on has the lengths of the real texts, and other bytes.
#ifndef BENCH_FLOOR_H
#define BENCH_FLOOR_H

#include <functional>
#include <string>
#include <vector>

#include "device.h"

namespace bench {

using Work = std::function<void()>;

enum class Keys {
  kPrepared,  // with their contexts
  kAtHand,    // a context is made for each operation
  kNew,       // so is the key, of its numbers, as by a device that keeps none
};

enum class Depth {
  kCryptography,  // and nothing else, all keys and contexts prepared
  kWithRules,     // as the agent has to do it: with new keys, an image block by block, each text
                  // tokenized once, and payload and image moved through the heap
};

/// The work of an exchange that took place: of its request, its response, and the state document
/// whose hash the request has.
Work work_of(const MessageCase &message, const std::string &request, const std::string &response,
             size_t dsi_len, Depth depth);

/// One pass of the tokenizer.
Work reading_of(std::string text);

/// Verifying and signing an envelope whose payload has so many characters in base64url.
Work verification_of(size_t payload_len, Keys keys);
Work signing_of(size_t payload_len, Keys keys);

}  // namespace bench

#endif
