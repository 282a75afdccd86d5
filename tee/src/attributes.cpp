// SPDX-License-Identifier: BSD-2-Clause
#include "attributes.h"

#include <openssl/crypto.h>

#include <algorithm>
#include <stdexcept>

namespace tee {

void Attributes::clear() {
  OPENSSL_cleanse(bytes_.data(), bytes_.size());
  bytes_.clear();
  count_ = 0;
}

void Attributes::reset(size_t total_len) {
  clear();
  bytes_.reserve(total_len);
}

bool Attributes::add(uint32_t id, Value value) {
  if (contains(id)) return false;
  std::ranges::copy(value, new_value(id, value.size()));
  return true;
}

bool Attributes::add(uint32_t id, const BIGNUM &number) {
  if (contains(id)) return false;
  BN_bn2bin(&number, new_value(id, static_cast<size_t>(BN_num_bytes(&number))));
  return true;
}

// A block that grew would leave a copy of itself behind.
uint8_t *Attributes::new_value(uint32_t id, size_t len) {
  const size_t begin = bytes_.size();
  if (count_ == kMaxCount || len > bytes_.capacity() - begin) {
    throw std::logic_error("no room for an attribute");
  }
  bytes_.resize(begin + len);
  entries_[count_++] = {id, begin, begin + len};
  return bytes_.data() + begin;
}

std::optional<Attributes::Value> Attributes::find(uint32_t id) const {
  for (size_t i = 0; i < count_; ++i) {
    const Entry &entry = entries_[i];
    if (entry.id == id) return Value(bytes_).subspan(entry.begin, entry.end - entry.begin);
  }
  return std::nullopt;
}

}  // namespace tee
