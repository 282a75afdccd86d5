// SPDX-License-Identifier: BSD-2-Clause
#include "frame/response_fields.h"

#include "failure.h"
#include "otrp_result.h"
#include "ownership.h"
#include "security/jwe.h"
#include "security/tsm_trust.h"
#include "state/dsi.h"
#include "state/token_reader.h"

namespace {
const char kReasonTemplate[] = "{\"error_code\":\"\",\"error_message\":\"\"}";
}

// ---- ver, rid, tid

static TEE_Result echo(const jsmn_object *tbs, const char *key, JSON_Object *response,
                       const char *as = __builtin_FUNCTION()) {
  const slice_ptr slice(jsmn_object_get_string(tbs, key));
  CHECK_AS(as, slice && slice->data != nullptr, OTRP_BAD_REQUEST, "get %s error", key);
  const tee_ptr<char> copy(jsmn_string_dup(slice->data, slice->len));
  CHECK_AS(as, copy, OTRP_NO_MEMORY, "copy %s get NULL, out of memory", key);
  return static_cast<TEE_Result>(json_object_set_string(response, key, copy.get()));
}

TEE_Result add_ver_rid_tid(JSON_Object *response, const jsmn_object *tbs) {
  TRY(static_cast<TEE_Result>(json_object_set_string(response, "ver", "1.0")));
  TRY(echo(tbs, "rid", response));
  return echo(tbs, "tid", response);
}

// ---- status

static TEE_Result set_failed(TEE_Result result, JSON_Object *response,
                             const char *as = __builtin_FUNCTION()) {
  json_ptr reason(json_parse_string(kReasonTemplate));
  CHECK_AS(as, reason, OTRP_NO_MEMORY, "construct reason json object but get null");
  JSON_Object *members = json_value_get_object(reason.get());
  CHECK_AS(as, members != nullptr, OTRP_NO_MEMORY, "get reason_object is null from reason_value");
  JSON_Status set = json_object_set_number(members, "error_code", static_cast<double>(result));
  CHECK_AS(as, set == JSONSuccess, OTRP_NO_MEMORY, "json_object_set_value fail error code: %d",
           set);
  set = json_object_take(response, "reason", &reason);
  CHECK_AS(as, set == JSONSuccess, OTRP_NO_MEMORY,
           "json_object_set_value reason fail error code: %d", set);
  set = json_object_set_string(response, "status", "fail");
  CHECK_AS(as, set == JSONSuccess, OTRP_NO_MEMORY, "json_object_set_value fail error code: %d",
           set);
  return TEE_SUCCESS;
}

static TEE_Result add_dsi(JSON_Object *content, const char *as = __builtin_FUNCTION()) {
  const json_ptr document(construct_dsi());
  CHECK_AS(as, document, OTRP_NO_MEMORY, "construct_dsi to get dsi from mem error");
  json_ptr dsi(
      json_value_deep_copy(json_object_get_value(json_value_get_object(document.get()), "dsi")));
  CHECK_AS(as, dsi, OTRP_NO_MEMORY, "deep copy dsi.dsi fail out of mem");
  const JSON_Status set = json_object_take(content, "dsi", &dsi);
  CHECK_AS(as, set == JSONSuccess, OTRP_NO_MEMORY, "json_object_set_value dsi fail error code: %d",
           set);
  return TEE_SUCCESS;
}

static TEE_Result set_passed(const char *tsmid, JSON_Object *response, JSON_Value *content,
                             bool with_dsi, const char *as = __builtin_FUNCTION()) {
  JSON_Object *members = json_value_get_object(content);
  CHECK_AS(as, members != nullptr, OTRP_NO_MEMORY,
           "get content_resp_object is null from content_resp_value");
  JSON_Status set = json_object_set_string(response, "status", "pass");
  CHECK_AS(as, set == JSONSuccess, OTRP_NO_MEMORY, "json_object_set_value fail error code: %d",
           set);
  if (with_dsi) TRY(add_dsi(members, as));

  key_object key;
  TRY_LOG_AS(as, get_tsm_pubkey_by_tsmid(tsmid, out(key)), "convert_ca_to_pubkey error code: 0x%x");
  json_ptr encrypted(encrypt_json(key.get(), content, JWE_HEADER_A128CBC_HS256));
  set = json_object_take(response, "content", &encrypted);
  CHECK_AS(as, set == JSONSuccess, OTRP_NO_MEMORY,
           "json_object_set_value content fail error code: %d", set);
  return TEE_SUCCESS;
}

TEE_Result finish_tbs_msg_status(const char *tsmid, TEE_Result result, JSON_Object *response,
                                 JSON_Value *content, bool with_dsi) {
  if (response == nullptr) return OTRP_MISSING;
  if (result != TEE_SUCCESS) return set_failed(result, response);
  return set_passed(tsmid, response, content, with_dsi);
}
