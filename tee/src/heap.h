// SPDX-License-Identifier: BSD-2-Clause
/// The heap of one instance: what TEE_Malloc() charges against gpd.ta.dataSize.
#ifndef TEE_HEAP_H
#define TEE_HEAP_H

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>

#include "arena.h"

namespace tee {

/// Memory comes from the host; the charge is what a small allocator inside a TEE would take. Live
/// blocks that an arena has no room for are kept in a hash table beside them: a pointer is judged
/// without being read.
///
/// Under a sanitizer, which is to see one byte too far and one use too late, there is no arena:
/// each block is the host's, in exactly the size asked for.
class Heap {
 public:
  explicit Heap(uint32_t size) : size_(size) {}
  ~Heap();
  Heap(const Heap &) = delete;
  Heap &operator=(const Heap &) = delete;

  /// The bytes that a block of `len` bytes takes.
  static uint64_t charge_of(uint32_t len);

  /// Zero-filled; NULL when the heap is full.
  void *allocate(uint32_t len);

  /// Nothing unless `block` is a live block of this heap, otherwise its length.
  std::optional<uint32_t> length_of(const void *block) const;

  /// Gives a live block of `len` bytes back.
  void release(void *block, uint32_t len);

  uint32_t size() const { return size_; }
  uint32_t in_use() const { return in_use_; }
  uint32_t peak() const { return peak_; }
  uint32_t live_blocks() const { return live_; }
  uint32_t peak_blocks() const { return peak_live_; }

 private:
  struct Slot {
    void *block;  // NULL: free
    uint32_t len;
  };

  void *take_from_host(uint32_t len);

  size_t home(const void *block) const;
  size_t find(const void *block) const;
  size_t next(size_t slot) const { return (slot + 1) & (num_slots_ - 1); }
  bool grow();
  void insert(Slot entry);
  void erase(size_t hole);

  const uint32_t size_;
  uint32_t in_use_ = 0;
  uint32_t peak_ = 0;
  uint32_t live_ = 0;
  uint32_t peak_live_ = 0;
  Arena arena_;
  // Open addressing with linear probing, a power of two, at most half full.
  std::unique_ptr<Slot[]> slots_;
  size_t num_slots_ = 0;
  size_t num_listed_ = 0;
};

}  // namespace tee

#endif
