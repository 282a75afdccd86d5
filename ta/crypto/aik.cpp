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
  if (box == nullptr) {
    trace_error(__func__, __LINE__, "generate_aik input is null");
    return TEE_SUCCESS;
  }
  *box = nullptr;

  key_object key;
  TRY_LOG(allocate_rsa_key_object(kRsaKeyBits, out(key)), "allocate_rsa_key_object error code: %x");
  TRY_LOG(serialize_rsa_key_to_tlv(key.get(), box), "serialize rsa object error 0x%x\n");
  return TEE_SUCCESS;
}

// Both look-ups log under the name of the older.
static const char kLookUp[] = "get_aik_tlv_box_by_spid";

TEE_Result find_aik(const char *spid, tlv_box **box, TEE_Result *doubt) {
  if (box != nullptr) *box = nullptr;
  *doubt = TEE_SUCCESS;
  CHECK_AS(kLookUp, spid != nullptr && spid[0] != 0 && box != nullptr, OTRP_MISSING,
           "get_aik_tlv_box_by_spid input is NULL");

  json_ptr sp_info;
  const TEE_Result read = read_json_by_name(SP_INFO_PREFIX, spid, out(sp_info));
  if (read != TEE_SUCCESS && read != TEE_ERROR_ITEM_NOT_FOUND) *doubt = read;
  CHECK_AS(kLookUp, sp_info, OTRP_SP_NOT_FOUND,
           "get_sp_info_persistent_object_to_json_value error code: 0x%x", OTRP_SP_NOT_FOUND);
  const char *aik = json_object_get_string(json_value_get_object(sp_info.get()), "aik");
  if (aik != nullptr && aik[0] != 0) *doubt = OTRP_NO_MEMORY;
  secret_bytes bytes;
  bytes.len = base64DecodeStringRemoveEndZero(aik, &bytes.data);
  CHECK_AS(kLookUp, bytes.data != nullptr && bytes.len != 0, OTRP_MISSING,
           "decode aik string fail");
  *box = tlv_box_parse(bytes.data, bytes.len);
  CHECK_AS(kLookUp, *box != nullptr, OTRP_NO_MEMORY, "tlv_box_parse error");
  return TEE_SUCCESS;
}

TEE_Result get_aik_tlv_box_by_spid(const char *spid, tlv_box **box) {
  TEE_Result ignored = TEE_SUCCESS;
  return find_aik(spid, box, &ignored);
}

// The first steps of both readers below, with the same texts.
static TEE_Result load_box(const char *spid, box_ptr *box, const char *as = __builtin_FUNCTION()) {
  TRY_LOG_AS(as, get_aik_tlv_box_by_spid(spid, out(*box)),
             "get_aik_tlv_box_by_spid error code: 0x%x");
  CHECK_AS(as, *box, OTRP_MISSING, "get_aik_tlv_box_by_spid return NULL");
  return TEE_SUCCESS;
}

TEE_Result get_aik_key_handle(const char *spid, TEE_ObjectHandle *key) {
  if (key != nullptr) *key = TEE_HANDLE_NULL;
  CHECK(spid != nullptr && spid[0] != 0 && key != nullptr, OTRP_MISSING,
        "get_aik_key_handle params is null");

  box_ptr box;
  TRY(load_box(spid, &box));
  *key = deserialize_rsa_key_from_tlv(box.get());
  CHECK(*key != TEE_HANDLE_NULL, OTRP_NO_MEMORY, "deserialize_rsa_key_from_tlv get NULL");
  return TEE_SUCCESS;
}

TEE_Result read_public_aik(const char *spid, uint8_t **encoded, uint32_t *encoded_len) {
  if (encoded != nullptr) *encoded = nullptr;
  if (encoded_len != nullptr) *encoded_len = 0;
  CHECK(spid != nullptr && spid[0] != 0 && encoded != nullptr && encoded_len != nullptr,
        OTRP_MISSING, "read_public_aik input is NULL");

  box_ptr box;
  TRY(load_box(spid, &box));
  TRY_LOG(parse_key_tlv_box_to_encoded_pubkey(box.get(), encoded, encoded_len),
          "parse_key_tlv_box_to_encoded_pubkey error code: 0x%x");
  CHECK(*encoded != nullptr && *encoded_len != 0, OTRP_MISSING,
        "parse_key_tlv_box_to_encoded_pubkey return NULL");
  return TEE_SUCCESS;
}
