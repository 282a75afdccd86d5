// SPDX-License-Identifier: BSD-2-Clause
#include "power_switch.h"

namespace tee {

std::optional<Bytes> PowerSwitch::load(const ObjectKey &key) {
  const auto lost = lost_.find(key);
  return lost != lost_.end() ? lost->second : medium_->load(key);
}

void PowerSwitch::save(const ObjectKey &key, ByteView data) {
  if (!reaches_medium("save", key)) {
    lost_[key] = Bytes(data.begin(), data.end());
    return;
  }
  medium_->save(key, data);
  ++durable_writes_;
}

bool PowerSwitch::remove(const ObjectKey &key) {
  if (!load(key)) return false;
  if (!reaches_medium("remove", key)) {
    lost_[key] = std::nullopt;
    return true;
  }
  const bool removed = medium_->remove(key);
  ++durable_writes_;
  return removed;
}

std::vector<ObjectListing> PowerSwitch::list(const UuidBytes &ta) {
  std::map<std::string, size_t> objects;
  for (const ObjectListing &object : medium_->list(ta)) objects[object.id] = object.data_len;
  for (const auto &[key, data] : lost_) {
    if (key.ta != ta) continue;
    if (data) {
      objects[key.id] = data->size();
    } else {
      objects.erase(key.id);
    }
  }
  std::vector<ObjectListing> listing;
  for (const auto &[id, data_len] : objects) listing.push_back({id, data_len});
  return listing;
}

void PowerSwitch::restore() {
  cut_ = false;
  lost_.clear();
}

bool PowerSwitch::reaches_medium(const char *change, const ObjectKey &key) {
  const std::string what = std::string(change) + " " + key.id;
  TEE_Result ignored;
  cut_ = cut_ || faults_.due(key.ta, test::Fault::kPowerCut, what.c_str(), TEE_SUCCESS, &ignored);
  return !cut_;
}

}  // namespace tee
