// SPDX-License-Identifier: BSD-2-Clause
#include <tee_inspect.h>

#include <cstdlib>
#include <cstring>

#include "client_context.h"

namespace tee {

namespace {

ObjectKey key_of(const TEEC_UUID *ta, const void *id, size_t id_len) {
  if (ta == nullptr || id_len > TEE_OBJECT_ID_MAX_LEN || (id == nullptr && id_len != 0)) {
    throw Error{TEE_ERROR_BAD_PARAMETERS, "an object ID has at most 64 bytes"};
  }
  return {uuid_bytes(from_client(*ta)), std::string(static_cast<const char *>(id), id_len)};
}

// `what` gets the device, locked.
template <class What>
TEE_Result inspect(TEEC_Context *context, What &&what) {
  return client_result_of([&]() -> TEE_Result {
    HostDevice &device = *device_of(context);
    const std::lock_guard guard(device.lock);
    return what(device);
  });
}

}  // namespace

}  // namespace tee

using namespace tee;

TEEC_Result tee_inspect_stats(TEEC_Context *context, const TEEC_UUID *uuid,
                              struct tee_heap_stats *stats) {
  return inspect(context, [&](HostDevice &device) {
    const Instance *instance = device.find_instance(key_of(uuid, nullptr, 0).ta);
    if (instance == nullptr) return TEE_ERROR_ITEM_NOT_FOUND;
    *stats = instance->stats();
    return TEE_SUCCESS;
  });
}

TEEC_Result tee_inspect_list(TEEC_Context *context, const TEEC_UUID *uuid,
                             bool (*visit)(void *closure, const void *id, size_t id_len,
                                           size_t data_len),
                             void *closure) {
  return inspect(context, [&](HostDevice &device) {
    for (const ObjectListing &object : device.storage->list(key_of(uuid, nullptr, 0).ta)) {
      if (!visit(closure, object.id.data(), object.id.size(), object.data_len)) break;
    }
    return TEE_SUCCESS;
  });
}

TEEC_Result tee_inspect_get(TEEC_Context *context, const TEEC_UUID *uuid, const void *id,
                            size_t id_len, uint8_t **data, size_t *data_len) {
  *data = nullptr;
  *data_len = 0;
  return inspect(context, [&](HostDevice &device) {
    const std::optional<Bytes> stored = device.storage->load(key_of(uuid, id, id_len));
    if (!stored) return TEE_ERROR_ITEM_NOT_FOUND;
    *data = static_cast<uint8_t *>(std::malloc(stored->size() + 1));
    if (*data == nullptr) throw std::bad_alloc();
    if (!stored->empty()) std::memcpy(*data, stored->data(), stored->size());
    *data_len = stored->size();
    return TEE_SUCCESS;
  });
}

TEEC_Result tee_inspect_put(TEEC_Context *context, const TEEC_UUID *uuid, const void *id,
                            size_t id_len, const void *data, size_t data_len) {
  return inspect(context, [&](HostDevice &device) {
    device.storage->save(key_of(uuid, id, id_len),
                         ByteView(static_cast<const uint8_t *>(data), data_len));
    return TEE_SUCCESS;
  });
}

TEEC_Result tee_inspect_remove(TEEC_Context *context, const TEEC_UUID *uuid, const void *id,
                               size_t id_len) {
  return inspect(context, [&](HostDevice &device) {
    return device.storage->remove(key_of(uuid, id, id_len)) ? TEE_SUCCESS
                                                            : TEE_ERROR_ITEM_NOT_FOUND;
  });
}

const char *tee_inspect_last_error(void) {
  return last_error();
}
