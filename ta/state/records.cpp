// SPDX-License-Identifier: BSD-2-Clause
#include "state/records.h"

#include "failure.h"
#include "otrp_result.h"
#include "ownership.h"
#include "platform.h"
#include "record_names.h"
#include "state/object_store.h"

namespace {

const char kDefaultSdList[] = "{\"sd_list\":[]}";
const char kSdInfoTemplate[] = "{\"name\":\"\",\"spid\":\"\",\"tsmid\":\"\",\"talist\":[]}";
const char kSpInfoTemplate[] = "{\"spid\":\"\",\"spcert\":\"\",\"aik\":\"\"}";

struct text_member {
  const char *key;
  const char *value;
};

}  // namespace

static uint32_t text_len(const char *text) {
  return static_cast<uint32_t>(strlen(text));
}

static TEE_Result save_text(const char *text, const char *id) {
  return save_data_to_persistent_object(text, text_len(text), id, text_len(id), true);
}

bool can_be_stored(const char *text) {
  if (text == nullptr) return true;
  if (!json_is_utf8(text)) return false;
  for (; *text != 0; ++text) {
    const auto c = static_cast<unsigned char>(*text);
    if (c < 0x20 && strchr("\b\t\n\f\r", c) == nullptr) return false;
  }
  return true;
}

// ---- SD list

TEE_Result get_sd_list_json_array(JSON_Array **array, JSON_Object **object, JSON_Value **value) {
  *array = nullptr;
  *object = nullptr;
  *value = nullptr;

  secret_bytes data;
  TRY(load_or_create(SD_LIST_ID, text_part(kDefaultSdList), nullptr, &data));
  json_ptr document(json_parse_string(reinterpret_cast<const char *>(data.data)));
  CHECK(document, OTRP_SD_LIST_BROKEN, "json_parse_string null pointer, %p",
        static_cast<void *>(document.get()));
  JSON_Object *members = json_value_get_object(document.get());
  JSON_Array *names = json_object_get_array(members, "sd_list");
  CHECK(names != nullptr, OTRP_SD_LIST_BROKEN, "json_parse_string parse error");
  *array = names;
  *object = members;
  *value = document.release();
  return TEE_SUCCESS;
}

TEE_Result check_sd_item_exist_in_sd_list(const JSON_Array *array, const char *sdname,
                                          uint32_t *found) {
  CHECK(array != nullptr && sdname != nullptr, OTRP_MISSING,
        "get_sd_item_from_sd_list_by_sd_name input is null");
  const size_t num_names = json_array_get_count(array);
  for (size_t i = 0; i < num_names; ++i) {
    const char *name = json_array_get_string(array, i);
    if (name != nullptr && strcmp(name, sdname) == 0) *found = 1;
  }
  return TEE_SUCCESS;
}

TEE_Result add_sd_item_to_sd_list(const char *sdname, JSON_Array *array) {
  CHECK(json_array_append_string(array, sdname) == JSONSuccess, OTRP_NO_MEMORY,
        "json_array_append_string fail");
  return TEE_SUCCESS;
}

TEE_Result delete_sd_from_list(JSON_Object *sd_list, const char *sdname) {
  JSON_Array *names = json_object_get_array(sd_list, "sd_list");
  CHECK(names != nullptr, OTRP_RESPONSE_FAILED, "json_object_get_array error");
  const size_t num_names = json_array_get_count(names);
  for (size_t i = 0; sdname != nullptr && i < num_names; ++i) {
    const char *name = json_array_get_string(names, i);
    CHECK(name != nullptr, OTRP_RESPONSE_FAILED, "json_array_get_string idx %u error",
          static_cast<unsigned>(i));
    if (strcmp(name, sdname) == 0) return static_cast<TEE_Result>(json_array_remove(names, i));
  }
  FAIL(OTRP_RESPONSE_FAILED, "sd with %s not found", sdname != nullptr ? sdname : "(null)");
}

TEE_Result save_sd_list(const JSON_Value *sd_list) {
  const json_text text(json_serialize_to_string(sd_list));
  CHECK(text, OTRP_RESPONSE_FAILED, "json_serialize_to_string sdl error");
  return save_text(text.get(), SD_LIST_ID);
}

// ---- Records made from a template

// Fills a copy of `record`; see init_sd_info() for the results.
template <size_t kNumMembers>
static TEE_Result fill_template(const char *record, const text_member (&members)[kNumMembers],
                                JSON_Object **object, JSON_Value **value,
                                const char *as = __builtin_FUNCTION()) {
  *object = nullptr;
  *value = nullptr;
  json_ptr document(json_parse_string(record));
  JSON_Object *into = json_value_get_object(document.get());
  if (into == nullptr) {
    trace_error(as, __LINE__, "json_parse_string error");
    return TEE_SUCCESS;
  }
  for (const text_member &member : members) {
    const JSON_Status set = json_object_set_string(into, member.key, member.value);
    if (set != JSONSuccess) return static_cast<TEE_Result>(set);
  }
  *object = into;
  *value = document.release();
  return TEE_SUCCESS;
}

TEE_Result init_sd_info(const char *spid, const char *tsmid, const char *sdname,
                        JSON_Object **object, JSON_Value **value) {
  const text_member members[] = {{"spid", spid}, {"tsmid", tsmid}, {"name", sdname}};
  return fill_template(kSdInfoTemplate, members, object, value);
}

TEE_Result init_sp_info(const char *spid, const char *spcert, const char *aik, JSON_Object **object,
                        JSON_Value **value) {
  const text_member members[] = {{"spid", spid}, {"spcert", spcert}, {"aik", aik}};
  return fill_template(kSpInfoTemplate, members, object, value);
}

// ---- SD records

TEE_Result save_sd_info(const char *spid, const char *tsmid, const char *sdname) {
  json_ptr record;
  JSON_Object *object = nullptr;
  const TEE_Result result = init_sd_info(spid, tsmid, sdname, &object, out(record));
  CHECK(result == TEE_SUCCESS && record, result != TEE_SUCCESS ? result : OTRP_NO_MEMORY,
        "create sd item fail when init sd_info json error code: 0x%x", result);
  const json_text text(json_serialize_to_string(record.get()));
  CHECK(text, OTRP_NO_MEMORY, "json_serialize_to_string() failed. sd_info_value: %p\n",
        static_cast<void *>(record.get()));
  tee_ptr<char> id;
  concat_pobj_name(SD_INFO_PREFIX, sdname, out(id));
  CHECK(id, OTRP_NO_MEMORY, "bad strcat() sdname: %p\n", static_cast<const void *>(sdname));
  const TEE_Result saved = save_text(text.get(), id.get());
  CHECK(saved == TEE_SUCCESS, saved, "save sd_info fail");
  return TEE_SUCCESS;
}

TEE_Result save_sd_info_with_json_value(const char *sdname, const JSON_Value *value) {
  tee_ptr<char> id;
  concat_pobj_name(SD_INFO_PREFIX, sdname, out(id));
  if (!id) return OTRP_NO_MEMORY;
  const json_text text(value != nullptr ? json_serialize_to_string(value) : nullptr);
  if (!text) return OTRP_NO_MEMORY;
  const TEE_Result saved = save_text(text.get(), id.get());
  CHECK(saved == TEE_SUCCESS, saved, "save sd_info fail");
  return TEE_SUCCESS;
}

TEE_Result check_ta_exist_in_ta_list(const char *taid, const JSON_Value *sd_info, uint32_t *found) {
  CHECK(taid != nullptr && sd_info != nullptr && found != nullptr, OTRP_MISSING,
        "check_ta_exist_in_ta_list input is null");
  *found = 0;
  const JSON_Array *talist = json_object_get_array(json_value_get_object(sd_info), "talist");
  CHECK(talist != nullptr, OTRP_NO_MEMORY, "check_ta_exist_in_ta_list fail when get talist");
  const size_t num_tas = json_array_get_count(talist);
  for (size_t i = 0; i < num_tas && *found == 0; ++i) {
    const char *listed = json_object_get_string(json_array_get_object(talist, i), "taid");
    if (listed != nullptr && strcmp(listed, taid) == 0) *found = 1;
  }
  return TEE_SUCCESS;
}

// ---- SP records

TEE_Result save_sp_info(const char *spid, const char *spcert, const char *aik) {
  json_ptr record;
  JSON_Object *object = nullptr;
  TRY_LOG(init_sp_info(spid, spcert, aik, &object, out(record)), "init_sp_info error 0x%x");
  const json_text text(record ? json_serialize_to_string(record.get()) : nullptr);
  CHECK(text && text.get()[0] != 0, OTRP_NO_MEMORY, "sp_info_str is null, TEE_ERROR_OUT_OF_MEMORY");
  tee_ptr<char> id;
  concat_pobj_name(SP_INFO_PREFIX, spid, out(id));
  CHECK(id && id.get()[0] != 0, OTRP_NO_MEMORY,
        "create sp_info_name is null, TEE_ERROR_OUT_OF_MEMORY");
  TRY_LOG(save_text(text.get(), id.get()), "save_data_to_persistent_object error 0x%x");
  return TEE_SUCCESS;
}

// `no_memory` and `failed`, behind which the code comes, are the texts of the operation named `as`.
static TEE_Result delete_record(const char *prefix, const char *name, const char *no_memory,
                                const char *failed, const char *as = __builtin_FUNCTION()) {
  tee_ptr<char> id;
  concat_pobj_name(prefix, name, out(id));
  CHECK_AS(as, id, OTRP_NO_MEMORY, "%s", no_memory);
  const TEE_Result deleted = delete_persistent_object(id.get(), text_len(id.get()));
  CHECK_AS(as, deleted == TEE_SUCCESS, deleted, "%s 0x%x", failed, deleted);
  return TEE_SUCCESS;
}

TEE_Result delete_sp_info(const char *spid) {
  return delete_record(SP_INFO_PREFIX, spid, "no memory for sp_info_name",
                       "delete_persistent_object error code:");
}

// ---- TA records

TEE_Result delete_ta_persistent_object(const char *taid) {
  return delete_record(TA_INFO_PREFIX, taid, "delete_ta_persistent_object out of mem",
                       "delete_persistent_object error code");
}

static TEE_Result delete_existing_ta_info(const char *id, const char *as = __builtin_FUNCTION()) {
  const TEE_Result deleted = delete_persistent_object(id, text_len(id));
  CHECK_AS(as, deleted == TEE_SUCCESS || deleted == TEE_ERROR_ITEM_NOT_FOUND, deleted,
           "delete existing ta info fail");
  return TEE_SUCCESS;
}

TEE_Result save_ta_info_to_persistent_object(const char *spid, const char *sdname, const char *taid,
                                             const char *ta_version, bool replace) {
  const json_ptr record(json_value_init_object());
  CHECK(record, OTRP_NO_MEMORY, "init ta_info_value fail get NULL");
  JSON_Object *object = json_value_get_object(record.get());
  CHECK(object != nullptr, OTRP_MISSING, "get object from json value fail");
  const text_member members[] = {
      {"spid", spid}, {"sdid", sdname}, {"taid", taid}, {"ta_version", ta_version}};
  bool complete = true;
  for (const text_member &member : members) {
    complete = complete && json_object_set_string(object, member.key, member.value) == JSONSuccess;
  }
  const json_text text(complete ? json_serialize_to_string(record.get()) : nullptr);
  CHECK(text, OTRP_NO_MEMORY, "serialize to string fail get NULL");

  tee_ptr<char> id;
  concat_pobj_name(TA_INFO_PREFIX, taid, out(id));
  if (!id) return OTRP_NO_MEMORY;
  if (replace) TRY(delete_existing_ta_info(id.get()));
  return save_text(text.get(), id.get());
}
