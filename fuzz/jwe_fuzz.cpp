// SPDX-License-Identifier: BSD-2-Clause
// Encrypted contents: what the strict reader of the TSM opens the agent opens to the same text, and
// what the agent encrypts the TSM opens.
#include "crypto/rsa.h"
#include "security/jwe.h"
#include "support/inside.h"
#include "support/stored_device.h"
#include "tsm/protocol/jwe.h"

namespace fuzz {

// The stored key's records, behind one that tells the size of the key.
static TEE_ObjectHandle recipient() {
  static const std::string records = tsm::little_endian(kRsaKeySize, 2) + tsm::little_endian(4, 2) +
                                     tsm::little_endian(kKeyBits, 4) +
                                     tee_key_box_of(stored_device().key_service);
  const box_ptr box(tlv_box_parse(u8(records), static_cast<uint32_t>(records.size())));
  const TEE_ObjectHandle key = deserialize_rsa_key_from_tlv(box.get());
  require(key != nullptr, "the records make a key");
  return key;
}

static std::optional<std::string> open_as_tsm(std::string_view text) {
  static const tsm::RsaKey key = stored_device().tee_key();
  const std::optional<tsm::Json> jwe = tsm::parse_json(text);
  return jwe ? tsm::jwe_decrypt(key, *jwe) : std::nullopt;
}

// The TSM reads the protected header; the agent knows A128GCM by the header's bytes.
static bool agrees_on_scheme(const tsm::Json &jwe) {
  const std::string header = tsm::base64url_decode(*tsm::find_string(jwe, "protect")).value();
  const tsm::Json parsed = tsm::parse_json(header).value();
  return *tsm::find_string(parsed, "enc") != "A128GCM" || header == JWE_HEADER_A128GCM;
}

static std::string serialized(const JSON_Value *value) {
  return take_text(json_serialize_to_string(value));
}

void check(std::string_view input) {
  const Inside inside;
  const ExactText text(input);
  const key_object key(recipient());
  const json_ptr jwe(json_parse_string(text.get()));
  const json_ptr value(decrypt_json(key.get(), jwe.get()));
  const auto opened = open_as_tsm(text.get());
  if (jwe && opened && agrees_on_scheme(tsm::parse_json(text.get()).value())) {
    const json_ptr same(json_parse_string(ExactText(*opened).get()));
    require(bool(value) == bool(same), "the agent opens what the TSM opens");
    if (value) require(serialized(value.get()) == serialized(same.get()), "to the same text");
  }
  if (!value) return;
  for (const char *header : {JWE_HEADER_A128CBC_HS256, JWE_HEADER_A128GCM}) {
    const json_ptr sealed(encrypt_json(key.get(), value.get(), header));
    require(bool(sealed), "a value is encrypted");
    require(open_as_tsm(serialized(sealed.get())) == serialized(value.get()),
            "the TSM opens what the agent encrypts");
  }
}

}  // namespace fuzz
