// SPDX-License-Identifier: BSD-2-Clause
#include <cjose/cjose.h>

#include <cstdlib>

#include "libraries.h"

static cjose_jwk_t *jwk(void *key) {
  return static_cast<cjose_jwk_t *>(key);
}

static void *make_key(const bench::RsaNumbers &numbers) {
  const auto bytes = [](const std::string &number) {
    return reinterpret_cast<uint8_t *>(const_cast<char *>(number.data()));
  };
  cjose_jwk_rsa_keyspec spec = {};
  spec.n = bytes(numbers.n);
  spec.nlen = numbers.n.size();
  spec.e = bytes(numbers.e);
  spec.elen = numbers.e.size();
  spec.d = bytes(numbers.d);
  spec.dlen = numbers.d.size();
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

static const bench::Added<bench::JoseLibrary> added({
    .name = "libcjose",
    .target = 1.05,
    .make_key = make_key,
    .store_public_key = store_public_key,
    .load_key = load_key,
    .free_key = [](void *key) { cjose_jwk_release(jwk(key)); },
    .verify = verify,
    .sign = sign,
});
