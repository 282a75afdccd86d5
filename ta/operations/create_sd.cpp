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
#include "state/records.h"

namespace {

const exchange_form kForm = {
    .process = "createsd_process",
    .tbs_request = "CreateSDTBSRequest",
    .tbs_response = "CreateSDTBSResponse",
    .rules = {.needs_content = true},
    .texts = kPointerTexts,
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
static TEE_Result check_texts(const char *spid, const char *sdname, const char *tsmid,
                              const char *as = __builtin_FUNCTION()) {
  CHECK_AS(as, spid == nullptr || spid[0] != 0, OTRP_MISSING, "create sd fail, spid is empty");
  CHECK_AS(as, can_be_stored(spid) && can_be_stored(sdname) && can_be_stored(tsmid), OTRP_NO_MEMORY,
           "create sd fail, a text cannot be stored");
  return TEE_SUCCESS;
}

// The DSI is told of a new AIK before it is saved: a save that cannot succeed is found out first.
static TEE_Result check_sp_record(const char *spid, const char *spcert,
                                  const char *as = __builtin_FUNCTION()) {
  if (spid == nullptr) return TEE_SUCCESS;  // nothing is announced for no SP
  CHECK_AS(as, sizeof(SP_INFO_PREFIX) - 1 + strlen(spid) <= TEE_OBJECT_ID_MAX_LEN,
           TEE_ERROR_BAD_PARAMETERS, "save_sp_info fail error code: 0x%x",
           TEE_ERROR_BAD_PARAMETERS);
  CHECK_AS(as, can_be_stored(spcert), OTRP_NO_MEMORY, "create sd fail, a text cannot be stored");
  json_ptr record;
  JSON_Object *object = nullptr;
  TRY_LOG_AS(as, init_sp_info(spid, spcert, "", &object, out(record)),
             "save_sp_info fail error code: 0x%x");
  return TEE_SUCCESS;
}

// Gives the SP an AIK: in the DSI first, then in a new record.
static TEE_Result add_aik(const char *spid, const char *spcert, uint8_t **pubkey,
                          uint32_t *pubkey_len, const char *as = __builtin_FUNCTION()) {
  TRY(check_sp_record(spid, spcert, as));
  box_ptr box;
  TRY(make_aik(&box, pubkey, pubkey_len, as));
  TRY(announce_aik(spid, *pubkey, *pubkey_len, as));
  secret_text encoded_box;
  TRY(encode_aik(box.get(), out(encoded_box), as));
  TRY_LOG_AS(as, save_sp_info(spid, spcert, encoded_box.get()),
             "save_sp_info fail error code: 0x%x");
  return TEE_SUCCESS;
}

static TEE_Result find_or_add_aik(const char *spid, const char *spcert, uint8_t **pubkey,
                                  uint32_t *pubkey_len, const char *as = __builtin_FUNCTION()) {
  box_ptr box;
  TEE_Result doubt = TEE_SUCCESS;
  const TEE_Result found = find_aik(spid, out(box), &doubt);
  if (found == TEE_SUCCESS) return read_public_half(box.get(), pubkey, pubkey_len, as);
  // An AIK that is there but could not be read now must not be replaced.
  CHECK_AS(as, doubt == TEE_SUCCESS, doubt, "create sd fail, the aik could not be read");
  return add_aik(spid, spcert, pubkey, pubkey_len, as);
}

// The work of the message: the SD, and an AIK where `spid` has none.
//
// `spcert` is stored only with a new SP. `*pubkey` receives the AIK's encoded public half.
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
  TRY(check_texts(spid, sdname, tsmid));

  // State changes from here on: SP, SD, list last, so that the list never names a missing SD.
  tee_ptr<uint8_t> key;
  uint32_t key_len = 0;
  TRY(find_or_add_aik(spid, spcert, out(key), &key_len));
  TRY_LOG(save_sd_info(spid, tsmid, sdname), "save_sd_info error code 0x%x");
  TRY_LOG(add_sd_item_to_sd_list(sdname, names), "add_sd_item_to_sd_list error code 0x%x");
  CHECK(save_sd_list(sd_list.get()) == TEE_SUCCESS, OTRP_NO_MEMORY, "save_sd_list error");
  TRY_LOG(dsi_load_sd_by_name(g_dsi, sdname), "dsi_load_sd_by_name error code: 0x%x");

  *pubkey = key.release();
  *pubkey_len = key_len;
  return TEE_SUCCESS;
}

static TEE_Result carry_out(exchange *x) {
  TRY(add_ids(x));
  TRY(check_dsihash(*x));
  const JSON_Object *content = nullptr;
  TRY(decrypt_content(x, &content));
  x->tsmid = json_object_get_string(content, "tsmid");
  CHECK_AS(kForm.process, validate_did(json_object_get_string(content, "did")) == TEE_SUCCESS,
           OTRP_DSI_MISMATCH, "validate did fails");

  const char *sdname = json_object_get_string(content, "sdname");
  tee_ptr<uint8_t> pubkey;
  uint32_t pubkey_len = 0;
  TRY(create_sd(json_object_get_string(content, "spid"), sdname,
                json_object_get_string(content, "spcert"), x->tsmid, out(pubkey), &pubkey_len));
  CHECK_AS(kForm.process, pubkey, OTRP_NO_MEMORY, "create sd fail, can not create aik");
  if (json_object_set_string(x->content, "sdname", sdname) != JSONSuccess) return OTRP_NO_MEMORY;
  return set_teespaik(x->content, pubkey.get(), pubkey_len, kForm.process);
}

TEE_Result createsd_process(const char *tsmid, const jsmn_object *tbs, char **response,
                            ta_image *image, const jsmn_object *request) {
  return run_exchange(kForm, carry_out, tsmid, tbs, response, image, request);
}
