// SPDX-License-Identifier: BSD-2-Clause
// UpdateTA: a newer image of a TA that its security domain has already.
#include "failure.h"
#include "operations/install_ta.h"
#include "operations/operations.h"
#include "otrp_result.h"
#include "security/tsm_trust.h"
#include "state/object_store.h"
#include "state/records.h"

namespace {

const exchange_form kForm = {
    .process = "updateta_process",
    .tbs_request = "UpdateTATBSRequest",
    .tbs_response = "UpdateTATBSResponse",
    .rules = kAllRules,
    .texts = kStepTexts,
};

}  // namespace

// Deletes the TA record and writes it anew. The SD record and the DSI stay as they are.
static TEE_Result update_ta(const char *sdname, const char *spid, const char *taid,
                            const char *ta_version) {
  CHECK(sdname != nullptr && spid != nullptr && ta_version != nullptr && taid != nullptr,
        OTRP_MISSING, "update ta fail input is null");
  json_ptr sd_info;
  TRY_LOG(get_sd_info_persistent_object_to_json_value(sdname, out(sd_info)),
          "get_sd_info_persistent_object_to_json_value get sd_info from po fail error code: 0x%x");
  uint32_t found = 0;
  const TEE_Result checked = check_ta_exist_in_ta_list(taid, sd_info.get(), &found);
  CHECK(checked == TEE_SUCCESS && found != 0, OTRP_NOT_FOUND,
        "ta not exist in ta_list, otrp fail error code: 0x%x", checked);
  CHECK(can_be_stored(spid) && can_be_stored(ta_version), OTRP_NO_MEMORY,
        "update_ta fail, a text cannot be stored");
  TRY_LOG(save_ta_info_to_persistent_object(spid, sdname, taid, ta_version, true),
          "save_ta_info_to_persistent_object fail error code: 0x%x");
  return TEE_SUCCESS;
}

static TEE_Result carry_out(exchange *x) {
  const char *as = kForm.process;
  TRY(check_dsihash(*x));
  const JSON_Object *content = nullptr;
  TRY(decrypt_content(x, &content));
  const char *spid = json_object_get_string(content, "spid");
  const char *taid = json_object_get_string(content, "taid");
  const char *sdname = json_object_get_string(content, "sdname");
  CHECK_AS(as, taid != nullptr, OTRP_MISSING, "update ta fail input is null");
  TRY(verify_tsm_installta_updateta_signature(x->request.get(), x->tsmid, taid, x->message));

  const token_object_ptr encrypted_ta(jsmn_object_get_object(x->request.get(), "encrypted_ta"));
  CHECK_AS(as, encrypted_ta, OTRP_NO_MEMORY, "jsmn_object_get_object encrypted_ta_object is null");
  secret_bytes plain;
  tee_ptr<uint8_t> digest;
  TRY_LOG_AS(as,
             verify_encrypted_ta("ciphernewtadata", spid, encrypted_ta.get(), &plain.data,
                                 &plain.len, out(digest)),
             "verify_encrypted_ta error code: 0x%x");
  TRY(add_ids(x));
  TRY_LOG_AS(as, update_ta(sdname, spid, taid, json_object_get_string(content, "ta_version")),
             "update_ta error code 0x%x");

  return hand_over_image(x, taid, kUpdateTa, &plain);
}

TEE_Result updateta_process(const char *tsmid, const jsmn_object *tbs, char **response,
                            ta_image *image, const jsmn_object *request) {
  return run_exchange(kForm, carry_out, tsmid, tbs, response, image, request);
}
