// SPDX-License-Identifier: BSD-2-Clause
#include <jansson.h>

#include <cstdlib>
#include <memory>
#include <vector>

// Its headers are written for C alone.
extern "C" {
#include <jose/b64.h>
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
  return json_pack("{s:s, s:o, s:o, s:o}", "kty", "RSA", "n", number(numbers.n), "e",
                   number(numbers.e), "d", number(numbers.d));
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

// A compact serialization is read as a command line of the library does it: into its JSON form.
size_t verify(const std::string &compact, void *key) {
  const size_t first = compact.find('.');
  const size_t second = compact.find('.', first + 1);
  const JsonRef jws(json_pack("{s:s%, s:s%, s:s%}", "protected", compact.data(), first, "payload",
                              compact.data() + first + 1, second - first - 1, "signature",
                              compact.data() + second + 1, compact.size() - second - 1));
  if (!jws || !jose_jws_ver(nullptr, jws.get(), nullptr, jwk(key), false)) return 0;
  const json_t *payload = json_object_get(jws.get(), "payload");
  const size_t len = jose_b64_dec(payload, nullptr, 0);
  std::vector<uint8_t> bytes(len);
  return jose_b64_dec(payload, bytes.data(), len);
}

std::string sign(const std::string &payload, void *key) {
  const JsonRef jws(json_pack("{s:o}", "payload", number(payload)));
  JsonRef signature(json_pack("{s:{s:s}}", "protected", "alg", "RS256"));
  if (!jose_jws_sig(nullptr, jws.get(), signature.get(), jwk(key))) return {};
  std::string compact;
  for (const char *name : {"protected", "payload", "signature"}) {
    if (!compact.empty()) compact += '.';
    compact += json_string_value(json_object_get(jws.get(), name));
  }
  return compact;
}

}  // namespace

static const bench::Added<bench::JoseLibrary> added({
    .name = "libjose",
    .target = 0.5,
    .make_key = make_key,
    .store_public_key = store_public_key,
    .load_key = [](const std::string &stored) -> void * {
      return json_loadb(stored.data(), stored.size(), 0, nullptr);
    },
    .free_key = [](void *key) { json_decref(jwk(key)); },
    .verify = verify,
    .sign = sign,
});
