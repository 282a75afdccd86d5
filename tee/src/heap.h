// SPDX-License-Identifier: BSD-2-Clause
/// The heap of one instance: what TEE_Malloc() charges against gpd.ta.dataSize.
#ifndef TEE_HEAP_H
#define TEE_HEAP_H

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>

namespace tee {

/// Memory comes from the host; the charge is what a small allocator inside a TEE would take. Live
/// blocks are kept in a hash table beside them: a pointer is judged without being read.
///
/// Small blocks that were given back are handed out again by their size. Under a sanitizer, which
/// is to see one byte too far and one use too late, each block is the host's, in exactly the size
/// asked for.
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

  /// NULL unless `block` is a live block of this heap, otherwise its length.
  const uint32_t *length_of(const void *block) const;

  /// Gives a live block back.
  void release(void *block);

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
  /// Blocks of one size that were given back. They are not touched until they are asked for again:
  /// what lies in them has left the caches by then.
  struct Spares {
    size_t count;
    std::array<void *, 7> blocks;
  };

  static constexpr uint32_t kAlignment = 16;
  static constexpr uint32_t kMaxSmall = 1024;

  static uint32_t units_of(uint32_t len);
  void *take_block(uint32_t len);
  void give_block(void *block, uint32_t len);

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
  // Open addressing with linear probing, a power of two, at most half full.
  std::unique_ptr<Slot[]> slots_;
  size_t num_slots_ = 0;
  std::array<Spares, kMaxSmall / kAlignment + 1> spares_ = {};  // by units_of(len)
};

}  // namespace tee

#endif
