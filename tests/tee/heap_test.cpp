// SPDX-License-Identifier: BSD-2-Clause
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
  std::vector<void *> blocks(5000);
  for (void *&block : blocks) block = TEE_Malloc(100, TEE_MALLOC_FILL_ZERO);
  EXPECT_EQ(ta.stats().live_blocks, blocks.size());
  for (size_t step = 0; step < 7; ++step) {
    for (size_t i = step; i < blocks.size(); i += 7) TEE_Free(blocks[i]);
  }
  EXPECT_EQ(ta.stats().live_blocks, 0u);
  EXPECT_EQ(ta.stats().in_use, 0u);
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
