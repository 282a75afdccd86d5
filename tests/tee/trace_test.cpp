// SPDX-License-Identifier: BSD-2-Clause
#include <tee_trace.h>

#include "tee_support.h"

using namespace tee::test;

namespace {

TEST(Trace, SinksNestAndLinesAboveTheLevelDoNotAppear) {
  Device device;
  const InsideTa ta(device, {.trace_level = TEE_TRACE_INFO});
  const TraceSink outer;
  {
    const TraceSink inner_sink;
    tee_trace("f", 1, TEE_TRACE_INFO, "%s %d\n", "text", 7);
    tee_trace("g", 2, TEE_TRACE_DEBUG, "debug");
    tee_trace("h", 3, TEE_TRACE_ALWAYS, "%s", std::string(5000, 'x').c_str());
    ASSERT_EQ(inner_sink.lines().size(), 2u);
    EXPECT_EQ(inner_sink.lines()[0].function + ": " + inner_sink.lines()[0].message, "f: text 7");
    EXPECT_EQ(inner_sink.lines()[1].tag, "MSG");
    EXPECT_EQ(inner_sink.lines()[1].message, std::string(5000, 'x'));
  }
  EXPECT_TRUE(outer.lines().empty());
}

TEST(Trace, LinesOnStandardErrorNameThreadPrefixAndPlace) {
  Device device;
  const InsideTa ta(device, {.trace_prefix = "TA: unit", .trace_level = 9});
  testing::internal::CaptureStderr();
  tee_trace("init", 42, TEE_TRACE_ERROR, "broken\n");
  tee_trace("init", 43, 7, "odd");
  const std::string lines = testing::internal::GetCapturedStderr();
  EXPECT_TRUE(testing::internal::RE::FullMatch(lines,
                                               "ERR \\[0x[0-9a-f]+\\] TA: unit:init:42: broken\n"
                                               "UKN \\[0x[0-9a-f]+\\] TA: unit:init:43: odd\n"))
      << lines;
}

}  // namespace
