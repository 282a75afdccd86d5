// SPDX-License-Identifier: BSD-2-Clause
/// The CRT part of RSA key pairs that come without it. With its primes a key works five to six
/// times as fast, and they follow from modulus and both exponents: e·d − 1 is a multiple of λ(n).
#ifndef TEE_RSA_COMPLETION_H
#define TEE_RSA_COMPLETION_H

#include "rsa_key.h"

namespace tee {

/// Gives `part` both primes, the larger one first, their exponents and the coefficient of the key
/// pair that modulus, public and private exponent in `key` make.
///
/// Leaves it empty when they cannot be found: the exponents do not belong together, the modulus is
/// no product of two primes, the public exponent has more than half of the modulus' bits, or λ(n)
/// is too small a part of φ(n), as with one generated key in two hundred.
void find_crt_part(const Attributes &key, Attributes *part);

}  // namespace tee

#endif
