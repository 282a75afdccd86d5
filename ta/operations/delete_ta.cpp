// SPDX-License-Identifier: BSD-2-Clause
// DeleteTA: takes a TA out of its security domain.
#include "operations/delete_ta.h"

#include "failure.h"
#include "operations/exchange.h"
#include "operations/operations.h"
#include "otrp_result.h"
#include "platform.h"
#include "state/dsi.h"
#include "state/object_store.h"
#include "state/records.h"
#include "state/ta_register.h"

namespace {

const exchange_form kForm = {
    .process = "deleteta_process",
    .tbs_request = "DeleteTATBSRequest",
    .tbs_response = "DeleteTATBSResponse",
    .rules = {.needs_payload = true, .names_step = true},
    .texts = kPointerTexts,
};

}  // namespace

TEE_Result validate_tsm(const JSON_Value *sd_info, const char *tsmid) {
  const char *manager = json_object_get_string(json_value_get_object(sd_info), "tsmid");
  CHECK(manager != nullptr, OTRP_RESPONSE_FAILED, "json_object_get_string tsmid");
  CHECK(tsmid != nullptr && strcmp(manager, tsmid) == 0, OTRP_DSI_MISMATCH,
        "tsmid not matched sd_tsmid %s tsmid %s", manager, tsmid != nullptr ? tsmid : "(null)");
  return TEE_SUCCESS;
}

// Takes the TA out of the record's list; one that is not listed is no failure.
static TEE_Result delete_ta_in_ta_list(const JSON_Value *sd_info, const char *taid) {
  JSON_Array *talist = json_object_get_array(json_value_get_object(sd_info), "talist");
  if (talist == nullptr) return OTRP_NO_MEMORY;
  const size_t num_tas = json_array_get_count(talist);
  for (size_t i = 0; i < num_tas; ++i) {
    const char *listed = json_object_get_string(json_array_get_object(talist, i), "taid");
    if (listed == nullptr || strcmp(listed, taid) != 0) continue;
    return json_array_remove(talist, i) == JSONSuccess ? TEE_SUCCESS : OTRP_NO_MEMORY;
  }
  return TEE_SUCCESS;
}

// Writes the SD record, deletes the TA record, refreshes the DSI, in this order.
static TEE_Result delete_ta(const char *tsmid, const char *sdname, const char *taid) {
  CHECK(tsmid != nullptr && sdname != nullptr && taid != nullptr, OTRP_MISSING,
        "delete_ta input is NULL");
  json_ptr sd_info;
  TRY_LOG(get_sd_info_persistent_object_to_json_value(sdname, out(sd_info)),
          "get_sd_info_persistent_object_to_json_value get sd_info from po fail error code: 0x%x");
  TRY_LOG(validate_tsm(sd_info.get(), tsmid), "validate_tsm error code 0x%x");
  TRY_LOG(delete_ta_in_ta_list(sd_info.get(), taid), "delete_ta_in_ta_list error code 0x%x");
  TRY_LOG(save_sd_info_with_json_value(sdname, sd_info.get()),
          "save_sd_info_with_json_value error code 0x%x");
  TRY_LOG(delete_ta_persistent_object(taid), "delete_ta_persistent_object error code 0x%x");
  return refresh_sd_in_dsi(sdname);
}

static TEE_Result carry_out(exchange *x) {
  TRY(check_dsihash(*x));
  const JSON_Object *content = nullptr;
  TRY(decrypt_content(x, &content));
  x->tsmid = json_object_get_string(content, "tsmid");
  const char *taid = json_object_get_string(content, "taid");
  TRY_LOG_AS(kForm.process, delete_ta(x->tsmid, json_object_get_string(content, "sdname"), taid),
             "delete_ta error code 0x%x");

  TRY(add_ids(x));
  const JSON_Status set = json_object_set_string(x->response, "taid", taid);
  CHECK_AS(kForm.process, set == JSONSuccess, OTRP_NO_MEMORY,
           "json_object_set_string DeleteTATBSResponse taid error code: 0x%x",
           static_cast<unsigned>(set));
  TRY_LOG_AS(kForm.process, save_ta_register_info(taid, nullptr, kUnregisterTa),
             "save_ta_register_info fail error code: 0x%x");
  return TEE_SUCCESS;
}

TEE_Result deleteta_process(const char *tsmid, const jsmn_object *tbs, char **response,
                            ta_image *image, const jsmn_object *request) {
  return run_exchange(kForm, carry_out, tsmid, tbs, response, image, request);
}
