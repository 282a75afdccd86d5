// SPDX-License-Identifier: BSD-2-Clause
#include "crypto/aik.h"

#include "crypto/base64.h"
#include "crypto/rsa.h"
#include "failure.h"
#include "otrp_result.h"
#include "ownership.h"
#include "record_names.h"
#include "state/object_store.h"

TEE_Result generate_aik(tlv_box **box) {
  CHECK(box != nullptr, TEE_SUCCESS, "generate_aik input is null");
  *box = nullptr;

  key_object key;
  TRY_LOG(allocate_rsa_key_object(kRsaKeyBits, out(key)), "allocate_rsa_key_object error code: %x");
  TRY_LOG(serialize_rsa_key_to_tlv(key.get(), box), "serialize rsa object error 0x%x\n");
  return TEE_SUCCESS;
}

TEE_Result get_aik_tlv_box_by_spid(const char *spid, tlv_box **box) {
  CHECK(spid != nullptr && spid[0] != 0 && box != nullptr, OTRP_MISSING,
        "get_aik_tlv_box_by_spid input is NULL");
  *box = nullptr;

  const json_ptr sp_info(get_json_by_name(SP_INFO_PREFIX, spid));
  CHECK(sp_info, OTRP_SP_NOT_FOUND, "get_sp_info_persistent_object_to_json_value error code: 0x%x",
        OTRP_SP_NOT_FOUND);
  secret_bytes bytes;
  bytes.len = base64DecodeStringRemoveEndZero(
      json_object_get_string(json_value_get_object(sp_info.get()), "aik"), &bytes.data);
  CHECK(bytes.data != nullptr && bytes.len != 0, OTRP_MISSING, "decode aik string fail");
  box_ptr parsed(tlv_box_parse(bytes.data, bytes.len));
  CHECK(parsed, OTRP_NO_MEMORY, "tlv_box_parse error");
  *box = parsed.release();
  return TEE_SUCCESS;
}

// The first steps of both readers below, with the same texts.
static TEE_Result load_box(const char *caller, const char *spid, box_ptr *box) {
  TRY_LOG_AS(caller, get_aik_tlv_box_by_spid(spid, out(*box)),
             "get_aik_tlv_box_by_spid error code: 0x%x");
  CHECK_AS(caller, *box, OTRP_MISSING, "get_aik_tlv_box_by_spid return NULL");
  return TEE_SUCCESS;
}

TEE_Result get_aik_key_handle(const char *spid, TEE_ObjectHandle *key) {
  CHECK(spid != nullptr && spid[0] != 0 && key != nullptr, OTRP_MISSING,
        "get_aik_key_handle params is null");
  *key = TEE_HANDLE_NULL;

  box_ptr box;
  TRY(load_box(__func__, spid, &box));
  *key = deserialize_rsa_key_from_tlv(box.get());
  CHECK(*key != TEE_HANDLE_NULL, OTRP_NO_MEMORY, "deserialize_rsa_key_from_tlv get NULL");
  return TEE_SUCCESS;
}

TEE_Result read_public_aik(const char *spid, uint8_t **encoded, uint32_t *encoded_len) {
  CHECK(spid != nullptr && spid[0] != 0 && encoded != nullptr && encoded_len != nullptr,
        OTRP_MISSING, "read_public_aik input is NULL");
  *encoded = nullptr;
  *encoded_len = 0;

  box_ptr box;
  TRY(load_box(__func__, spid, &box));
  TRY_LOG(parse_key_tlv_box_to_encoded_pubkey(box.get(), encoded, encoded_len),
          "parse_key_tlv_box_to_encoded_pubkey error code: 0x%x");
  CHECK(*encoded != nullptr && *encoded_len != 0, OTRP_MISSING,
        "parse_key_tlv_box_to_encoded_pubkey return NULL");
  return TEE_SUCCESS;
}
