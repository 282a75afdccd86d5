// SPDX-License-Identifier: BSD-2-Clause
// InstallTA: decrypts a TA image, records the TA in a security domain and hands the image over.
#include "operations/install_ta.h"

#include "crypto/aik.h"
#include "crypto/base64.h"
#include "crypto/rsa.h"
#include "crypto/symmetric.h"
#include "failure.h"
#include "operations/operations.h"
#include "otrp_result.h"
#include "platform.h"
#include "record_names.h"
#include "security/tsm_trust.h"
#include "state/dsi.h"
#include "state/object_store.h"
#include "state/records.h"
#include "state/ta_register.h"

namespace {

constexpr exchange_texts kTexts = [] {
  exchange_texts own = kStepTexts;
  own.no_response = nullptr;
  own.no_request = "json_value_get_object InstallTATBSRequest_object is null";
  own.no_dsihash = "jsmn_object_get_string dsihash is null";
  own.no_jwe = "json_object_get_value enc_content is null";
  own.no_members = "json_value_get_object content_object is null";
  return own;
}();

const exchange_form kForm = {
    .process = "installta_process",
    .tbs_request = "InstallTATBSRequest",
    .tbs_response = "InstallTATBSResponse",
    .rules = kAllRules,
    .texts = kTexts,
};

constexpr uint32_t kImageKeyLen = 32;  // the last 16 bytes are the AES key

}  // namespace

// ---- The image

static TEE_Result decode_member(const jsmn_object *from, const char *key, const char *missing,
                                const char *undecodable, secret_bytes *bytes,
                                const char *as = __builtin_FUNCTION()) {
  const slice_ptr slice(jsmn_object_get_string(from, key));
  CHECK_AS(as, slice, OTRP_NO_MEMORY, "%s", missing);
  bytes->len = base64urlDecodeStringRemoveEndZeroV2(slice->data, slice->len, &bytes->data);
  CHECK_AS(as, bytes->len != 0, OTRP_TA_DECRYPT_FAILED, "%s", undecodable);
  return TEE_SUCCESS;
}

static TEE_Result unwrap_image_key(const char *spid, const jsmn_object *encrypted_ta,
                                   secret_bytes *image_key, const char *as = __builtin_FUNCTION()) {
  secret_bytes wrapped;
  TRY(decode_member(encrypted_ta, "key", "get encrypted_key_encoded is null",
                    "encrypted_key decode base64url error get null", &wrapped, as));
  key_object aik;
  TEE_Result result = get_aik_key_handle(spid, out(aik));
  CHECK_AS(as, result == TEE_SUCCESS && aik, OTRP_TA_DECRYPT_FAILED,
           "get_aik_key_handle error code: 0x%x", result);
  result = rsa_decrypt(aik.get(), wrapped.data, wrapped.len, &image_key->data, &image_key->len);
  CHECK_AS(as, result == TEE_SUCCESS && image_key->len >= kImageKeyLen, OTRP_TA_DECRYPT_FAILED,
           "rsa_decrypt error code: 0x%x", result);
  return TEE_SUCCESS;
}

TEE_Result verify_encrypted_ta(const char *field, const char *spid, const jsmn_object *encrypted_ta,
                               uint8_t **image, uint32_t *image_len, uint8_t **digest) {
  CHECK(encrypted_ta != nullptr && image != nullptr && image_len != nullptr && digest != nullptr,
        OTRP_MISSING, "verify_encrypted_ta input is null");
  *image = nullptr;
  *image_len = 0;
  *digest = nullptr;

  secret_bytes image_key;
  TRY(unwrap_image_key(spid, encrypted_ta, &image_key));
  secret_bytes iv;
  TRY(decode_member(encrypted_ta, "iv", "get iv_encoded is null",
                    "iv decode base64url error get null", &iv));
  secret_bytes cipher;
  TRY(decode_member(encrypted_ta, field, "get ciphertadata_encoded is null",
                    "ciphertadata decode base64url error get null", &cipher));
  secret_bytes plain;
  const uint32_t cipher_len = cipher.len;
  const TEE_Result decrypted = aes_cbc_decrypt_with_update_block(
      get_aes_key_from_cek(image_key.data), kAesBlockLen, iv.data, iv.len, cipher.release(),
      cipher_len, &plain.data, &plain.len);
  CHECK(decrypted == TEE_SUCCESS && plain.len != 0, OTRP_TA_DECRYPT_FAILED,
        "aes_cbc_decrypt ta decryption fail error code: 0x%x", decrypted);

  tee_ptr<uint8_t> hash(allocate_bytes(kSha256Len));
  CHECK(hash, OTRP_NO_MEMORY, "no memory for ta_hash");
  uint32_t hash_len = kSha256Len;
  CHECK(do_digest_with_sha(TEE_ALG_SHA256, plain.data, plain.len, hash.get(), &hash_len) ==
            TEE_SUCCESS,
        OTRP_NO_MEMORY, "compute ta_hash fail");
  *image_len = plain.len;
  *image = plain.release();
  *digest = hash.release();
  return TEE_SUCCESS;
}

TEE_Result hand_over_image(exchange *x, const char *taid, ta_register_operation operation_code,
                           secret_bytes *plain) {
  if (json_object_set_string(x->response, "taid", taid) != JSONSuccess) return OTRP_NO_MEMORY;
  x->image.len = plain->len;
  x->image.data = plain->release();
  const uint8_t *with_header = x->image.len >= kTaImageHeaderLen ? x->image.data : nullptr;
  TRY_LOG_AS(x->form->process, save_ta_register_info(taid, with_header, operation_code),
             "save_ta_register_info fail error code: 0x%x");
  return TEE_SUCCESS;
}

// ---- The records

static TEE_Result add_ta_to_ta_list(const JSON_Value *sd_info, const char *sdname,
                                    const char *taid) {
  JSON_Array *talist = json_object_get_array(json_value_get_object(sd_info), "talist");
  CHECK(talist != nullptr, OTRP_NO_MEMORY, "add_ta_to_ta_list fail when get talist");
  json_ptr item(json_value_init_object());
  JSON_Object *members = json_value_get_object(item.get());
  const bool appended = json_object_set_string(members, "taid", taid) == JSONSuccess &&
                        json_object_set_string(members, "taname", taid) == JSONSuccess &&
                        json_array_take(talist, &item) == JSONSuccess;
  CHECK(appended, OTRP_NO_MEMORY, "json_array_append_string talist fail");
  return save_sd_info_with_json_value(sdname, sd_info);
}

// Writes the SD record and the TA record and refreshes the DSI, in this order.
static TEE_Result install_ta(const char *sdname, const char *spid, const char *taid,
                             const char *ta_version) {
  CHECK(sdname != nullptr && spid != nullptr && ta_version != nullptr && taid != nullptr,
        OTRP_MISSING, "install_ta fail input is null");
  json_ptr sd_info;
  TRY_LOG(get_sd_info_persistent_object_to_json_value(sdname, out(sd_info)),
          "get_sd_info_persistent_object_to_json_value get sd_info from po fail error code: 0x%x");
  uint32_t found = 0;
  const TEE_Result checked = check_ta_exist_in_ta_list(taid, sd_info.get(), &found);
  CHECK(checked == TEE_SUCCESS && found == 0, OTRP_TA_EXISTS,
        "ta already exist in ta_list, otrp fail error code: 0x%x", checked);
  CHECK(can_be_stored(taid) && can_be_stored(spid) && can_be_stored(ta_version), OTRP_NO_MEMORY,
        "install_ta fail, a text cannot be stored");
  CHECK(sizeof(TA_INFO_PREFIX) - 1 + strlen(taid) <= TEE_OBJECT_ID_MAX_LEN,
        TEE_ERROR_BAD_PARAMETERS, "save_ta_info_to_persistent_object fail error code: 0x%x",
        TEE_ERROR_BAD_PARAMETERS);

  TRY_LOG(add_ta_to_ta_list(sd_info.get(), sdname, taid),
          "add_ta_to_ta_list fail error code: 0x%x");
  TRY_LOG(save_ta_info_to_persistent_object(spid, sdname, taid, ta_version, false),
          "save_ta_info_to_persistent_object fail error code: 0x%x");
  return refresh_sd_in_dsi(sdname);
}

// ---- The message

static TEE_Result carry_out(exchange *x) {
  const char *as = kForm.process;
  TRY(add_ids(x));
  TRY(check_dsihash(*x));
  const token_object_ptr encrypted_ta(jsmn_object_get_object(x->request.get(), "encrypted_ta"));
  CHECK_AS(as, encrypted_ta, OTRP_NO_MEMORY, "jsmn_object_get_object encrypted_ta_object is null");
  const JSON_Object *content = nullptr;
  TRY(decrypt_content(x, &content));
  const char *spid = json_object_get_string(content, "spid");
  const char *taid = json_object_get_string(content, "taid");
  const char *sdname = json_object_get_string(content, "sdname");
  CHECK_AS(as, taid != nullptr, OTRP_MISSING, "install_ta fail input is null");
  const TEE_Result verified =
      verify_tsm_installta_updateta_signature(x->request.get(), x->tsmid, taid, x->message);
  CHECK_AS(as, verified == TEE_SUCCESS, verified, "Failed to verify install TA request\n");

  secret_bytes plain;
  tee_ptr<uint8_t> digest;
  TRY_LOG_AS(as,
             verify_encrypted_ta("ciphertadata", spid, encrypted_ta.get(), &plain.data, &plain.len,
                                 out(digest)),
             "verify_encrypted_ta error code: 0x%x");
  TRY_LOG_AS(as, install_ta(sdname, spid, taid, json_object_get_string(content, "ta_version")),
             "install_ta error code 0x%x");

  return hand_over_image(x, taid, kRegisterTa, &plain);
}

TEE_Result installta_process(const char *tsmid, const jsmn_object *tbs, char **response,
                             ta_image *image, const jsmn_object *request) {
  return run_exchange(kForm, carry_out, tsmid, tbs, response, image, request);
}
