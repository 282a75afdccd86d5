// SPDX-License-Identifier: BSD-2-Clause
/// Owners for what OpenSSL hands out, and its algorithms, fetched once per process.
#ifndef TEE_EVP_H
#define TEE_EVP_H

#include <openssl/bn.h>
#include <openssl/err.h>
#include <openssl/evp.h>

#include <cstdint>
#include <memory>

namespace tee {

template <auto Free>
struct FreedBy {
  template <class T>
  void operator()(T *p) const {
    Free(p);
  }
};

using DigestContext = std::unique_ptr<EVP_MD_CTX, FreedBy<EVP_MD_CTX_free>>;
using MacContext = std::unique_ptr<EVP_MAC_CTX, FreedBy<EVP_MAC_CTX_free>>;
using CipherContext = std::unique_ptr<EVP_CIPHER_CTX, FreedBy<EVP_CIPHER_CTX_free>>;
using KeyContext = std::unique_ptr<EVP_PKEY_CTX, FreedBy<EVP_PKEY_CTX_free>>;
using Number = std::unique_ptr<BIGNUM, FreedBy<BN_clear_free>>;

/// Keys are shared between an object and the operations that use it.
using SharedKey = std::shared_ptr<EVP_PKEY>;

/// Fetching takes locks and searches by name, which would cost more than hashing a short text.
struct Algorithms {
  const EVP_MD *sha256;
  const EVP_CIPHER *cbc[3];  // AES of 128, 192 and 256 bits
  const EVP_CIPHER *gcm[3];
  const EVP_MAC_CTX *hmac_sha256;  // to be duplicated; holds a key that is to be replaced
};

/// Never freed, so that they outlive every static object that still uses them.
const Algorithms &algorithms();

/// Keeps the errors of one call out of the thread's queue, which belongs to the application.
class QuietErrors {
 public:
  QuietErrors() { ERR_set_mark(); }
  ~QuietErrors() { ERR_pop_to_mark(); }
  QuietErrors(const QuietErrors &) = delete;
  QuietErrors &operator=(const QuietErrors &) = delete;
};

}  // namespace tee

#endif
