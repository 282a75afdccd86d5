// SPDX-License-Identifier: BSD-2-Clause
#include <cstring>
#include <vector>

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
  constexpr uint32_t kBlocks = 5000;
  std::vector<uint8_t *> blocks;
  for (uint32_t i = 0; i < kBlocks; ++i) {
    const uint32_t len = 1 + i % 100;
    blocks.push_back(static_cast<uint8_t *>(TEE_Malloc(len, TEE_MALLOC_FILL_ZERO)));
    ASSERT_NE(blocks[i], nullptr);
    EXPECT_EQ(blocks[i][len - 1], 0);
    std::memset(blocks[i], 0xFF, len);
    if (i % 3 == 2) TEE_Free(std::exchange(blocks[i - 1], nullptr));
  }
  EXPECT_EQ(ta.stats().live_blocks, kBlocks - kBlocks / 3);
  for (uint32_t step = 0; step < 7; ++step) {
    for (uint32_t i = step; i < kBlocks; i += 7) TEE_Free(blocks[i]);
  }
  EXPECT_EQ(ta.stats().live_blocks, 0u);
  EXPECT_EQ(ta.stats().in_use, 0u);
  EXPECT_GT(ta.stats().peak_blocks, kBlocks / 2);
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
