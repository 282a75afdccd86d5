// SPDX-License-Identifier: BSD-2-Clause
/// The object behind a TEE_ObjectHandle, transient or persistent.
#ifndef TEE_OBJECT_H
#define TEE_OBJECT_H

#include <tee_internal_api.h>

#include <cstdint>
#include <memory>
#include <optional>

#include "persistent.h"
#include "rsa_key.h"

struct __TEE_ObjectHandle {
  uint32_t type = TEE_TYPE_DATA;
  uint32_t max_size = 0;  // bits
  uint32_t size = 0;      // bits; 0 until populated or generated
  uint32_t usage = 0xFFFFFFFF;
  uint32_t handle_flags = 0;  // TEE_HANDLE_FLAG_*, and TEE_DATA_FLAG_* of a persistent object
  tee::Attributes attributes;
  tee::SharedKey rsa;                       // made of them once; NULL unless an RSA key is set
  std::optional<tee::OpenData> persistent;  // nothing for a transient object
};

namespace tee {

/// The object of a handle that the running instance has open; panics when it has not.
__TEE_ObjectHandle &checked_object(TEE_ObjectHandle handle, const char *call);

/// Gives the running instance a handle to `object`.
TEE_ObjectHandle open_handle(std::unique_ptr<__TEE_ObjectHandle> object);

/// Takes the handle back and destroys the object.
void close_handle(TEE_ObjectHandle handle);

/// `result`, of a call with an open handle. The standard closes the handle of a persistent object
/// that is corrupt.
TEE_Result closed_if_corrupt(TEE_ObjectHandle handle, TEE_Result result);

/// Whether keys of `type` may have `size` bits.
bool key_size_supported(uint32_t type, uint32_t size);

}  // namespace tee

#endif
