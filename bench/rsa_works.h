// SPDX-License-Identifier: BSD-2-Clause
/// The RSA operations of a message, straight in OpenSSL. All private keys have their primes: one
/// that comes without them is completed where it is made.
#ifndef BENCH_RSA_WORKS_H
#define BENCH_RSA_WORKS_H

#include "works.h"

namespace bench {

enum class Keys {
  kPrepared,  // with their contexts
  kAtHand,    // a context is made for each operation
  kNew,       // so is a key pair, of its numbers; public keys, which come again, are kept
};

enum class Form { kPublic, kPair, kPairWithoutPrimes };

constexpr size_t kRsaLen = 256;

Work rsa_encrypt(Keys keys);
Work rsa_decrypt(Form form, Keys keys);
Work rsa_sign(Form form, Keys keys);
Work rsa_verify(Keys keys);

}  // namespace bench

#endif
