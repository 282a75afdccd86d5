// SPDX-License-Identifier: BSD-2-Clause
#include <jansson.h>

#include <algorithm>
#include <cstdlib>
#include <initializer_list>
#include <memory>
#include <string>
#include <vector>

// Its headers are written for C alone.
extern "C" {
#include <jose/b64.h>
#include <jose/jwe.h>
#include <jose/jws.h>
}

#include "libraries.h"

namespace {

struct Drop {
  void operator()(json_t *json) const { json_decref(json); }
};
using JsonRef = std::unique_ptr<json_t, Drop>;

json_t *jwk(void *key) {
  return static_cast<json_t *>(key);
}

json_t *number(const std::string &bytes) {
  return jose_b64_enc(bytes.data(), bytes.size());
}

void *make_key(const bench::RsaNumbers &numbers) {
  json_t *key = json_pack("{s:s}", "kty", "RSA");
  const struct {
    const char *name;
    const std::string &number;
  } members[] = {{"n", numbers.n}, {"e", numbers.e},   {"d", numbers.d},   {"p", numbers.p},
                 {"q", numbers.q}, {"dp", numbers.dp}, {"dq", numbers.dq}, {"qi", numbers.qi}};
  for (const auto &member : members) {
    if (!member.number.empty()) json_object_set_new(key, member.name, number(member.number));
  }
  return key;
}

std::string store_public_key(void *key) {
  const JsonRef half(json_pack("{s:O, s:O, s:O}", "kty", json_object_get(jwk(key), "kty"), "n",
                               json_object_get(jwk(key), "n"), "e",
                               json_object_get(jwk(key), "e")));
  char *text = json_dumps(half.get(), JSON_COMPACT);
  const std::string stored = text;
  std::free(text);
  return stored;
}

// A compact serialization is read and written as a command line of the library does it: by way of
// its JSON form.
JsonRef object_of(const std::string &compact, std::initializer_list<const char *> names) {
  JsonRef object(json_object());
  size_t begin = 0;
  for (const char *name : names) {
    const size_t end = std::min(compact.find('.', begin), compact.size());
    json_object_set_new(object.get(), name, json_stringn(compact.data() + begin, end - begin));
    begin = std::min(end + 1, compact.size());
  }
  return object;
}

std::string compact_of(const json_t *object, std::initializer_list<const char *> names) {
  std::string compact;
  for (const char *name : names) {
    if (name != *names.begin()) compact += '.';
    compact += json_string_value(json_object_get(object, name));
  }
  return compact;
}

const auto kJws = {"protected", "payload", "signature"};
const auto kJwe = {"protected", "encrypted_key", "iv", "ciphertext", "tag"};

size_t verify(const std::string &compact, void *key) {
  const JsonRef jws = object_of(compact, kJws);
  if (!jose_jws_ver(nullptr, jws.get(), nullptr, jwk(key), false)) return 0;
  const json_t *payload = json_object_get(jws.get(), "payload");
  const size_t len = jose_b64_dec(payload, nullptr, 0);
  std::vector<uint8_t> bytes(len);
  return jose_b64_dec(payload, bytes.data(), len);
}

std::string sign(const std::string &payload, void *key) {
  const JsonRef jws(json_pack("{s:o}", "payload", number(payload)));
  JsonRef signature(json_pack("{s:{s:s}}", "protected", "alg", "RS256"));
  if (!jose_jws_sig(nullptr, jws.get(), signature.get(), jwk(key))) return {};
  return compact_of(jws.get(), kJws);
}

size_t decrypt(const std::string &compact, void *key) {
  const JsonRef jwe = object_of(compact, kJwe);
  size_t len = 0;
  void *plain = jose_jwe_dec(nullptr, jwe.get(), nullptr, jwk(key), &len);
  const bool decrypted = plain != nullptr;
  std::free(plain);
  return decrypted ? len : 0;
}

// Its header is a part of what is authenticated, so the library has to be told all of it.
std::string encrypt(const std::string &plain, void *key) {
  const JsonRef jwe(
      json_pack("{s:{s:s, s:s}}", "protected", "alg", "RSA1_5", "enc", "A128CBC-HS256"));
  if (!jose_jwe_enc(nullptr, jwe.get(), nullptr, jwk(key), plain.data(), plain.size())) return {};
  return compact_of(jwe.get(), kJwe);
}

}  // namespace

static const bench::Added<bench::JoseLibrary> added({
    .name = "libjose",
    .verify_target = 0.5,
    .sign_target = 0.5,
    .exchange_target = 1.0,
    .make_key = make_key,
    .store_public_key = store_public_key,
    .load_key = [](const std::string &stored) -> void * {
      return json_loadb(stored.data(), stored.size(), 0, nullptr);
    },
    .free_key = [](void *key) { json_decref(jwk(key)); },
    .verify = verify,
    .sign = sign,
    .decrypt = decrypt,
    .encrypt = encrypt,
});
