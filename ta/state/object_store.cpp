// SPDX-License-Identifier: BSD-2-Clause
#include "state/object_store.h"

#include "cursor.h"
#include "failure.h"
#include "otrp_result.h"
#include "ownership.h"
#include "platform.h"
#include "record_names.h"

namespace {
constexpr uint32_t kLengthLen = 4;
}

static TEE_Result open_or_create(const char *id, uint32_t id_len, bool overwrite,
                                 stored_object *object, const char *as = __builtin_FUNCTION()) {
  TEE_Result result = TEE_OpenPersistentObject(TEE_STORAGE_PRIVATE, id, id_len,
                                               TEE_DATA_FLAG_ACCESS_WRITE, out(*object));
  if (result == TEE_ERROR_ITEM_NOT_FOUND) {
    trace_error(as, __LINE__, "Item not exist. Try to create one");
    // Platforms refuse the overwrite flag in an open call, where it means nothing.
    const uint32_t flags = TEE_DATA_FLAG_ACCESS_WRITE | (overwrite ? TEE_DATA_FLAG_OVERWRITE : 0);
    result = TEE_CreatePersistentObject(TEE_STORAGE_PRIVATE, id, id_len, flags, TEE_HANDLE_NULL,
                                        nullptr, 0, out(*object));
  }
  CHECK_AS(as, result == TEE_SUCCESS, result,
           "Failed to create persistent object: 0x%x overwrite: %d", result, overwrite ? 1 : 0);
  return TEE_SUCCESS;
}

// The data stream of a record: length and payload.
static TEE_Result join_stream(const void *data, uint32_t len, secret_bytes *stream,
                              const char *as = __builtin_FUNCTION()) {
  if (len <= UINT32_MAX - kLengthLen) stream->data = allocate_bytes(kLengthLen + len);
  if (stream->data != nullptr) stream->len = kLengthLen + len;
  writer out = {stream->data, stream->len};
  put_block(&out, {data, len});
  CHECK_AS(as, out.ok, TEE_ERROR_OUT_OF_MEMORY, "No memory for buffer (size %u)", len);
  return TEE_SUCCESS;
}

TEE_Result save_data_to_persistent_object(const void *data, uint32_t len, const char *id,
                                          uint32_t id_len, bool overwrite) {
  CHECK(id_len <= TEE_OBJECT_ID_MAX_LEN, TEE_ERROR_BAD_PARAMETERS, "pobj_id length too large\n");

  // Before the object is touched: for want of memory nothing is created.
  secret_bytes stream;
  TRY(join_stream(data, len, &stream));
  stored_object object;
  TRY(open_or_create(id, id_len, overwrite, &object));
  // Many platforms make each write durable by itself. A new length before an old payload, left by
  // a power cut between two writes, would be a record that no start gets past.
  TRY_LOG(let_go_if_corrupt(&object, TEE_WriteObjectData(object.get(), stream.data, stream.len)),
          "Failed to write data: 0x%x");
  return TEE_SUCCESS;
}

TEE_Result allocate_and_load_data_from_persistent_object(const char *id, uint32_t id_len,
                                                         uint8_t **data, uint32_t *len) {
  if (data != nullptr) *data = nullptr;
  if (len != nullptr) *len = 0;
  CHECK(id_len != 0 && id_len <= TEE_OBJECT_ID_MAX_LEN && data != nullptr && len != nullptr,
        TEE_ERROR_BAD_PARAMETERS,
        "pobj_id length too large, or pobj_id_size is zero, or NULL parameter pobj_id_length %u "
        "data_buf %p length %p\n",
        id_len, static_cast<void *>(data), static_cast<void *>(len));
  stored_object object;
  TEE_Result result =
      TEE_OpenPersistentObject(TEE_STORAGE_PRIVATE, id, id_len,
                               TEE_DATA_FLAG_ACCESS_READ | TEE_DATA_FLAG_SHARE_READ, out(object));
  CHECK(result == TEE_SUCCESS, result, "pobj with id: %.*s doestn't exist, error code 0x%x\n",
        static_cast<int>(id_len), id, result);

  uint8_t prefix[kLengthLen];
  tee_length count = 0;
  TRY_LOG(let_go_if_corrupt(&object, TEE_ReadObjectData(object.get(), prefix, kLengthLen, &count)),
          "Failed to read data size, error code 0x%x\n");
  uint32_t stored_len = 0;
  reader in = {prefix, static_cast<uint32_t>(count)};
  if (!take_u32(&in, &stored_len)) {
    *len = static_cast<uint32_t>(count);
    trace_error(__func__, __LINE__, "Unexpected data size\n");
    return TEE_SUCCESS;
  }

  secret_bytes buffer;
  if (stored_len < UINT32_MAX) buffer.data = allocate_bytes(stored_len + 1);
  CHECK(buffer.data != nullptr, TEE_ERROR_OUT_OF_MEMORY, "No memory for buffer (size %u)",
        stored_len);
  buffer.len = stored_len;
  TRY_LOG(
      let_go_if_corrupt(&object, TEE_ReadObjectData(object.get(), buffer.data, stored_len, &count)),
      "Failed to read data, error code 0x%x\n");
  *data = buffer.release();
  *len = static_cast<uint32_t>(count);
  return TEE_SUCCESS;
}

TEE_Result load_payload(const char *id, secret_bytes *payload) {
  return allocate_and_load_data_from_persistent_object(id, static_cast<uint32_t>(strlen(id)),
                                                       &payload->data, &payload->len);
}

// `payload->data` stays NULL when the record is missing or empty.
static TEE_Result load_if_there(const char *id, secret_bytes *payload, const char *as) {
  const TEE_Result result = load_payload(id, payload);
  if (result == TEE_SUCCESS && payload->data != nullptr && payload->len != 0) return TEE_SUCCESS;
  trace_error(as, __LINE__, "read persistent object error, error code: %x", result);
  const bool cut_short = payload->data == nullptr && payload->len != 0;
  payload->reset();
  if (result == TEE_SUCCESS && cut_short) return TEE_ERROR_BAD_FORMAT;
  return result == TEE_ERROR_ITEM_NOT_FOUND ? TEE_SUCCESS : result;
}

TEE_Result load_or_create(const char *id, const data_part &initial, const char *not_created,
                          secret_bytes *payload, const char *as) {
  TRY(load_if_there(id, payload, as));
  if (payload->data != nullptr) return TEE_SUCCESS;
  trace_error(as, __LINE__, "no persistent object named %s, creating it", id);
  const TEE_Result saved = save_data_to_persistent_object(initial.data, initial.len, id,
                                                          static_cast<uint32_t>(strlen(id)), true);
  CHECK_AS(as, saved == TEE_SUCCESS || not_created == nullptr, saved, "%s", not_created);
  TRY(saved);
  TRY(load_if_there(id, payload, as));
  return payload->data != nullptr ? TEE_SUCCESS : TEE_ERROR_ITEM_NOT_FOUND;
}

TEE_Result delete_persistent_object(const char *id, uint32_t id_len) {
  // An open call with such an ID would make the platform panic.
  CHECK(id_len <= TEE_OBJECT_ID_MAX_LEN, TEE_ERROR_BAD_PARAMETERS,
        "TEE_OpenPersistentObject fails %x", TEE_ERROR_BAD_PARAMETERS);
  stored_object object;
  TRY_LOG(TEE_OpenPersistentObject(TEE_STORAGE_PRIVATE, id, id_len, TEE_DATA_FLAG_ACCESS_WRITE_META,
                                   out(object)),
          "TEE_OpenPersistentObject fails %x");
  // The handle is gone afterwards, whatever the result.
  TRY_LOG(TEE_CloseAndDeletePersistentObject1(object.release()),
          "Delete the persistent object fail %x");
  return TEE_SUCCESS;
}

// ---- Records

void concat_pobj_name(const char *prefix, const char *name, char **id) {
  *id = nullptr;
  if (prefix == nullptr || name == nullptr) return;
  const size_t prefix_len = strlen(prefix);
  const size_t name_len = strlen(name);
  if (prefix_len + name_len >= UINT32_MAX) return;
  auto *text =
      reinterpret_cast<char *>(allocate_bytes(static_cast<uint32_t>(prefix_len + name_len + 1)));
  if (text == nullptr) return;
  memcpy(text, prefix, prefix_len);
  memcpy(text + prefix_len, name, name_len + 1);
  *id = text;
}

static TEE_Result read_json(const char *prefix, const char *name, JSON_Value **value,
                            const char *as = __builtin_FUNCTION()) {
  *value = nullptr;
  if (name == nullptr) return TEE_ERROR_ITEM_NOT_FOUND;
  tee_ptr<char> id;
  concat_pobj_name(prefix, name, out(id));
  CHECK_AS(as, id, OTRP_NO_MEMORY, "No memory for sd_pobj_name");
  secret_bytes data;
  TRY(load_payload(id.get(), &data));
  if (data.len == 0) return TEE_ERROR_ITEM_NOT_FOUND;
  if (data.data != nullptr) *value = json_parse_string(reinterpret_cast<char *>(data.data));
  return *value != nullptr ? TEE_SUCCESS : OTRP_NO_MEMORY;
}

TEE_Result read_json_by_name(const char *prefix, const char *name, JSON_Value **value) {
  const TEE_Result result = read_json(prefix, name, value, "get_json_by_name");
  // No object has an ID that is too long for one.
  return result == TEE_ERROR_BAD_PARAMETERS ? TEE_ERROR_ITEM_NOT_FOUND : result;
}

JSON_Value *get_json_by_name(const char *prefix, const char *name) {
  JSON_Value *value = nullptr;
  (void)read_json_by_name(prefix, name, &value);
  return value;
}

static TEE_Result read_record(const char *prefix, const char *name, TEE_Result missing,
                              JSON_Value **value) {
  *value = get_json_by_name(prefix, name);
  return *value != nullptr ? TEE_SUCCESS : missing;
}

TEE_Result get_ta_info_persistent_object_to_json_value(const char *taid, JSON_Value **value) {
  return read_record(TA_INFO_PREFIX, taid, OTRP_NOT_FOUND, value);
}

TEE_Result get_sd_info_persistent_object_to_json_value(const char *sdname, JSON_Value **value) {
  return read_record(SD_INFO_PREFIX, sdname, OTRP_NOT_FOUND, value);
}

TEE_Result get_sp_info_persistent_object_to_json_value(const char *spid, JSON_Value **value) {
  return read_record(SP_INFO_PREFIX, spid, OTRP_SP_NOT_FOUND, value);
}
