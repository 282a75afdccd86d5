// SPDX-License-Identifier: BSD-2-Clause
#include "persistent.h"

#include <algorithm>
#include <cstring>

#include "error.h"
#include "host_device.h"
#include "object.h"
#include "ta_instance.h"

namespace tee {

namespace {

constexpr uint32_t kAccessFlags =
    TEE_DATA_FLAG_ACCESS_READ | TEE_DATA_FLAG_ACCESS_WRITE | TEE_DATA_FLAG_ACCESS_WRITE_META;
constexpr uint32_t kShareFlags = TEE_DATA_FLAG_SHARE_READ | TEE_DATA_FLAG_SHARE_WRITE;

// What every storage can hold as one value.
constexpr size_t kMaxObjectLen = 0x20000000;

}  // namespace

OpenData::OpenData(HostDevice &of_device, std::shared_ptr<OpenObject> opened, uint32_t handle_flags)
    : device(of_device), object(std::move(opened)), flags(handle_flags) {
  device.open_data.push_back(this);
}

OpenData::~OpenData() {
  std::erase(device.open_data, this);
}

void OpenData::store(Bytes data) {
  device.storage->save(object->key, data);
  object->data = std::move(data);
  object->creation_waits = false;
}

namespace {

void check_id(const void *id, uint32_t id_len, const char *call) {
  if (id_len > TEE_OBJECT_ID_MAX_LEN) panic(call, "object ID longer than 64 bytes");
  if (id == nullptr && id_len != 0) panic(call, "object ID is NULL");
  current_instance();
  if (Running::now()->shares(id, id_len)) panic(call, "object ID is in shared memory");
}

ObjectKey key_of(const void *id, uint32_t id_len) {
  return {current_instance().uuid, std::string(static_cast<const char *>(id), id_len)};
}

void check_flags(uint32_t flags, uint32_t allowed, const char *call) {
  if ((flags & ~allowed) != 0) panic(call, "flags that this call does not have");
}

OpenData &checked_data(TEE_ObjectHandle handle, uint32_t right, const char *call) {
  __TEE_ObjectHandle &object = checked_object(handle, call);
  if (!object.persistent) panic(call, "object is not persistent");
  if ((object.persistent->flags & right) == 0) panic(call, "handle lacks the access right");
  return *object.persistent;
}

std::shared_ptr<OpenObject> find_open(const HostDevice &device, const ObjectKey &key) {
  const auto known = std::ranges::find_if(
      device.open_data, [&](const OpenData *data) { return data->object->key == key; });
  return known != device.open_data.end() ? (*known)->object : nullptr;
}

// Among several handles, a right that one of them has must be shared by all (section 5.7).
bool may_join(const HostDevice &device, const OpenObject &object, uint32_t flags) {
  uint32_t used = flags;
  uint32_t shared = flags;
  for (const OpenData *other : device.open_data) {
    if (other->object.get() != &object) continue;
    used |= other->flags;
    shared &= other->flags;
  }
  const bool reads = (used & TEE_DATA_FLAG_ACCESS_READ) != 0;
  const bool writes = (used & TEE_DATA_FLAG_ACCESS_WRITE) != 0;
  return (used & TEE_DATA_FLAG_ACCESS_WRITE_META) == 0 &&
         (!reads || (shared & TEE_DATA_FLAG_SHARE_READ) != 0) &&
         (!writes || (shared & TEE_DATA_FLAG_SHARE_WRITE) != 0);
}

std::unique_ptr<__TEE_ObjectHandle> new_handle(HostDevice &device,
                                               std::shared_ptr<OpenObject> object, uint32_t flags) {
  auto handle = std::make_unique<__TEE_ObjectHandle>();
  handle->handle_flags = flags | TEE_HANDLE_FLAG_PERSISTENT | TEE_HANDLE_FLAG_INITIALIZED;
  handle->persistent.emplace(device, std::move(object), flags);
  return handle;
}

TEE_Result open_object(const ObjectKey &key, uint32_t flags, TEE_ObjectHandle *handle) {
  HostDevice &device = current_instance().device;
  std::shared_ptr<OpenObject> object = find_open(device, key);
  if (object == nullptr) {
    std::optional<Bytes> data = device.storage->load(key);
    if (!data) return TEE_ERROR_ITEM_NOT_FOUND;
    object = std::make_shared<OpenObject>(OpenObject{key, std::move(*data)});
  } else if (!may_join(device, *object, flags)) {
    return TEE_ERROR_ACCESS_CONFLICT;
  }
  *handle = open_handle(new_handle(device, std::move(object), flags));
  return TEE_SUCCESS;
}

TEE_Result create_object(const ObjectKey &key, uint32_t flags, ByteView data,
                         TEE_ObjectHandle *handle) {
  HostDevice &device = current_instance().device;
  if (find_open(device, key)) return TEE_ERROR_ACCESS_CONFLICT;
  if ((flags & TEE_DATA_FLAG_OVERWRITE) == 0 && device.storage->load(key)) {
    return TEE_ERROR_ACCESS_CONFLICT;
  }
  if (data.size() > kMaxObjectLen) return TEE_ERROR_STORAGE_NO_SPACE;

  auto object = std::make_shared<OpenObject>(OpenObject{key, {}, true});
  auto created = new_handle(device, std::move(object), flags & (kAccessFlags | kShareFlags));
  if (!data.empty() || device.creates_at_once) {
    created->persistent->store({data.begin(), data.end()});
  }
  *handle = open_handle(std::move(created));
  return TEE_SUCCESS;
}

TEE_Result write_data(OpenData &data, ByteView bytes) {
  if (bytes.empty() && !data.object->creation_waits) return TEE_SUCCESS;
  if (data.at + bytes.size() > kMaxObjectLen) return TEE_ERROR_STORAGE_NO_SPACE;
  Bytes stream = data.object->data;
  stream.resize(std::max(stream.size(), data.at + bytes.size()));
  std::ranges::copy(bytes, stream.begin() + data.at);
  data.store(std::move(stream));
  data.at += static_cast<uint32_t>(bytes.size());
  return TEE_SUCCESS;
}

void store_waiting_creation(OpenData &data) {
  if (data.object->creation_waits) data.store(data.object->data);
}

TEE_Result delete_object(OpenData &data) {
  data.device.storage->remove(data.object->key);
  data.object->creation_waits = false;
  return TEE_SUCCESS;
}

// `call` works on storage. What goes wrong there without a code of its own in the standard is the
// storage's failing.
template <class Call>
TEE_Result storage_result_of(Call &&call) {
  switch (const TEE_Result result = result_of(call)) {
    case TEE_ERROR_BUSY:
    case TEE_ERROR_ACCESS_DENIED:
    case TEE_ERROR_GENERIC:
      return TEE_ERROR_STORAGE_NOT_AVAILABLE;
    default:
      return result;
  }
}

bool storage_fault_due(const char *call, TEE_Result *code) {
  return fault_due(Fault::kStorage, call, TEE_ERROR_STORAGE_NOT_AVAILABLE, code);
}

}  // namespace

}  // namespace tee

using namespace tee;

TEE_Result TEE_OpenPersistentObject(uint32_t storageID, const void *objectID,
                                    TEE_LengthType objectIDLen, uint32_t flags,
                                    TEE_ObjectHandle *object) {
  *object = TEE_HANDLE_NULL;
  check_id(objectID, objectIDLen, __func__);
  check_flags(flags, kAccessFlags | kShareFlags, __func__);
  if (TEE_Result code; storage_fault_due(__func__, &code)) return code;
  if (storageID != TEE_STORAGE_PRIVATE) return TEE_ERROR_ITEM_NOT_FOUND;
  return storage_result_of(
      [&] { return open_object(key_of(objectID, objectIDLen), flags, object); });
}

// Objects with attributes are not kept here: no trusted application of ours stores keys that way.
TEE_Result TEE_CreatePersistentObject(uint32_t storageID, const void *objectID,
                                      TEE_LengthType objectIDLen, uint32_t flags,
                                      TEE_ObjectHandle attributes, const void *initialData,
                                      TEE_LengthType initialDataLen, TEE_ObjectHandle *object) {
  *object = TEE_HANDLE_NULL;
  check_id(objectID, objectIDLen, __func__);
  check_flags(flags, kAccessFlags | kShareFlags | TEE_DATA_FLAG_OVERWRITE, __func__);
  if (initialData == nullptr && initialDataLen != 0) panic(__func__, "initial data is NULL");
  if (attributes != TEE_HANDLE_NULL) checked_object(attributes, __func__);
  if (TEE_Result code; storage_fault_due(__func__, &code)) return code;
  if (storageID != TEE_STORAGE_PRIVATE) return TEE_ERROR_ITEM_NOT_FOUND;
  if (attributes != TEE_HANDLE_NULL) return TEE_ERROR_NOT_SUPPORTED;
  const ByteView data(static_cast<const uint8_t *>(initialData), initialDataLen);
  return storage_result_of(
      [&] { return create_object(key_of(objectID, objectIDLen), flags, data, object); });
}

void TEE_CloseObject(TEE_ObjectHandle object) {
  if (object == TEE_HANDLE_NULL) return;
  if (checked_object(object, __func__).persistent) {
    result_of([&] {
      store_waiting_creation(*object->persistent);
      return TEE_SUCCESS;
    });
  }
  close_handle(object);
}

// The handle is closed whatever the result.
TEE_Result TEE_CloseAndDeletePersistentObject1(TEE_ObjectHandle object) {
  if (object == TEE_HANDLE_NULL) return TEE_SUCCESS;
  OpenData &data = checked_data(object, TEE_DATA_FLAG_ACCESS_WRITE_META, __func__);
  TEE_Result result = TEE_SUCCESS;
  if (!storage_fault_due(__func__, &result)) {
    // The standard has one code for whatever goes wrong.
    if (result_of([&] { return delete_object(data); }) != TEE_SUCCESS) {
      result = TEE_ERROR_STORAGE_NOT_AVAILABLE;
    }
  }
  close_handle(object);
  return result;
}

TEE_Result TEE_ReadObjectData(TEE_ObjectHandle object, void *buffer, TEE_LengthType size,
                              TEE_LengthType *count) {
  OpenData &data = checked_data(object, TEE_DATA_FLAG_ACCESS_READ, __func__);
  if (buffer == nullptr && size != 0) panic(__func__, "buffer is NULL");
  *count = 0;
  if (TEE_Result code; storage_fault_due(__func__, &code)) return closed_if_corrupt(object, code);

  const Bytes &stream = data.object->data;
  const uint32_t left = data.at < stream.size() ? data.data_size() - data.at : 0;
  uint32_t len = std::min(size, left);
  if (TEE_Result ignored; fault_due(Fault::kShortRead, __func__, TEE_SUCCESS, &ignored)) len /= 2;
  if (len != 0) std::memcpy(buffer, stream.data() + data.at, len);
  data.at += len;
  *count = len;
  return TEE_SUCCESS;
}

TEE_Result TEE_WriteObjectData(TEE_ObjectHandle object, const void *buffer, TEE_LengthType size) {
  OpenData &data = checked_data(object, TEE_DATA_FLAG_ACCESS_WRITE, __func__);
  if (buffer == nullptr && size != 0) panic(__func__, "buffer is NULL");
  if (TEE_Result code; storage_fault_due(__func__, &code)) return closed_if_corrupt(object, code);
  const ByteView bytes(static_cast<const uint8_t *>(buffer), size);
  const TEE_Result result = storage_result_of([&] { return write_data(data, bytes); });
  // The standard has no other code for a stream that cannot grow.
  if (result == TEE_ERROR_OUT_OF_MEMORY) return TEE_ERROR_STORAGE_NO_SPACE;
  return closed_if_corrupt(object, result);
}
