// SPDX-License-Identifier: BSD-2-Clause
/// RSA keys between the attributes of an object and OpenSSL.
#ifndef TEE_RSA_KEY_H
#define TEE_RSA_KEY_H

#include <cstdint>
#include <string>
#include <vector>

#include "attributes.h"
#include "evp.h"

namespace tee {

/// Limits of a modulus, in bits.
constexpr uint32_t kMinRsaSize = 512;
constexpr uint32_t kMaxRsaSize = 4096;

/// Bits of an unsigned big-endian number, leading zeros left out.
uint32_t num_bits(Attributes::Value number);

/// The key that the attributes describe: modulus and public exponent, a private exponent, and
/// five CRT components or none. A pair without them works with those that can be found. NULL when
/// it cannot be an RSA key, as far as cheap checks tell.
SharedKey import_rsa_key(const Attributes &attributes);

/// A new key pair; an empty exponent stands for 65537. NULL when OpenSSL refuses.
SharedKey generate_rsa_key(uint32_t size, const std::vector<uint8_t> &public_exponent);

/// For tests: once `limit` keys of a size have been generated they are handed out again, in turn.
/// 0, as at the start, makes every key a new one. Keys with an exponent on order are always new.
/// Where `folder` is not empty, keys are taken from it first, and those generated are kept in it.
void reuse_generated_keys(size_t limit, const std::string &folder);

/// Gives `attributes` all eight of a generated key, without leading zeros.
void export_rsa_key(const EVP_PKEY &key, Attributes *attributes);

}  // namespace tee

#endif
