// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/server/key_shelf.h"

#include <stdexcept>

namespace tsm {
namespace {

constexpr size_t kNumKeys = 256;  // of some 5 KB each

RsaKey stored_key(const StoredDevice &row) {
  const std::optional<Bytes> encoded = base64url_decode(row.key);
  const std::optional<RsaKey> key = encoded ? RsaKey::from_encoded(*encoded) : std::nullopt;
  if (!key) throw std::runtime_error("the stored key of device " + row.device_id + " is damaged");
  return *key;
}

}  // namespace

DeviceInfo KeyShelf::device(const StoredDevice &row) {
  {
    const std::lock_guard guard(lock_);
    const auto found = keys_.find(row.key);
    if (found != keys_.end()) return {row.device_id, found->second};
  }
  const RsaKey key = stored_key(row);
  const std::lock_guard guard(lock_);
  const auto [at, is_new] = keys_.emplace(row.key, key);
  if (is_new) by_age_.push_back(at);
  if (by_age_.size() > kNumKeys) {
    keys_.erase(by_age_.front());
    by_age_.pop_front();
  }
  return {row.device_id, key};
}

}  // namespace tsm
