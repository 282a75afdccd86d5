// SPDX-License-Identifier: BSD-2-Clause
/// Where persistent objects are kept: one interface, a database of a state directory behind it or,
/// in tests, memory.
///
/// Each change is durable as a whole when the call returns, or has not happened. Failures are
/// thrown as Error. Callers hold the device's lock.
#ifndef TEE_STORAGE_H
#define TEE_STORAGE_H

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "uuid.h"

namespace tee {

using Bytes = std::vector<uint8_t>;
using ByteView = std::span<const uint8_t>;

struct ObjectKey {
  UuidBytes ta;
  std::string id;
  auto operator<=>(const ObjectKey &) const = default;
};

struct ObjectListing {
  std::string id;
  size_t data_len;
};

class Storage {
 public:
  virtual ~Storage() = default;

  virtual std::optional<Bytes> load(const ObjectKey &key) = 0;

  /// Creates or replaces.
  virtual void save(const ObjectKey &key, ByteView data) = 0;

  /// False when there is no such object.
  virtual bool remove(const ObjectKey &key) = 0;

  /// In the byte order of the IDs.
  virtual std::vector<ObjectListing> list(const UuidBytes &ta) = 0;
};

class MemoryStorage : public Storage {
 public:
  std::optional<Bytes> load(const ObjectKey &key) override;
  void save(const ObjectKey &key, ByteView data) override;
  bool remove(const ObjectKey &key) override;
  std::vector<ObjectListing> list(const UuidBytes &ta) override;

 private:
  std::map<ObjectKey, Bytes> objects_;
};

}  // namespace tee

#endif
