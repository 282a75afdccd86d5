// SPDX-License-Identifier: BSD-2-Clause
/// Open data streams of persistent objects.
///
/// An object is read whole when its first handle opens; its handles share that copy. Each write is
/// stored before its call returns, or fails and leaves the object as it was, here and in storage.
///
/// A creation without data waits for what its trusted application does next, so that creating and
/// filling an object costs one durable change: the first write stores it, or else the first handle
/// that closes. TEE_CloseObject() cannot report a failure; a creation that cannot be stored then is
/// lost, as in a power cut before it, and who opens the object next is told what there is. Who
/// must know writes, were it no bytes. A creation that is still waiting when its instance ends is
/// dropped.
#ifndef TEE_PERSISTENT_H
#define TEE_PERSISTENT_H

#include <memory>
#include <vector>

#include "storage.h"

namespace tee {

class HostDevice;

/// An object that has an open handle.
struct OpenObject {
  const ObjectKey key;
  Bytes data;
  bool creation_waits = false;  // storage has no such object yet, or the one that it replaces
};

/// What one handle knows of its object. The device has a list of them.
struct OpenData {
  OpenData(HostDevice &of_device, std::shared_ptr<OpenObject> opened, uint32_t handle_flags);
  ~OpenData();
  OpenData(const OpenData &) = delete;
  OpenData &operator=(const OpenData &) = delete;

  uint32_t data_size() const { return static_cast<uint32_t>(object->data.size()); }
  uint32_t position() const { return at; }

  /// Makes `data` the object's, durably.
  void store(Bytes data);

  HostDevice &device;
  std::shared_ptr<OpenObject> object;
  const uint32_t flags;  // TEE_DATA_FLAG_*
  uint32_t at = 0;
};

}  // namespace tee

#endif
