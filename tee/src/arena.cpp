// SPDX-License-Identifier: BSD-2-Clause
#include "arena.h"

#include <algorithm>
#include <cstring>
#include <new>
#include <utility>

namespace tee {

void *Arena::take(uint32_t len) {
  uint16_t &spare = first_spare(len);
  size_t unit = spare;
  if (spare != kNone) {
    spare = memory_->units[spare].next;
  } else {
    unit = cut(len);
    if (unit == kNone) return nullptr;
  }
  memory_->units[unit].len = static_cast<uint16_t>(len);
  return std::memset(&memory_->bytes[unit * kAlignment], 0, len);
}

// The first unit of a new block, or kNone. One of no bytes has an address of its own, too.
size_t Arena::cut(uint32_t len) {
  const size_t num_units = std::max((len + kAlignment - 1) / kAlignment, 1u);
  if (!memory_) memory_.reset(new (std::nothrow) Memory);
  if (!memory_ || num_units > kUnits - num_cut_) return kNone;
  const size_t first = num_cut_;
  num_cut_ += num_units;
  std::fill_n(&memory_->units[first], num_units, Unit{kNone, kNone});
  return first;
}

std::optional<uint32_t> Arena::length_of(const void *block) const {
  const uintptr_t offset = offset_of(block);
  const uint16_t len = memory_->units[offset / kAlignment].len;
  if (offset % kAlignment != 0 || len == kNone) return std::nullopt;
  return len;
}

void Arena::give_back(const void *block, uint32_t len) {
  const uintptr_t unit = offset_of(block) / kAlignment;
  memory_->units[unit] = {kNone, std::exchange(first_spare(len), static_cast<uint16_t>(unit))};
}

}  // namespace tee
