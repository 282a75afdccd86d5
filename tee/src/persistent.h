// SPDX-License-Identifier: BSD-2-Clause
/// Open data streams of persistent objects.
///
/// An object is read whole when its first handle opens; its handles share that copy. What is
/// written, a creation included, is in memory until the handle closes, and reaches storage in one
/// change then: after a crash the object is as it was before or after. Handles that share an
/// object for writing are saved together, when the last of them that wrote closes. A handle that
/// its instance never closed saves nothing.
///
/// TEE_CloseObject() cannot report a failure, so a full disk is looked for when data is written;
/// should saving fail all the same, the trusted application panics rather than go on believing.
#ifndef TEE_PERSISTENT_H
#define TEE_PERSISTENT_H

#include <map>
#include <memory>
#include <vector>

#include "storage.h"

namespace tee {

class HostDevice;
struct OpenObject;

/// The objects of a device that have an open handle.
using OpenObjects = std::map<ObjectKey, std::weak_ptr<OpenObject>>;

struct OpenObject {
  OpenObject(OpenObjects &among, const ObjectKey &object_key) : table(among), key(object_key) {}
  ~OpenObject() { table.erase(key); }
  OpenObject(const OpenObject &) = delete;
  OpenObject &operator=(const OpenObject &) = delete;

  OpenObjects &table;
  const ObjectKey key;
  Bytes data;
  bool stored = false;            // storage has an object of this name
  uint32_t num_unsaved = 0;       // handles that wrote
  std::vector<uint32_t> handles;  // TEE_DATA_FLAG_* of each
};

/// What one handle knows of its object.
struct OpenData {
  OpenData(HostDevice &of_device, std::shared_ptr<OpenObject> opened, uint32_t handle_flags);
  ~OpenData();
  OpenData(const OpenData &) = delete;
  OpenData &operator=(const OpenData &) = delete;

  uint32_t data_size() const { return static_cast<uint32_t>(object->data.size()); }
  uint32_t position() const { return at; }

  void mark_unsaved();
  void save();

  HostDevice &device;
  std::shared_ptr<OpenObject> object;
  const uint32_t flags;
  uint32_t at = 0;
  bool unsaved = false;
};

}  // namespace tee

#endif
