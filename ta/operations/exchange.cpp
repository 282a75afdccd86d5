// SPDX-License-Identifier: BSD-2-Clause
#include "operations/exchange.h"

#include "crypto/corvel_client.h"
#include "failure.h"
#include "frame/response_fields.h"
#include "otrp_result.h"
#include "security/jwe.h"
#include "state/dsi.h"

namespace {

// All of it is sent, also what a message has no use for.
const char kContentTemplate[] =
    "{\"reason\":{},\"did\":\"\",\"sdname\":\"\",\"cert\":\"\",\"teespaik\":\"\","
    "\"teespaiktype\":\"\",\"dsi\":{}}";

}  // namespace

tee_ptr<char> copy_member(const jsmn_object *from, const char *key) {
  const slice_ptr slice(jsmn_object_get_string(from, key));
  return tee_ptr<char>(slice ? jsmn_string_dup(slice->data, slice->len) : nullptr);
}

JSON_Status set_owned_value(JSON_Object *into, const char *key, json_ptr *value) {
  const JSON_Status set = json_object_set_value(into, key, value->get());
  if (set == JSONSuccess) (void)value->release();
  return set;
}

// ---- Opening

TEE_Result check_input(const exchange_texts &texts, const jsmn_object *tbs, char **response) {
  const bool complete = response != nullptr && (tbs != nullptr || !texts.needs_tbs);
  CHECK_AS(texts.process, complete, OTRP_MISSING, "%s", texts.null_input);
  *response = nullptr;
  return TEE_SUCCESS;
}

TEE_Result open_response(exchange *x) {
  const exchange_texts &say = *x->texts;
  x->root.reset(json_value_init_object());
  x->content_value.reset(json_parse_string(kContentTemplate));
  JSON_Object *root = json_value_get_object(x->root.get());
  x->content = json_value_get_object(x->content_value.get());
  auto *p1 = static_cast<void *>(x->root.get());
  auto *p2 = static_cast<void *>(root);
  auto *p3 = static_cast<void *>(x->content_value.get());
  CHECK_AS(say.process, x->root, OTRP_NO_MEMORY, say.no_root, p1, p2, p3);
  CHECK_AS(say.process, root != nullptr, OTRP_NO_MEMORY, say.no_root_object, p1, p2, p3);
  CHECK_AS(say.process, x->content_value || say.no_content == nullptr, OTRP_NO_MEMORY,
           say.no_content, p1, p2, p3);
  CHECK_AS(say.process, x->content != nullptr || say.no_content_object == nullptr, OTRP_NO_MEMORY,
           say.no_content_object, static_cast<void *>(x->content));

  json_ptr response(json_value_init_object());
  if (response && set_owned_value(root, say.tbs_response, &response) == JSONSuccess) {
    x->response = json_object_get_object(root, say.tbs_response);
  }
  CHECK_AS(say.process, x->response != nullptr, OTRP_NO_MEMORY, say.no_response_object,
           static_cast<void *>(x->response));
  return TEE_SUCCESS;
}

TEE_Result open_request(exchange *x, const jsmn_object *tbs) {
  if (tbs != nullptr) x->request.reset(jsmn_object_get_object(tbs, x->texts->tbs_request));
  CHECK_AS(x->texts->process, x->request, OTRP_BAD_REQUEST, "%s", x->texts->no_request);
  return TEE_SUCCESS;
}

// ---- Steps

TEE_Result add_ids(exchange *x) {
  const TEE_Result result = add_ver_rid_tid(x->response, x->request.get());
  if (result == TEE_SUCCESS || x->texts->ids_failed == nullptr) return result;
  FAIL_AS(x->texts->process, result, x->texts->ids_failed, result);
}

TEE_Result check_dsihash(const exchange &x) {
  const exchange_texts &say = *x.texts;
  const slice_ptr slice(jsmn_object_get_string(x.request.get(), "dsihash"));
  CHECK_AS(say.process, slice || say.no_dsihash == nullptr, OTRP_BAD_REQUEST, "%s", say.no_dsihash);
  const bool is_there = !slice || slice->data != nullptr;  // or there may be one
  const tee_ptr<char> hash(slice ? jsmn_string_dup(slice->data, slice->len) : nullptr);
  CHECK_AS(say.process, hash || !is_there, OTRP_NO_MEMORY, "no memory for dsihash");
  const TEE_Result result = validate_dsihash(hash.get());
  if (result == TEE_SUCCESS || say.dsihash_failed == nullptr) return result;
  FAIL_AS(say.process, result, say.dsihash_failed, result);
}

TEE_Result decrypt_content(exchange *x, const JSON_Object **members) {
  const exchange_texts &say = *x->texts;
  *members = nullptr;
  tee_ptr<char> text = copy_member(x->request.get(), "content");
  const json_ptr jwe(text ? json_parse_string(text.get()) : nullptr);
  CHECK_AS(say.process, jwe || say.content_unreadable == nullptr, OTRP_NO_MEMORY, "%s",
           say.content_unreadable);
  text.reset();

  const key_object tee_key(jwe ? get_tee_key() : nullptr);
  x->decrypted.reset(decrypt_json(tee_key.get(), jwe.get()));
  CHECK_AS(say.process, x->decrypted, OTRP_BAD_REQUEST, "decrypt_json error");
  *members = json_value_get_object(x->decrypted.get());
  CHECK_AS(say.process, *members != nullptr || say.content_no_object == nullptr, OTRP_NO_MEMORY,
           "%s", say.content_no_object);
  return TEE_SUCCESS;
}

// ---- Closing

TEE_Result close_response(exchange *x, TEE_Result result, char **response) {
  const exchange_texts &say = *x->texts;
  TRY_LOG_AS(say.process,
             finish_tbs_msg_status(x->tsmid, result, x->response, x->content_value.get(), true),
             "finish_tbs_msg_status error: 0x%x");
  x->content_value.reset();  // its encrypted form is in the response now
  x->decrypted.reset();
  *response = json_serialize_to_string(x->root.get());
  CHECK_AS(say.process, *response != nullptr, OTRP_NO_MEMORY, "%s", say.not_serialized);
  return TEE_SUCCESS;
}
