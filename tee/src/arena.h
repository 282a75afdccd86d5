// SPDX-License-Identifier: BSD-2-Clause
/// The small blocks of a heap, cut from one piece of the host's memory.
#ifndef TEE_ARENA_H
#define TEE_ARENA_H

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>

namespace tee {

/// A block that was given back is handed out again for one of its size, the latest first. What is
/// known of blocks lies beside all of them: a pointer is judged without being read.
class Arena {
 public:
  static constexpr uint32_t kAlignment = 16;
  static constexpr uint32_t kMaxLen = 1024;

  Arena() { spares_.fill(kNone); }

  /// A zero-filled block of up to kMaxLen bytes; NULL when there is no room left.
  void *take(uint32_t len);

  /// Whether `block` points to where blocks were cut.
  bool holds(const void *block) const { return offset_of(block) < num_cut_ * kAlignment; }

  /// Of a pointer that it holds: the length of the live block that begins there, if one does.
  std::optional<uint32_t> length_of(const void *block) const;

  /// Takes a live block of `len` bytes back.
  void give_back(const void *block, uint32_t len);

 private:
  static constexpr size_t kUnits = 2048;
  static constexpr uint16_t kNone = UINT16_MAX;

  /// What is known of the bytes from one alignment to the next.
  struct Unit {
    uint16_t len;   // of the live block that begins here; kNone: none does
    uint16_t next;  // of the spare blocks of its size, where one of them begins
  };
  struct Memory {
    alignas(kAlignment) uint8_t bytes[kUnits * kAlignment];
    Unit units[kUnits];
  };

  /// Where in the bytes; what lies elsewhere is far behind them.
  uintptr_t offset_of(const void *block) const {
    return reinterpret_cast<uintptr_t>(block) - reinterpret_cast<uintptr_t>(memory_.get());
  }
  uint16_t &first_spare(uint32_t len) { return spares_[(len + kAlignment - 1) / kAlignment]; }
  size_t cut(uint32_t len);

  std::unique_ptr<Memory> memory_;  // from the first block on; not touched before it is cut
  size_t num_cut_ = 0;              // units
  std::array<uint16_t, kMaxLen / kAlignment + 1> spares_;  // by size in units: the first, or kNone
};

}  // namespace tee

#endif
