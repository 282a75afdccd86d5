// SPDX-License-Identifier: BSD-2-Clause
// Parameter types: of the 65536 combinations each command takes one.
#include <gtest/gtest.h>

#include <cstring>

#include "state/dsi.h"
#include "support/inside_agent.h"

namespace otrp_test {
namespace {

class EntryPoints : public InsideAgent {
 protected:
  void SetUp() override { ASSERT_EQ(TA_CreateEntryPoint(), TEE_SUCCESS); }
  void TearDown() override {
    TA_DestroyEntryPoint();
    EXPECT_EQ(g_dsi, nullptr);
    InsideAgent::TearDown();
  }
};

TEST_F(EntryPoints, EveryCommandTakesItsParameterTypesOnly) {
  const uint32_t input_output =
      TEE_PARAM_TYPES(TEE_PARAM_TYPE_MEMREF_INPUT, TEE_PARAM_TYPE_MEMREF_OUTPUT,
                      TEE_PARAM_TYPE_NONE, TEE_PARAM_TYPE_NONE);
  for (const uint32_t command : {0u, 1u, 2u}) {
    uint32_t num_taken = 0;
    for (uint32_t types = 0; types <= 0xFFFF; ++types) {
      // Pointers that whoever follows them would trip over.
      TEE_Param params[4];
      for (TEE_Param &param : params) param.memref = {reinterpret_cast<void *>(16), 16};
      TEE_Param before[4];
      std::memcpy(before, params, sizeof before);
      if (types == input_output) {
        params[0].memref = params[1].memref = {nullptr, 0};
        EXPECT_NE(TA_InvokeCommandEntryPoint(nullptr, command, types, params), TEE_SUCCESS);
        ++num_taken;
        continue;
      }
      ASSERT_EQ(TA_InvokeCommandEntryPoint(nullptr, command, types, params),
                TEE_ERROR_BAD_PARAMETERS)
          << std::hex << types;
      ASSERT_EQ(std::memcmp(before, params, sizeof before), 0) << std::hex << types;
    }
    EXPECT_EQ(num_taken, 1u);
  }
}

}  // namespace
}  // namespace otrp_test
