// SPDX-License-Identifier: BSD-2-Clause
// Encrypted contents: what the strict reader of the TSM opens the agent opens to the same text, and
// what the agent encrypts the TSM opens.
#include <openssl/core_names.h>

#include <algorithm>

#include "security/jwe.h"
#include "support/inside.h"
#include "support/stored_device.h"
#include "tsm/jwe.h"

namespace {

using fuzz::require;

const tsm::RsaKey &recipient() {
  return fuzz::stored_device().tsm.key;
}

std::string big_endian(EVP_PKEY *key, const char *name) {
  BIGNUM *number = nullptr;
  require(EVP_PKEY_get_bn_param(key, name, &number) == 1, "a key has its numbers");
  std::string bytes(static_cast<size_t>(BN_num_bytes(number)), '\0');
  BN_bn2bin(number, reinterpret_cast<uint8_t *>(bytes.data()));
  BN_free(number);
  return bytes;
}

TEE_ObjectHandle import(const tsm::RsaKey &key) {
  std::string numbers[] = {big_endian(key.get(), OSSL_PKEY_PARAM_RSA_N),
                           big_endian(key.get(), OSSL_PKEY_PARAM_RSA_E),
                           big_endian(key.get(), OSSL_PKEY_PARAM_RSA_D)};
  const uint32_t kinds[] = {TEE_ATTR_RSA_MODULUS, TEE_ATTR_RSA_PUBLIC_EXPONENT,
                            TEE_ATTR_RSA_PRIVATE_EXPONENT};
  TEE_Attribute attributes[3];
  for (int i = 0; i < 3; ++i) {
    TEE_InitRefAttribute(&attributes[i], kinds[i], numbers[i].data(),
                         static_cast<uint32_t>(numbers[i].size()));
  }
  TEE_ObjectHandle object = TEE_HANDLE_NULL;
  const auto bits = static_cast<uint32_t>(8 * key.modulus_len());
  require(TEE_AllocateTransientObject(TEE_TYPE_RSA_KEYPAIR, bits, &object) == TEE_SUCCESS &&
              TEE_PopulateTransientObject(object, attributes, 3) == TEE_SUCCESS,
          "the platform takes the key");
  return object;
}

// The TSM reads the protected header; the agent knows A128GCM by the header's bytes.
bool agrees_on_scheme(const tsm::Json &jwe) {
  const std::string *protect = tsm::find_string(jwe, "protect");
  const auto text = protect == nullptr ? std::nullopt : tsm::base64url_decode(*protect);
  const auto header = text ? tsm::parse_json(*text) : std::nullopt;
  const std::string *enc = header ? tsm::find_string(*header, "enc") : nullptr;
  return enc != nullptr && (*enc != "A128GCM" || *text == JWE_HEADER_A128GCM);
}

std::string serialized(const JSON_Value *value) {
  return fuzz::take_text(json_serialize_to_string(value));
}

void check_encryption(TEE_ObjectHandle key, const JSON_Value *value) {
  for (const char *header : {JWE_HEADER_A128CBC_HS256, JWE_HEADER_A128GCM}) {
    const json_ptr jwe(encrypt_json(key, value, header));
    require(jwe != nullptr, "a value is encrypted");
    const auto opened =
        tsm::jwe_decrypt(recipient(), tsm::parse_json(serialized(jwe.get())).value());
    require(opened == serialized(value), "the TSM opens what the agent encrypts");
  }
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  fuzz::Inside &inside = fuzz::Inside::instance();
  const fuzz::ExactText text(fuzz::as_view(data, size));
  {
    const key_object key(import(recipient()));
    const json_ptr jwe(json_parse_string(text.get()));
    const json_ptr value(decrypt_json(key.get(), jwe.get()));
    const auto strict = tsm::parse_json(text.get());
    const auto opened = strict ? tsm::jwe_decrypt(recipient(), *strict) : std::nullopt;
    if (jwe && opened && agrees_on_scheme(*strict)) {
      const json_ptr same(json_parse_string(fuzz::ExactText(*opened).get()));
      require((value != nullptr) == (same != nullptr), "the agent opens what the TSM opens");
      if (value) require(serialized(value.get()) == serialized(same.get()), "to the same text");
    }
    if (value) check_encryption(key.get(), value.get());
  }
  inside.require_clean();
  return 0;
}
