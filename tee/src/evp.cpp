// SPDX-License-Identifier: BSD-2-Clause
#include "evp.h"

#include <openssl/core_names.h>
#include <openssl/params.h>

#include "running.h"

namespace tee {

static void require(bool available) {
  if (!available) panic("OpenSSL", "an algorithm is not available");
}

template <class T>
static T *fetched(T *algorithm) {
  require(algorithm != nullptr);
  return algorithm;
}

static const EVP_CIPHER *fetch_cipher(const char *name) {
  return fetched(EVP_CIPHER_fetch(nullptr, name, nullptr));
}

// A context can only be duplicated when it has a key.
static const EVP_MAC_CTX *make_hmac_template() {
  EVP_MAC *hmac = fetched(EVP_MAC_fetch(nullptr, OSSL_MAC_NAME_HMAC, nullptr));
  EVP_MAC_CTX *context = fetched(EVP_MAC_CTX_new(hmac));
  EVP_MAC_free(hmac);

  char digest[] = "SHA256";
  const OSSL_PARAM params[] = {
      OSSL_PARAM_construct_utf8_string(OSSL_MAC_PARAM_DIGEST, digest, 0),
      OSSL_PARAM_construct_end(),
  };
  const uint8_t key[16] = {};
  require(EVP_MAC_init(context, key, sizeof(key), params) == 1);
  return context;
}

const Algorithms &algorithms() {
  static const Algorithms all = {
      .sha256 = fetched(EVP_MD_fetch(nullptr, "SHA256", nullptr)),
      .cbc = {fetch_cipher("AES-128-CBC"), fetch_cipher("AES-192-CBC"),
              fetch_cipher("AES-256-CBC")},
      .gcm = {fetch_cipher("AES-128-GCM"), fetch_cipher("AES-192-GCM"),
              fetch_cipher("AES-256-GCM")},
      .hmac_sha256 = make_hmac_template(),
  };
  return all;
}

}  // namespace tee
