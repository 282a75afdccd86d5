// SPDX-License-Identifier: BSD-2-Clause
// GetTAInfo: tells anyone who asks what is recorded of a TA. The SP's AIK signs it, not the device.
// A failure has no response.
#include "crypto/aik.h"
#include "failure.h"
#include "operations/exchange.h"
#include "operations/operations.h"
#include "otrp_result.h"
#include "security/jws.h"
#include "state/object_store.h"

namespace {

// What a response is made of; NULL members are left out.
struct ta_facts {
  const char *taid;
  const char *spid;
  const char *tsmid = nullptr;
  const char *ta_version = nullptr;
  const char *spcert = nullptr;
};

struct records {
  json_ptr ta_info;
  json_ptr sd_info;
  json_ptr sp_info;
};

}  // namespace

static const char *text_of(const json_ptr &record, const char *key) {
  return json_object_get_string(json_value_get_object(record.get()), key);
}

static TEE_Result read_request(const jsmn_object *tbs, tee_ptr<char> *spid, tee_ptr<char> *taid,
                               const char *as = __builtin_FUNCTION()) {
  const token_object_ptr request(jsmn_object_get_object(tbs, "GetTAInfoRequest"));
  CHECK_AS(as, request, OTRP_BAD_REQUEST, "GetTAInfoRequest is null");
  const slice_ptr spid_slice(jsmn_object_get_string(request.get(), "spid"));
  const slice_ptr taid_slice(jsmn_object_get_string(request.get(), "taid"));
  CHECK_AS(as, spid_slice && taid_slice, OTRP_BAD_REQUEST, "spid taid input is NULL");
  spid->reset(jsmn_string_dup(spid_slice->data, spid_slice->len));
  taid->reset(jsmn_string_dup(taid_slice->data, taid_slice->len));
  CHECK_AS(as, *spid && *taid, OTRP_NO_MEMORY, "spid_copy taid_copy input is NULL");
  return TEE_SUCCESS;
}

static TEE_Result read_records(records *from, ta_facts *facts,
                               const char *as = __builtin_FUNCTION()) {
  TRY_LOG_AS(
      as, get_ta_info_persistent_object_to_json_value(facts->taid, out(from->ta_info)),
      "get_ta_info_persistent_object_to_json_value get ta_info from po fail error code: 0x%x");
  const char *sdid = text_of(from->ta_info, "sdid");
  CHECK_AS(as, sdid != nullptr, OTRP_TA_INFO_INCOMPLETE, "read ta_info get sdid is NULL");
  facts->ta_version = text_of(from->ta_info, "ta_version");
  CHECK_AS(as, facts->ta_version != nullptr, OTRP_TA_INFO_INCOMPLETE,
           "read ta_info get ta_version is NULL");
  TRY_LOG_AS(
      as, get_sd_info_persistent_object_to_json_value(sdid, out(from->sd_info)),
      "get_sd_info_persistent_object_to_json_value get sd_info from po fail error code: 0x%x");
  facts->tsmid = text_of(from->sd_info, "tsmid");
  TRY_LOG_AS(
      as, get_sp_info_persistent_object_to_json_value(facts->spid, out(from->sp_info)),
      "get_sp_info_persistent_object_to_json_value get sp_info from po fail error code: 0x%x");
  facts->spcert = text_of(from->sp_info, "spcert");
  return TEE_SUCCESS;
}

static bool set_facts(JSON_Object *into, const ta_facts &facts) {
  const struct {
    const char *key;
    const char *value;
  } members[] = {{"taid", facts.taid},
                 {"spid", facts.spid},
                 {"tsmid", facts.tsmid},
                 {"ta_version", facts.ta_version},
                 {"signercert", facts.spcert}};
  for (const auto &member : members) {
    if (member.value == nullptr) continue;
    if (json_object_set_string(into, member.key, member.value) != JSONSuccess) return false;
  }
  return true;
}

TEE_Result gettainfo_process(const char *, const jsmn_object *tbs, char **response, ta_image *,
                             const jsmn_object *) {
  CHECK(tbs != nullptr && response != nullptr, OTRP_BAD_REQUEST, "gettainfo_process input is null");
  *response = nullptr;
  const json_ptr root(json_value_init_object());
  JSON_Object *root_object = json_value_get_object(root.get());
  json_ptr inner(json_value_init_object());
  JSON_Object *information = nullptr;
  if (json_object_take(root_object, "TAInformationTBS", &inner) == JSONSuccess) {
    information = json_object_get_object(root_object, "TAInformationTBS");
  }

  tee_ptr<char> spid;
  tee_ptr<char> taid;
  TRY(read_request(tbs, &spid, &taid));
  ta_facts facts = {.taid = taid.get(), .spid = spid.get()};
  records stored;
  TRY(read_records(&stored, &facts));
  CHECK(information != nullptr, OTRP_NO_MEMORY, "init TAInformationTBS fail");
  if (!set_facts(information, facts)) return OTRP_NO_MEMORY;
  *response = json_serialize_to_string(root.get());
  return *response != nullptr ? TEE_SUCCESS : OTRP_NO_MEMORY;
}

TEE_Result gettainfo_sign_encode(const char *response, uint8_t *destination, uint32_t *len) {
  const uint32_t capacity = *len;
  *len = 0;
  CHECK(response != nullptr, OTRP_MISSING, "gettainfo_sign_encode is NULL");
  const json_ptr tbs(json_parse_string(response));
  CHECK(tbs, OTRP_NO_MEMORY, "tbs_json_str parse to json object out of mem");
  const char *spid = json_object_get_string(
      json_object_get_object(json_value_get_object(tbs.get()), "TAInformationTBS"), "spid");
  CHECK(spid != nullptr, OTRP_MISSING, "gettainfo_sign_encode cannot found spid in tbs_json");

  key_object aik;
  TRY_LOG(get_aik_key_handle(spid, out(aik)), "get_aik_key_handle error code: 0x%x");
  const json_text text(json_serialize_to_string(tbs.get()));
  CHECK(text, OTRP_NO_MEMORY, "tbs_json to json string fail");
  *len = capacity;
  TRY_LOG(
      sign_encode_by_name_with_key(text.get(), "GetTAInfoResponse", destination, len, aik.get()),
      "sign_encode_by_name_with_spaik error code: 0x%x");
  return TEE_SUCCESS;
}
