// SPDX-License-Identifier: BSD-2-Clause
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
