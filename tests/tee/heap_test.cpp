// SPDX-License-Identifier: BSD-2-Clause
#include <algorithm>
#include <map>
#include <random>
#include <vector>

#include "../../tee/src/arena.h"
#include "tee_support.h"

using namespace tee::test;

namespace {

struct ChargeCase {
  const char *name;
  uint32_t size;
  uint32_t charge;  // 0: refused
};

const ChargeCase kCharges[] = {
    {"Empty", 0, 16},
    {"OneByte", 1, 32},
    {"WholeUnit", 16, 32},
    {"NextUnit", 17, 48},
    {"AllThereIs", 0x1000 - 16, 0x1000},
    {"OneByteMore", 0x1000 - 15, 0},
    {"WrapsWhenRounded", UINT32_MAX, 0},
    {"WrapsWithHeader", UINT32_MAX - 15, 0},
};

TEST(Heap, ChargesRoundedBlocksAndTheirHeaders) {
  for (const ChargeCase &c : kCharges) {
    SCOPED_TRACE(c.name);
    Device device;
    const InsideTa ta(device, {.data_size = 0x1000});
    void *block = TEE_Malloc(c.size, TEE_MALLOC_FILL_ZERO);
    EXPECT_EQ(block != nullptr, c.charge != 0);
    EXPECT_EQ(ta.stats().in_use, c.charge);
    TEE_Free(block);
    EXPECT_EQ(ta.stats().in_use, 0u);
    EXPECT_EQ(ta.stats().peak, c.charge);
  }
}

// Many more blocks than the table of blocks begins with, freed in an order that leaves gaps.
TEST(Heap, KeepsTrackOfManyBlocks) {
  Device device;
  const InsideTa ta(device);
  std::vector<void *> blocks(5000);
  for (void *&block : blocks) block = TEE_Malloc(100, TEE_MALLOC_FILL_ZERO);
  EXPECT_EQ(ta.stats().live_blocks, blocks.size());
  for (size_t step = 0; step < 7; ++step) {
    for (size_t i = step; i < blocks.size(); i += 7) TEE_Free(blocks[i]);
  }
  EXPECT_EQ(ta.stats().live_blocks, 0u);
  EXPECT_EQ(ta.stats().in_use, 0u);
}

// The heap has none where it runs under a sanitizer.
TEST(Arena, BlocksAreZeroedAndApartAndKnown) {
  tee::Arena arena;
  std::map<uint8_t *, uint32_t> live;
  std::minstd_rand random;
  bool was_full = false;
  for (int i = 0; i < 20000; ++i) {
    const auto len = static_cast<uint32_t>(random() % (tee::Arena::kMaxLen + 1));
    auto at = live.lower_bound(live.empty() ? nullptr : live.begin()->first + random() % 32768);
    if (random() % 2 != 0 && at != live.end()) {
      ASSERT_EQ(arena.length_of(at->first), at->second);
      arena.give_back(at->first, at->second);
      ASSERT_FALSE(arena.length_of(at->first));
      live.erase(at);
    } else if (auto *block = static_cast<uint8_t *>(arena.take(len))) {
      ASSERT_TRUE(arena.holds(block) && !arena.length_of(block + 1));
      ASSERT_EQ(std::count(block, block + len, 0), len);
      std::fill_n(block, len, 1);
      at = live.insert({block, len}).first;
      ASSERT_TRUE(std::next(at) == live.end() || block + std::max(len, 1u) <= std::next(at)->first);
      ASSERT_TRUE(at == live.begin() || std::prev(at)->first + std::prev(at)->second <= block);
    } else {
      was_full = true;
    }
  }
  EXPECT_TRUE(was_full);
}

TEST(HeapDeathTest, MisusePanics) {
  EXPECT_DEATH(TEE_Malloc(1, TEE_MALLOC_FILL_ZERO), "called outside a trusted application");
  Device device;
  const InsideTa ta(device);
  auto *block = static_cast<char *>(TEE_Malloc(32, TEE_MALLOC_FILL_ZERO));
  EXPECT_DEATH(TEE_Free(block + 16), "TEE panic: TA 0.*TEE_Free: not a live block");
  TEE_Free(block);
  EXPECT_DEATH(TEE_Free(block), "not a live block");
}

}  // namespace
