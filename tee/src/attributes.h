// SPDX-License-Identifier: BSD-2-Clause
/// The attribute values of a key object.
#ifndef TEE_ATTRIBUTES_H
#define TEE_ATTRIBUTES_H

#include <openssl/bn.h>

#include <array>
#include <cstdint>
#include <optional>
#include <span>
#include <vector>

namespace tee {

/// Values by attribute ID: unsigned big-endian numbers, or a secret. They lie one behind the other
/// in one block, which is overwritten before it is given back.
class Attributes {
 public:
  using Value = std::span<const uint8_t>;

  static constexpr size_t kMaxCount = 8;  // a key pair with its CRT part has as many

  /// Room for values of `total_len` bytes altogether.
  explicit Attributes(size_t total_len = 0) { bytes_.reserve(total_len); }
  ~Attributes() { clear(); }
  Attributes(const Attributes &) = delete;
  Attributes &operator=(const Attributes &) = delete;

  /// Drops the values there were, and makes room for others.
  void reset(size_t total_len);

  /// For one value more, of which there must be room. False when there is one of this ID.
  bool add(uint32_t id, Value value);
  /// The same for a number without leading zeros; its length is BN_num_bytes().
  bool add(uint32_t id, const BIGNUM &number);

  std::optional<Value> find(uint32_t id) const;
  /// The value must be there.
  Value at(uint32_t id) const { return find(id).value(); }
  bool contains(uint32_t id) const { return find(id).has_value(); }
  size_t total_len() const { return bytes_.size(); }

 private:
  struct Entry {
    uint32_t id;
    size_t begin, end;
  };

  void clear();
  uint8_t *new_value(uint32_t id, size_t len);

  std::vector<uint8_t> bytes_;
  std::array<Entry, kMaxCount> entries_;
  size_t count_ = 0;
};

}  // namespace tee

#endif
