// SPDX-License-Identifier: BSD-2-Clause
// DeleteSD: removes a security domain, on request with its TAs, and its SP with the last one.

#include "failure.h"
#include "operations/delete_ta.h"
#include "operations/exchange.h"
#include "operations/operations.h"
#include "otrp_result.h"
#include "platform.h"
#include "record_names.h"
#include "state/dsi.h"
#include "state/object_store.h"
#include "state/records.h"

namespace {

const exchange_form kForm = {
    .process = "deletesd_process",
    .tbs_request = "DeleteSDTBSRequest",
    .tbs_response = "DeleteSDTBSResponse",
    .rules = {.needs_payload = true},
    .texts = kPointerTexts,
};

}  // namespace

static TEE_Result load_json(const char *id, JSON_Value **value) {
  secret_bytes data;
  TRY(load_payload(id, &data));
  if (data.data != nullptr) *value = json_parse_string(reinterpret_cast<const char *>(data.data));
  return TEE_SUCCESS;
}

static TEE_Result load_sd_list(json_ptr *sd_list, const char *as = __builtin_FUNCTION()) {
  TRY(load_json(SD_LIST_ID, out(*sd_list)));
  CHECK_AS(as, json_value_get_object(sd_list->get()) != nullptr, OTRP_RESPONSE_FAILED,
           "parse sd list error");
  return TEE_SUCCESS;
}

static TEE_Result load_sd_info(const char *sdname, tee_ptr<char> *id, json_ptr *sd_info,
                               const char *as = __builtin_FUNCTION()) {
  concat_pobj_name(SD_INFO_PREFIX, sdname, out(*id));
  CHECK_AS(as, *id, OTRP_NO_MEMORY, "no memory for sd_pid");
  TRY(load_json(id->get(), out(*sd_info)));
  CHECK_AS(as, *sd_info, OTRP_RESPONSE_FAILED, "parse json error sd");
  if (json_value_get_object(sd_info->get()) == nullptr) {
    trace_error(as, __LINE__, "json_value_get_object sd error");
  }
  return TEE_SUCCESS;
}

// Deletes the TA records of an SD, up to the first that cannot be deleted.
static void delete_sd_ta(const JSON_Object *sd_info) {
  if (sd_info == nullptr) {
    trace_error(__func__, __LINE__, "delete_sd_ta input sd params is NULL");
    return;
  }
  const JSON_Array *talist = json_object_get_array(sd_info, "talist");
  if (talist == nullptr) {
    trace_error(__func__, __LINE__, "delete_sd_ta talist is null, no ta to delete");
    return;
  }
  const size_t num_tas = json_array_get_count(talist);
  for (size_t i = 0; i < num_tas; ++i) {
    const char *taid = json_object_get_string(json_array_get_object(talist, i), "taid");
    if (taid == nullptr) {
      trace_error(__func__, __LINE__, "taid is NULL in sdlist.talist?");
      continue;
    }
    const TEE_Result deleted = delete_ta_persistent_object(taid);
    if (deleted == TEE_SUCCESS) continue;
    trace_error(__func__, __LINE__, "delete_ta_persistent_object error code 0x%x", deleted);
    return;
  }
}

// The last SD takes its SP along.
static TEE_Result check_dsi_sdl_if_spid_not_exist_delete(const char *spid) {
  uint32_t found = 0;
  TRY_LOG(check_spid_in_dsi_sdl(g_dsi, spid, &found), "check_spid_in_dsi_sdl error code: 0x%x");
  if (found != 0) return TEE_SUCCESS;
  TRY_LOG(delete_dsi_spl_item_with_spid(g_dsi, spid),
          "delete_dsi_spl_item_with_spid error code: 0x%x");
  TRY_LOG(delete_sp_info(spid), "delete_sp_info error code: 0x%x");
  return TEE_SUCCESS;
}

// Writes the SD list, deletes the TA records (with `deleteta`) and the SD record, takes the SD and,
// with its last SD, the SP out of the DSI, and deletes the SP record, in this order.
static TEE_Result delete_sd(const char *tsmid, const char *sdname, bool deleteta) {
  json_ptr sd_list;
  TRY(load_sd_list(&sd_list));
  TRY(delete_sd_from_list(json_value_get_object(sd_list.get()), sdname));
  tee_ptr<char> id;
  json_ptr sd_info;
  TRY(load_sd_info(sdname, &id, &sd_info));
  // The list is saved only now, so that a request from another TSM changes nothing.
  TRY(validate_tsm(sd_info.get(), tsmid));
  TRY(save_sd_list(sd_list.get()));

  const JSON_Object *record = json_value_get_object(sd_info.get());
  if (deleteta) delete_sd_ta(record);
  TRY(delete_persistent_object(id.get(), static_cast<uint32_t>(strlen(id.get()))));
  TRY_LOG(dsi_delete_sd_by_name(g_dsi, sdname), "dsi_delete_sd_by_name error code 0x%x");
  const char *spid = json_object_get_string(record, "spid");
  CHECK(spid != nullptr, OTRP_RESPONSE_FAILED, "json_object_get_string spid");
  TRY_LOG(check_dsi_sdl_if_spid_not_exist_delete(spid),
          "check_dsi_sdl_if_spid_not_exist_delete error code 0x%x");
  return TEE_SUCCESS;
}

static TEE_Result read_deleteta(const JSON_Object *content, bool *deleteta) {
  const char *text = json_object_get_string(content, "deleteta");
  if (text == nullptr) return OTRP_BAD_REQUEST;
  *deleteta = strcmp(text, "true") == 0 || strcmp(text, "TRUE") == 0;
  const bool keep = strcmp(text, "false") == 0 || strcmp(text, "FALSE") == 0;
  return *deleteta || keep ? TEE_SUCCESS : OTRP_BAD_REQUEST;
}

static TEE_Result carry_out(exchange *x) {
  TRY(add_ids(x));
  TRY(check_dsihash(*x));
  const JSON_Object *content = nullptr;
  TRY(decrypt_content(x, &content));
  x->tsmid = json_object_get_string(content, "tsmid");
  bool deleteta = false;
  TRY(read_deleteta(content, &deleteta));
  return delete_sd(x->tsmid, json_object_get_string(content, "sdname"), deleteta);
}

TEE_Result deletesd_process(const char *tsmid, const jsmn_object *tbs, char **response,
                            ta_image *image, const jsmn_object *request) {
  return run_exchange(kForm, carry_out, tsmid, tbs, response, image, request);
}
