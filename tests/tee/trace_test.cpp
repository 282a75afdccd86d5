// SPDX-License-Identifier: BSD-2-Clause
#include <tee_inspect.h>
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

TEST(Trace, LinesOfAThreadGoWhereItWantsThem) {
  tee::test::Device device;
  const tee::test::InsideTa ta(device);
  std::string taken;
  const auto take = [](void *closure, const char *line, size_t len) {
    static_cast<std::string *>(closure)->append(line, len);
  };
  testing::internal::CaptureStderr();
  tee_inspect_trace(take, &taken);
  tee_trace("f", 7, TEE_TRACE_ERROR, "taken");
  tee_inspect_trace(nullptr, nullptr);
  tee_trace("f", 8, TEE_TRACE_ERROR, "printed");
  const std::string printed = testing::internal::GetCapturedStderr();
  EXPECT_TRUE(taken.ends_with(":f:7: taken\n")) << taken;
  EXPECT_TRUE(printed.ends_with(":f:8: printed\n")) << printed;
  EXPECT_EQ(printed.find("taken"), std::string::npos);
}

}  // namespace
