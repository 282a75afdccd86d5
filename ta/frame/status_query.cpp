// SPDX-License-Identifier: BSD-2-Clause
#include "frame/status_query.h"

#include "cursor.h"
#include "failure.h"
#include "frame/pipeline.h"
#include "ownership.h"
#include "platform.h"
#include "state/json.h"
#include "state/object_store.h"

static constexpr uint32_t kQueryHeadLen = 8;  // reserved word, L

// Looks the TA of a query text up; TEE_SUCCESS when it is recorded.
static TEE_Result find_ta(const uint8_t *query, uint32_t query_len,
                          const char *as = __builtin_FUNCTION()) {
  tee_ptr<char> text(reinterpret_cast<char *>(allocate_bytes(query_len + 1)));
  if (text) memcpy(text.get(), query, query_len);
  const json_ptr params(text ? json_parse_string(text.get()) : nullptr);
  CHECK_AS(as, params, TEE_ERROR_OUT_OF_MEMORY,
           "parse input_params to json get NULL, out of memory or input_params format error %s",
           text ? text.get() : "");
  json_ptr ta_info;
  const TEE_Result result = get_ta_info_persistent_object_to_json_value(
      json_object_get_string(json_value_get_object(params.get()), "taid"), out(ta_info));
  CHECK_AS(as, result == TEE_SUCCESS, result,
           "get_ta_info_persistent_object_to_json_value get ta_info error");
  return TEE_SUCCESS;
}

static bool set_answer(JSON_Object *answer, bool found) {
  return json_object_set_string(answer, "status", found ? "0" : "-1") == JSONSuccess &&
         json_object_set_string(answer, "msg",
                                found ? "ta_info found in otrp" : "ta_info not found in otrp") ==
             JSONSuccess;
}

TEE_Result os_query_otrp(const void *in, uint32_t in_len, void *out, uint32_t *out_len) {
  CHECK(in != nullptr && in_len >= kQueryHeadLen && out != nullptr && out_len != nullptr,
        TEE_ERROR_BAD_PARAMETERS, "os_query_otrp input is null");
  const json_ptr answer(json_value_init_object());
  CHECK(answer, TEE_ERROR_OUT_OF_MEMORY, "response_json is NULL, out of memory");

  reader frame = {static_cast<const uint8_t *>(in), in_len};
  uint32_t reserved = 0;
  uint32_t len = 0;
  const uint8_t *query = nullptr;
  if (!take_u32(&frame, &reserved) || !take_u32(&frame, &len) || !take(&frame, len, &query)) {
    return TEE_SUCCESS;
  }
  if (*out_len < kStatusAnswerLen) {
    *out_len = kStatusAnswerLen;
    FAIL(TEE_ERROR_SHORT_BUFFER, "output buffer is too small\n");
  }

  const TEE_Result result = find_ta(query, len);
  const bool complete = set_answer(json_value_get_object(answer.get()), result == TEE_SUCCESS);
  const json_text text(complete ? json_serialize_to_string(answer.get()) : nullptr);
  CHECK(text, TEE_ERROR_OUT_OF_MEMORY, "json_serialize_to_string response_json_str is NULL");
  const auto text_len = static_cast<uint32_t>(strlen(text.get()));
  auto *at = static_cast<uint8_t *>(out);
  put_answer_head(at, result, text_len);
  memcpy(at + kAnswerHeadLen, text.get(), text_len);
  *out_len = kAnswerHeadLen + text_len;
  return result;
}
