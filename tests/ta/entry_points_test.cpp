// SPDX-License-Identifier: BSD-2-Clause
// Parameter types: of the 65536 combinations each command takes one, and says so of the others.
#include <gmock/gmock.h>

#include "state/dsi.h"
#include "support/inside_agent.h"

namespace otrp_test {
namespace {

class EntryPoints : public InsideAgent {};

TEST_F(EntryPoints, EveryCommandTakesItsParameterTypesOnly) {
  ASSERT_EQ(TA_CreateEntryPoint(), TEE_SUCCESS);
  const uint32_t input_output =
      TEE_PARAM_TYPES(TEE_PARAM_TYPE_MEMREF_INPUT, TEE_PARAM_TYPE_MEMREF_OUTPUT,
                      TEE_PARAM_TYPE_NONE, TEE_PARAM_TYPE_NONE);
  for (const uint32_t command : {0u, 1u, 2u}) {
    for (uint32_t types = 0; types <= 0xFFFF; ++types) {
      log.clear();
      // Pointers that whoever follows them would trip over.
      TEE_Param params[4];
      for (TEE_Param &param : params) param.memref = {reinterpret_cast<void *>(16), 16};
      if (types == input_output) params[0].memref = params[1].memref = {nullptr, 0};
      ASSERT_NE(TA_InvokeCommandEntryPoint(nullptr, command, types, params), TEE_SUCCESS);
      const bool is_turned_away =
          !log.lines().empty() && log.lines()[0].message.starts_with("otrp: bad param types: 0x");
      ASSERT_EQ(is_turned_away, types != input_output) << std::hex << types;
    }
  }
  log.clear();
  TEE_Param nothing[4] = {};
  EXPECT_EQ(TA_InvokeCommandEntryPoint(nullptr, 3, input_output, nothing), TEE_ERROR_GENERIC);
  EXPECT_TRUE(log.lines().empty());
  TA_DestroyEntryPoint();
  EXPECT_EQ(g_dsi, nullptr);
}

}  // namespace
}  // namespace otrp_test
