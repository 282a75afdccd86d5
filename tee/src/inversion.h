// SPDX-License-Identifier: BSD-2-Clause
/// Inverses of secret numbers.
#ifndef TEE_INVERSION_H
#define TEE_INVERSION_H

#include <openssl/bn.h>

namespace tee {

/// Sets `inverse` to that of `value` modulo the odd `modulus`; 0 < value < modulus. False when
/// there is none. What is done, and where in memory, depends on the length of the modulus alone.
/// Throws std::bad_alloc.
bool invert(const BIGNUM &value, const BIGNUM &modulus, BIGNUM &inverse);

}  // namespace tee

#endif
