// SPDX-License-Identifier: BSD-2-Clause
// CreateSD: a security domain for a service provider, and an AIK for one that has none yet.

#include "crypto/aik.h"
#include "failure.h"
#include "operations/exchange.h"
#include "operations/new_aik.h"
#include "operations/operations.h"
#include "otrp_result.h"
#include "platform.h"
#include "record_names.h"
#include "state/dsi.h"
#include "state/object_store.h"
#include "state/records.h"

namespace {

const exchange_texts kTexts = {
    .process = "createsd_process",
    .tbs_request = "CreateSDTBSRequest",
    .tbs_response = "CreateSDTBSResponse",
    .null_input = "createsd_process input is NULL",
    .needs_tbs = false,
    .no_root = "json error response_value %p response_object %p content_resp_value %p\n",
    .no_root_object = "json error response_value %p response_object %p content_resp_value %p\n",
    .no_content = "json error response_value %p response_object %p content_resp_value %p\n",
    .no_content_object = "content_resp_object is null %p\n",
    .no_response_object = "json error CreateSDTBSResponse %p\n",
    .no_request = "request_object is null",
    .ids_failed = nullptr,
    .no_dsihash = nullptr,
    .dsihash_failed = nullptr,
    .content_unreadable = nullptr,
    .content_no_object = nullptr,
    .not_serialized = "parse response_json to json string get NULL",
};

}  // namespace

// No rule rejects a device ID.
static TEE_Result validate_did(const char *did) {
  (void)did;
  trace_error(__func__, __LINE__, "dummy validate did");
  return TEE_SUCCESS;
}

// What the records could not give back, or the next instance could not start with, must not get
// into them. Missing texts are found by the functions that need them.
static TEE_Result check_texts(const char *caller, const char *spid, const char *sdname,
                              const char *tsmid) {
  CHECK_AS(caller, spid == nullptr || spid[0] != 0, OTRP_MISSING, "create sd fail, spid is empty");
  CHECK_AS(caller, can_be_stored(spid) && can_be_stored(sdname) && can_be_stored(tsmid),
           OTRP_NO_MEMORY, "create sd fail, a text cannot be stored");
  return TEE_SUCCESS;
}

// The DSI is told of a new AIK before it is saved: a save that cannot succeed is found out first.
static TEE_Result check_sp_record(const char *caller, const char *spid, const char *spcert) {
  if (spid == nullptr) return TEE_SUCCESS;  // nothing is announced for no SP
  CHECK_AS(caller, sizeof(SP_INFO_PREFIX) - 1 + strlen(spid) <= TEE_OBJECT_ID_MAX_LEN,
           TEE_ERROR_BAD_PARAMETERS, "save_sp_info fail error code: 0x%x",
           TEE_ERROR_BAD_PARAMETERS);
  CHECK_AS(caller, can_be_stored(spcert), OTRP_NO_MEMORY,
           "create sd fail, a text cannot be stored");
  json_ptr record;
  JSON_Object *object = nullptr;
  TRY_LOG_AS(caller, init_sp_info(spid, spcert, "", &object, out(record)),
             "save_sp_info fail error code: 0x%x");
  return TEE_SUCCESS;
}

// An AIK that could not be read, for want of memory or by a failing storage, must not be replaced.
static TEE_Result check_sp_has_no_aik(const char *caller, const char *spid) {
  if (spid == nullptr) return TEE_SUCCESS;
  tee_ptr<char> id;
  concat_pobj_name(SP_INFO_PREFIX, spid, out(id));
  CHECK_AS(caller, id, OTRP_NO_MEMORY, "no memory for sp_info_name");
  const auto id_len = static_cast<uint32_t>(strlen(id.get()));
  secret_bytes record;
  const TEE_Result loaded =
      allocate_and_load_data_from_persistent_object(id.get(), id_len, &record.data, &record.len);
  if (loaded == TEE_ERROR_ITEM_NOT_FOUND || loaded == TEE_ERROR_BAD_PARAMETERS) return TEE_SUCCESS;
  if (loaded != TEE_SUCCESS) return loaded;
  box_ptr box;
  CHECK_AS(caller, get_aik_tlv_box_by_spid(spid, out(box)) != TEE_SUCCESS, OTRP_NO_MEMORY,
           "create sd fail, the aik could not be read");
  return TEE_SUCCESS;
}

// Creates security domain `sdname` for SP `spid`; an SP without an AIK gets one.
//
// `spcert` is stored only with a new SP. `*pubkey` receives the encoded AIK public key.
// OTRP_SD_EXISTS when the name is taken. Writes SP record, SD record, SD list, in this order;
// earlier writes survive a failure.
static TEE_Result create_sd(const char *spid, const char *sdname, const char *spcert,
                            const char *tsmid, uint8_t **pubkey, uint32_t *pubkey_len) {
  *pubkey = nullptr;
  *pubkey_len = 0;

  json_ptr sd_list;
  JSON_Object *object = nullptr;
  JSON_Array *names = nullptr;
  TRY_LOG(get_sd_list_json_array(&names, &object, out(sd_list)),
          "get_sd_list_json_array parse sd_list string to json fail error code 0x%x");
  uint32_t listed = 0;
  TRY_LOG(check_sd_item_exist_in_sd_list(names, sdname, &listed),
          "check_sd_item_exist_in_sd_list fail error code 0x%x");
  CHECK(listed == 0, OTRP_SD_EXISTS, "create sd fail, cause already exist");
  TRY(check_texts(__func__, spid, sdname, tsmid));

  // State changes from here on: SP, SD, list last, so that the list never names a missing SD.
  tee_ptr<uint8_t> key;
  uint32_t key_len = 0;
  box_ptr box;
  const TEE_Result found = get_aik_tlv_box_by_spid(spid, out(box));
  if (found == TEE_SUCCESS && box) {
    TRY(read_public_half(__func__, box.get(), out(key), &key_len));
  } else {
    TRY(check_sp_has_no_aik(__func__, spid));
    TRY(check_sp_record(__func__, spid, spcert));
    TRY(make_aik(__func__, &box, out(key), &key_len));
    TRY(announce_aik(__func__, spid, key.get(), key_len));
    secret_text encoded_box;
    TRY(encode_aik(__func__, box.get(), out(encoded_box)));
    TRY_LOG(save_sp_info(spid, spcert, encoded_box.get()), "save_sp_info fail error code: 0x%x");
  }
  TRY_LOG(save_sd_info(spid, tsmid, sdname), "save_sd_info error code 0x%x");
  TRY_LOG(add_sd_item_to_sd_list(sdname, names), "add_sd_item_to_sd_list error code 0x%x");
  CHECK(save_sd_list(sd_list.get()) == TEE_SUCCESS, OTRP_NO_MEMORY, "save_sd_list error");
  TRY_LOG(dsi_load_sd_by_name(g_dsi, sdname), "dsi_load_sd_by_name error code: 0x%x");

  *pubkey = key.release();
  *pubkey_len = key_len;
  return TEE_SUCCESS;
}

static TEE_Result carry_out(exchange *x, const jsmn_object *tbs) {
  TRY(open_response(x));
  TRY(open_request(x, tbs));
  TRY(add_ids(x));
  TRY(check_dsihash(*x));
  const JSON_Object *content = nullptr;
  TRY(decrypt_content(x, &content));
  x->tsmid = json_object_get_string(content, "tsmid");
  CHECK_AS(kTexts.process, validate_did(json_object_get_string(content, "did")) == TEE_SUCCESS,
           OTRP_DSI_MISMATCH, "validate did fails");

  const char *sdname = json_object_get_string(content, "sdname");
  tee_ptr<uint8_t> pubkey;
  uint32_t pubkey_len = 0;
  TRY(create_sd(json_object_get_string(content, "spid"), sdname,
                json_object_get_string(content, "spcert"), x->tsmid, out(pubkey), &pubkey_len));
  CHECK_AS(kTexts.process, pubkey, OTRP_NO_MEMORY, "create sd fail, can not create aik");
  if (json_object_set_string(x->content, "sdname", sdname) != JSONSuccess) return OTRP_NO_MEMORY;
  return set_teespaik(kTexts.process, x->content, pubkey.get(), pubkey_len);
}

TEE_Result createsd_process(const char *tsmid, const jsmn_object *tbs, char **response, ta_image *,
                            const jsmn_object *) {
  TRY(check_input(kTexts, tbs, response));
  exchange x(kTexts, tsmid);
  const TEE_Result result = carry_out(&x, tbs);
  return close_response(&x, result, response);
}
