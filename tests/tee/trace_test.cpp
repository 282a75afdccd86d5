// SPDX-License-Identifier: BSD-2-Clause
#include <tee_trace.h>

#include "tee_support.h"

namespace {

TEST(Trace, NoTextPassesForALineOfItsOwn) {
  tee::test::Device device;
  const tee::test::InsideTa ta(device);
  testing::internal::CaptureStderr();
  tee_trace("f", 7, TEE_TRACE_ERROR, "%s\n", "a\nERR\x1b[2J\x7f \xC3\xBC");
  const std::string line = testing::internal::GetCapturedStderr();
  EXPECT_TRUE(line.ends_with("TA: test:f:7: a\\x0aERR\\x1b[2J\\x7f \xC3\xBC\n")) << line;
}

}  // namespace
