// SPDX-License-Identifier: BSD-2-Clause
// UpdateSD: renews the AIK and the certificate of the SP that owns a security domain.

#include "failure.h"
#include "operations/exchange.h"
#include "operations/new_aik.h"
#include "operations/operations.h"
#include "otrp_result.h"
#include "platform.h"
#include "state/dsi.h"
#include "state/object_store.h"
#include "state/records.h"

namespace {

const exchange_form kForm = {
    .process = "updatesd_process",
    .tbs_request = "UpdateSDTBSRequest",
    .tbs_response = "UpdateSDTBSResponse",
    .rules = kAllRules,
    .texts = kStepTexts,
};

}  // namespace

static bool member_equals(const JSON_Object *record, const char *key, const char *value) {
  const char *member = json_object_get_string(record, key);
  return member != nullptr && strcmp(member, value) == 0;
}

static TEE_Result check_sd(const char *sdname, const char *spid, const char *tsmid,
                           const char *as = __builtin_FUNCTION()) {
  json_ptr sd_info;
  TRY_LOG_AS(as, get_sd_info_persistent_object_to_json_value(sdname, out(sd_info)),
             "get_sd_info_persistent_object_to_json_value error code: 0x%x");
  CHECK_AS(as, sd_info, OTRP_MISSING, "get sd_info_value NULL, sdname: %s", sdname);
  const JSON_Object *record = json_value_get_object(sd_info.get());
  CHECK_AS(as, record != nullptr, OTRP_MISSING, "get json_object from sd_info_value fail");
  const bool same = member_equals(record, "name", sdname) && member_equals(record, "spid", spid) &&
                    member_equals(record, "tsmid", tsmid);
  return same ? TEE_SUCCESS : OTRP_SD_MISMATCH;
}

// A new AIK in place of the SP's. The DSI changes first, then the record is deleted and written.
static TEE_Result renew_aik(const char *spid, const char *spcert, uint8_t **pubkey,
                            uint32_t *pubkey_len, const char *as = __builtin_FUNCTION()) {
  json_ptr sp_info;
  const bool has_record =
      get_sp_info_persistent_object_to_json_value(spid, out(sp_info)) == TEE_SUCCESS;
  sp_info.reset();  // it was only to be seen whether there is one

  box_ptr box;
  TRY(make_aik(&box, pubkey, pubkey_len, as));
  TRY(announce_aik(spid, *pubkey, *pubkey_len, as));
  secret_text encoded_box;
  TRY(encode_aik(box.get(), out(encoded_box), as));
  if (has_record) {
    TRY_LOG_AS(as, delete_sp_info(spid), "delete_sp_info error code: 0x%x");
  }
  TRY_LOG_AS(as, save_sp_info(spid, spcert, encoded_box.get()),
             "save_sp_info fail error code: 0x%x");
  return TEE_SUCCESS;
}

// Checks that SD, SP and TSM belong together and carries the changes out. After a renewal
// `*pubkey` holds the encoded public half of the new AIK.
static TEE_Result update_sd(const char *sdname, const char *spid, const char *tsmid,
                            const JSON_Object *changes, uint8_t **pubkey, uint32_t *pubkey_len) {
  *pubkey = nullptr;
  *pubkey_len = 0;
  TRY(check_sd(sdname, spid, tsmid));

  const char *renew = json_object_get_string(changes, "renewteespaik");
  const char *spcert = json_object_get_string(changes, "spcert");
  if (renew == nullptr || strcmp(renew, "true") != 0 || spcert == nullptr) return TEE_SUCCESS;
  CHECK(can_be_stored(spcert), OTRP_NO_MEMORY, "update sd fail, a text cannot be stored");

  tee_ptr<uint8_t> key;
  uint32_t key_len = 0;
  TRY(renew_aik(spid, spcert, out(key), &key_len));
  *pubkey = key.release();
  *pubkey_len = key_len;
  return TEE_SUCCESS;
}

static TEE_Result carry_out(exchange *x) {
  TRY(check_dsihash(*x));
  const JSON_Object *content = nullptr;
  TRY(decrypt_content(x, &content));
  x->tsmid = json_object_get_string(content, "tsmid");
  const char *spid = json_object_get_string(content, "spid");
  const char *sdname = json_object_get_string(content, "sdname");
  const JSON_Object *changes = json_object_get_object(content, "changes");
  CHECK_AS(kForm.process,
           x->tsmid != nullptr && spid != nullptr && sdname != nullptr && changes != nullptr,
           OTRP_BAD_REQUEST, "update sd request content some field is NULL");
  TRY(add_ids(x));

  tee_ptr<uint8_t> pubkey;
  uint32_t pubkey_len = 0;
  TRY_LOG_AS(kForm.process, update_sd(sdname, spid, x->tsmid, changes, out(pubkey), &pubkey_len),
             "update_sd error code 0x%x");
  if (!pubkey) return TEE_SUCCESS;
  TRY(set_teespaik(x->content, pubkey.get(), pubkey_len, kForm.process));
  const bool set = json_object_set_string(x->content, "teespaiktype", "RSA") == JSONSuccess;
  return set ? TEE_SUCCESS : OTRP_NO_MEMORY;
}

TEE_Result updatesd_process(const char *tsmid, const jsmn_object *tbs, char **response,
                            ta_image *image, const jsmn_object *request) {
  return run_exchange(kForm, carry_out, tsmid, tbs, response, image, request);
}
