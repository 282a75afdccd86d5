// SPDX-License-Identifier: BSD-2-Clause
#include "storage.h"

namespace tee {

std::optional<Bytes> MemoryStorage::load(const ObjectKey &key) {
  const auto object = objects_.find(key);
  if (object == objects_.end()) return std::nullopt;
  return object->second;
}

void MemoryStorage::save(const ObjectKey &key, ByteView data) {
  objects_[key] = Bytes(data.begin(), data.end());
}

bool MemoryStorage::remove(const ObjectKey &key) {
  return objects_.erase(key) != 0;
}

std::vector<ObjectListing> MemoryStorage::list(const UuidBytes &ta) {
  std::vector<ObjectListing> listing;
  for (auto object = objects_.lower_bound({ta, {}});
       object != objects_.end() && object->first.ta == ta; ++object) {
    listing.push_back({object->first.id, object->second.size()});
  }
  return listing;
}

}  // namespace tee
