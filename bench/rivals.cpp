// SPDX-License-Identifier: BSD-2-Clause
#include "rivals.h"

#include <openssl/core_names.h>
#include <openssl/evp.h>

#include <stdexcept>

#include "support/manager.h"

namespace bench {
namespace {

void demand(bool passed, const JoseLibrary &library, const char *what) {
  if (!passed) throw std::runtime_error(std::string(library.name) + " did not " + what);
}

// Texts of the real lengths.
std::string filler(size_t len) {
  return std::string(len, 'x');
}

}  // namespace

RsaNumbers numbers_of(const tsm::RsaKey &key, bool with_primes) {
  const auto number = [&](const char *name) {
    BIGNUM *value = nullptr;
    if (EVP_PKEY_get_bn_param(key.get(), name, &value) != 1) {
      throw std::runtime_error("a key lacks a number");
    }
    std::string bytes(static_cast<size_t>(BN_num_bytes(value)), 0);
    BN_bn2bin(value, reinterpret_cast<uint8_t *>(bytes.data()));
    BN_free(value);
    return bytes;
  };
  RsaNumbers numbers = {.n = number(OSSL_PKEY_PARAM_RSA_N),
                        .e = number(OSSL_PKEY_PARAM_RSA_E),
                        .d = number(OSSL_PKEY_PARAM_RSA_D)};
  if (!with_primes) return numbers;
  numbers.p = number(OSSL_PKEY_PARAM_RSA_FACTOR1);
  numbers.q = number(OSSL_PKEY_PARAM_RSA_FACTOR2);
  numbers.dp = number(OSSL_PKEY_PARAM_RSA_EXPONENT1);
  numbers.dq = number(OSSL_PKEY_PARAM_RSA_EXPONENT2);
  numbers.qi = number(OSSL_PKEY_PARAM_RSA_COEFFICIENT1);
  return numbers;
}

Rival::Rival(const JoseLibrary &library, const RsaNumbers &numbers)
    : library_(library), key_(library.make_key(numbers)) {
  demand(key_ != nullptr, library, "take a key");
  stored_ = library.store_public_key(key_);
}

void Rival::verify(const std::string &compact, size_t payload_len) const {
  demand(library_.verify(compact, key_) == payload_len, library_, "verify a message");
}

void Rival::verify_with_stored_key(const std::string &compact, size_t payload_len) const {
  void *loaded = library_.load_key(stored_);
  demand(library_.verify(compact, loaded) == payload_len, library_, "verify a message");
  library_.free_key(loaded);
}

std::string Rival::sign(const std::string &payload) const {
  std::string compact = library_.sign(payload, key_);
  demand(!compact.empty(), library_, "sign a message");
  return compact;
}

std::string Rival::encrypt(const std::string &plain) const {
  std::string compact = library_.encrypt(plain, key_);
  demand(!compact.empty(), library_, "encrypt a text");
  return compact;
}

void Rival::decrypt(const std::string &compact, size_t plain_len) const {
  demand(library_.decrypt(compact, key_) == plain_len, library_, "decrypt a text");
}

Work same_work(const JoseLibrary &library, const JoseParts &parts) {
  const auto rival =
      std::make_shared<Rival>(library, numbers_of(otrp_test::key_named("floor"), true));
  std::vector<std::pair<std::string, size_t>> signed_texts;
  for (const size_t len : parts.verified) signed_texts.emplace_back(rival->sign(filler(len)), len);
  const std::string content = parts.decrypted == 0 ? "" : rival->encrypt(filler(parts.decrypted));
  return [=, plain = filler(parts.encrypted), response = filler(parts.signed_len)] {
    for (const auto &[compact, len] : signed_texts) rival->verify(compact, len);
    if (!content.empty()) rival->decrypt(content, parts.decrypted);
    rival->encrypt(plain);
    rival->sign(response);
  };
}

}  // namespace bench
