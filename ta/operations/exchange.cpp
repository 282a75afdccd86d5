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

// ---- Opening

static TEE_Result check_input(const exchange_form &form, const jsmn_object *tbs, char **response) {
  const bool complete = response != nullptr && (tbs != nullptr || !form.rules.needs_payload);
  CHECK_AS(form.process, complete, OTRP_MISSING, "%s input is NULL", form.process);
  *response = nullptr;
  return TEE_SUCCESS;
}

static TEE_Result check_objects(const exchange &x, const JSON_Object *root_object) {
  const exchange_form &form = *x.form;
  if (x.root && (x.content_value || !form.rules.needs_content)) return TEE_SUCCESS;
  if (form.texts.no_root != nullptr) {
    FAIL_AS(form.process, OTRP_NO_MEMORY, "%s",
            x.root ? form.texts.no_content : form.texts.no_root);
  }
  const auto *root = static_cast<const void *>(x.root.get());
  const auto *object = static_cast<const void *>(root_object);
  CHECK_AS(form.process, form.rules.needs_content, OTRP_NO_MEMORY,
           "json error response_value %p response_object %p\n", root, object);
  FAIL_AS(form.process, OTRP_NO_MEMORY,
          "json error response_value %p response_object %p content_resp_value %p\n", root, object,
          static_cast<const void *>(x.content_value.get()));
}

// After a failure there will be no response: close_response() finds that out.
static TEE_Result open_response(exchange *x) {
  const exchange_form &form = *x->form;
  x->root.reset(json_value_init_object());
  x->content_value.reset(json_parse_string(kContentTemplate));
  JSON_Object *root = json_value_get_object(x->root.get());
  x->content = json_value_get_object(x->content_value.get());
  TRY(check_objects(*x, root));

  json_ptr response(json_value_init_object());
  if (json_object_take(root, form.tbs_response, &response) == JSONSuccess) {
    x->response = json_object_get_object(root, form.tbs_response);
  }
  if (x->response != nullptr) return TEE_SUCCESS;
  CHECK_AS(form.process, form.texts.no_response == nullptr, OTRP_NO_MEMORY, "%s",
           form.texts.no_response);
  FAIL_AS(form.process, OTRP_NO_MEMORY, "json error %s %p\n", form.tbs_response,
          static_cast<void *>(x->response));
}

static TEE_Result open_request(exchange *x, const jsmn_object *tbs) {
  const exchange_form &form = *x->form;
  if (tbs != nullptr) x->request.reset(jsmn_object_get_object(tbs, form.tbs_request));
  CHECK_AS(form.process, x->request, OTRP_BAD_REQUEST, "%s", form.texts.no_request);
  return TEE_SUCCESS;
}

// ---- Steps

TEE_Result add_ids(exchange *x) {
  const TEE_Result result = add_ver_rid_tid(x->response, x->request.get());
  if (result == TEE_SUCCESS || !x->form->rules.names_step) return result;
  FAIL_AS(x->form->process, result, "add_ver_rid_tid fail error code: 0x%x", result);
}

TEE_Result check_dsihash(const exchange &x) {
  const exchange_form &form = *x.form;
  const slice_ptr slice(jsmn_object_get_string(x.request.get(), "dsihash"));
  CHECK_AS(form.process, slice || !form.rules.needs_dsihash, OTRP_BAD_REQUEST, "%s",
           form.texts.no_dsihash);
  const bool is_there = !slice || slice->data != nullptr;  // or there may be one
  const tee_ptr<char> hash(slice ? jsmn_string_dup(slice->data, slice->len) : nullptr);
  CHECK_AS(form.process, hash || !is_there, OTRP_NO_MEMORY, "no memory for dsihash");
  const TEE_Result result = validate_dsihash(hash.get());
  if (result == TEE_SUCCESS || !form.rules.names_step) return result;
  FAIL_AS(form.process, result, "validate_dsihash fail error code: 0x%x", result);
}

static tee_ptr<char> copy_member(const jsmn_object *from, const char *key) {
  const slice_ptr slice(jsmn_object_get_string(from, key));
  return tee_ptr<char>(slice ? jsmn_string_dup(slice->data, slice->len) : nullptr);
}

TEE_Result decrypt_content(exchange *x, const JSON_Object **members) {
  const exchange_form &form = *x->form;
  *members = nullptr;
  tee_ptr<char> text = copy_member(x->request.get(), "content");
  const json_ptr jwe(text ? json_parse_string(text.get()) : nullptr);
  CHECK_AS(form.process, jwe || !form.rules.needs_jwe, OTRP_NO_MEMORY, "%s", form.texts.no_jwe);
  text.reset();

  const key_object tee_key(jwe ? get_tee_key() : nullptr);
  x->decrypted.reset(decrypt_json(tee_key.get(), jwe.get()));
  CHECK_AS(form.process, x->decrypted, OTRP_BAD_REQUEST, "decrypt_json error");
  *members = json_value_get_object(x->decrypted.get());
  CHECK_AS(form.process, *members != nullptr || !form.rules.needs_members, OTRP_NO_MEMORY, "%s",
           form.texts.no_members);
  return TEE_SUCCESS;
}

// ---- Closing

// TEE_SUCCESS when there is a response, be the outcome good or bad.
static TEE_Result close_response(exchange *x, TEE_Result result, char **response) {
  const exchange_form &form = *x->form;
  TRY_LOG_AS(form.process,
             finish_tbs_msg_status(x->tsmid, result, x->response, x->content_value.get(), true),
             "finish_tbs_msg_status error: 0x%x");
  x->content_value.reset();  // its encrypted form is in the response now
  x->decrypted.reset();
  *response = json_serialize_to_string(x->root.get());
  CHECK_AS(form.process, *response != nullptr, OTRP_NO_MEMORY, "%s", form.texts.not_serialized);
  return TEE_SUCCESS;
}

TEE_Result run_exchange(const exchange_form &form, TEE_Result (*carry_out)(exchange *x),
                        const char *tsmid, const jsmn_object *tbs, char **response, ta_image *image,
                        const jsmn_object *message) {
  TRY(check_input(form, tbs, response));
  exchange x(form, tsmid, message);
  TEE_Result result = open_response(&x);
  if (result == TEE_SUCCESS) result = open_request(&x, tbs);
  if (result == TEE_SUCCESS) result = carry_out(&x);
  TRY(close_response(&x, result, response));
  if (x.image.data == nullptr) return TEE_SUCCESS;
  image->len = x.image.len;
  image->data = x.image.release();
  return TEE_SUCCESS;
}
