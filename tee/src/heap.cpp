// SPDX-License-Identifier: BSD-2-Clause
#include "heap.h"

#include <tee_internal_api.h>

#include <algorithm>
#include <cstdlib>
#include <new>

#include "ta_instance.h"

namespace tee {

namespace {
constexpr uint32_t kHeaderLen = 16;
constexpr size_t kFirstSlots = 64;

#if defined(__SANITIZE_ADDRESS__)
constexpr bool kSanitized = true;
#elif defined(__has_feature)
constexpr bool kSanitized = __has_feature(address_sanitizer);
#else
constexpr bool kSanitized = false;
#endif
}  // namespace

Heap::~Heap() {
  for (size_t i = 0; i < num_slots_; ++i) std::free(slots_[i].block);
}

// A length of almost 4 GiB must not wrap.
uint64_t Heap::charge_of(uint32_t len) {
  constexpr uint64_t kMask = Arena::kAlignment - 1;
  return ((len + kMask) & ~kMask) + kHeaderLen;
}

void *Heap::allocate(uint32_t len) {
  const uint64_t charge = charge_of(len);
  if (charge > size_ - in_use_) return nullptr;
  void *block = kSanitized || len > Arena::kMaxLen ? nullptr : arena_.take(len);
  if (block == nullptr) block = take_from_host(len);
  if (block == nullptr) return nullptr;
  in_use_ += static_cast<uint32_t>(charge);
  peak_ = std::max(peak_, in_use_);
  peak_live_ = std::max(peak_live_, ++live_);
  return block;
}

void *Heap::take_from_host(uint32_t len) {
  if (2 * (num_listed_ + 1) > num_slots_ && !grow()) return nullptr;
  void *block = std::calloc(1, len);
  if (block == nullptr) return nullptr;
  insert({block, len});
  ++num_listed_;
  return block;
}

std::optional<uint32_t> Heap::length_of(const void *block) const {
  if (arena_.holds(block)) return arena_.length_of(block);
  if (num_listed_ == 0) return std::nullopt;
  const Slot &slot = slots_[find(block)];
  if (slot.block != block) return std::nullopt;
  return slot.len;
}

void Heap::release(void *block, uint32_t len) {
  in_use_ -= static_cast<uint32_t>(charge_of(len));
  --live_;
  if (arena_.holds(block)) return arena_.give_back(block, len);
  erase(find(block));
  --num_listed_;
  std::free(block);
}

// The slot of the block, or a free one.
size_t Heap::find(const void *block) const {
  size_t slot = home(block);
  while (slots_[slot].block != block && slots_[slot].block != nullptr) slot = next(slot);
  return slot;
}

// Neighbours in memory are neighbours in the table: allocations that follow each other share its
// cache lines, which a hash that scatters would not let them do.
size_t Heap::home(const void *block) const {
  return reinterpret_cast<uintptr_t>(block) / Arena::kAlignment & (num_slots_ - 1);
}

bool Heap::grow() {
  const size_t old_num = num_slots_;
  const size_t new_num = old_num == 0 ? kFirstSlots : 2 * old_num;
  std::unique_ptr<Slot[]> bigger(new (std::nothrow) Slot[new_num]{});
  if (!bigger) return false;
  slots_.swap(bigger);
  num_slots_ = new_num;
  for (size_t i = 0; i < old_num; ++i) {
    if (bigger[i].block != nullptr) insert(bigger[i]);
  }
  return true;
}

void Heap::insert(Slot entry) {
  size_t slot = home(entry.block);
  while (slots_[slot].block != nullptr) slot = next(slot);
  slots_[slot] = entry;
}

// Closes the gap, so that every entry stays reachable from its home without passing a free slot.
void Heap::erase(size_t hole) {
  const size_t mask = num_slots_ - 1;
  for (size_t i = next(hole); slots_[i].block != nullptr; i = next(i)) {
    const size_t from_home = (i - home(slots_[i].block)) & mask;
    const size_t from_hole = (i - hole) & mask;
    if (from_home < from_hole) continue;
    slots_[hole] = slots_[i];
    hole = i;
  }
  slots_[hole] = {};
}

}  // namespace tee

using namespace tee;

void *TEE_Malloc(TEE_LengthType size, uint32_t) {
  TEE_Result ignored;
  if (fault_due(Fault::kAllocation, "TEE_Malloc", TEE_ERROR_OUT_OF_MEMORY, &ignored)) {
    return nullptr;
  }
  Heap &heap = current_instance().heap;
  if (heap_limit_reached(heap.in_use() + Heap::charge_of(size))) return nullptr;
  return heap.allocate(size);
}

void TEE_Free(void *buffer) {
  if (buffer == nullptr) return;
  Heap &heap = current_instance().heap;
  const std::optional<uint32_t> len = heap.length_of(buffer);
  if (!len) panic("TEE_Free", "not a live block of this instance");
  show_freed({static_cast<const char *>(buffer), *len});
  heap.release(buffer, *len);
}
