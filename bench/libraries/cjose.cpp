// SPDX-License-Identifier: BSD-2-Clause
#include <cjose/cjose.h>

#include <cstdlib>

#include "libraries.h"

static cjose_jwk_t *jwk(void *key) {
  return static_cast<cjose_jwk_t *>(key);
}

static void *make_key(const bench::RsaNumbers &numbers) {
  cjose_jwk_rsa_keyspec spec = {};
  const struct {
    const std::string &number;
    uint8_t *&bytes;
    size_t &len;
  } members[] = {{numbers.n, spec.n, spec.nlen},    {numbers.e, spec.e, spec.elen},
                 {numbers.d, spec.d, spec.dlen},    {numbers.p, spec.p, spec.plen},
                 {numbers.q, spec.q, spec.qlen},    {numbers.dp, spec.dp, spec.dplen},
                 {numbers.dq, spec.dq, spec.dqlen}, {numbers.qi, spec.qi, spec.qilen}};
  for (const auto &member : members) {
    if (member.number.empty()) continue;
    member.bytes = reinterpret_cast<uint8_t *>(const_cast<char *>(member.number.data()));
    member.len = member.number.size();
  }
  return cjose_jwk_create_RSA_spec(&spec, nullptr);
}

static std::string store_public_key(void *key) {
  char *text = cjose_jwk_to_json(jwk(key), false, nullptr);
  const std::string stored = text;
  std::free(text);
  return stored;
}

static void *load_key(const std::string &stored) {
  return cjose_jwk_import(stored.data(), stored.size(), nullptr);
}

static size_t verify(const std::string &compact, void *key) {
  cjose_jws_t *jws = cjose_jws_import(compact.data(), compact.size(), nullptr);
  uint8_t *payload = nullptr;
  size_t len = 0;
  const bool genuine = jws != nullptr && cjose_jws_verify(jws, jwk(key), nullptr) &&
                       cjose_jws_get_plaintext(jws, &payload, &len, nullptr);
  cjose_jws_release(jws);
  return genuine ? len : 0;
}

static std::string sign(const std::string &payload, void *key) {
  cjose_header_t *header = cjose_header_new(nullptr);
  cjose_header_set(header, CJOSE_HDR_ALG, CJOSE_HDR_ALG_RS256, nullptr);
  cjose_jws_t *jws = cjose_jws_sign(
      jwk(key), header, reinterpret_cast<const uint8_t *>(payload.data()), payload.size(), nullptr);
  const char *text = nullptr;
  std::string compact;
  if (jws != nullptr && cjose_jws_export(jws, &text, nullptr)) compact = text;
  cjose_jws_release(jws);
  cjose_header_release(header);
  return compact;
}

static size_t decrypt(const std::string &compact, void *key) {
  cjose_jwe_t *jwe = cjose_jwe_import(compact.data(), compact.size(), nullptr);
  size_t len = 0;
  uint8_t *plain = jwe != nullptr ? cjose_jwe_decrypt(jwe, jwk(key), &len, nullptr) : nullptr;
  const bool decrypted = plain != nullptr;
  std::free(plain);
  cjose_jwe_release(jwe);
  return decrypted ? len : 0;
}

static std::string encrypt(const std::string &plain, void *key) {
  cjose_header_t *header = cjose_header_new(nullptr);
  cjose_header_set(header, CJOSE_HDR_ALG, CJOSE_HDR_ALG_RSA1_5, nullptr);
  cjose_header_set(header, CJOSE_HDR_ENC, CJOSE_HDR_ENC_A128CBC_HS256, nullptr);
  cjose_jwe_t *jwe = cjose_jwe_encrypt(
      jwk(key), header, reinterpret_cast<const uint8_t *>(plain.data()), plain.size(), nullptr);
  char *text = jwe != nullptr ? cjose_jwe_export(jwe, nullptr) : nullptr;
  std::string compact;
  if (text != nullptr) compact = text;
  std::free(text);
  cjose_jwe_release(jwe);
  cjose_header_release(header);
  return compact;
}

static const bench::Added<bench::JoseLibrary> added({
    .name = "libcjose",
    .verify_target = 1.05,
    .sign_target = 0.45,
    .exchange_target = 1.5,
    .make_key = make_key,
    .store_public_key = store_public_key,
    .load_key = load_key,
    .free_key = [](void *key) { cjose_jwk_release(jwk(key)); },
    .verify = verify,
    .sign = sign,
    .decrypt = decrypt,
    .encrypt = encrypt,
});
