// SPDX-License-Identifier: BSD-2-Clause
/// The floor under an exchange: the cryptographic work that it cannot do without, straight in
/// OpenSSL, with all contexts made beforehand.
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

enum class Keys {
  kAtHand,
  kNew,  // made of their numbers for each operation, as by a device that keeps none
};

/// The work of an exchange that took place: of its request, its response, and the state document
/// whose hash the request has.
std::vector<std::function<void()>> work_of(const MessageCase &message, const std::string &request,
                                           const std::string &response, size_t dsi_len, Keys keys);

}  // namespace bench

#endif
