// SPDX-License-Identifier: BSD-2-Clause
/// Unit tests of the agent's code run as an instance of a trusted application.
#ifndef SUPPORT_INSIDE_AGENT_H
#define SUPPORT_INSIDE_AGENT_H

#include <gtest/gtest.h>
#include <tee_test.h>

#include <string>
#include <vector>

#include "common/encoding.h"
#include "ownership.h"

namespace otrp_test {

/// After each test nothing may be left on the heap, and no handle open.
class InsideAgent : public testing::Test {
 protected:
  void TearDown() override {
    const tee_heap_stats stats = inside.stats();
    EXPECT_EQ(stats.live_blocks, 0u);
    EXPECT_EQ(stats.open_objects, 0u);
    EXPECT_EQ(stats.open_operations, 0u);
  }

  tee::test::Device device;
  tee::test::InsideTa inside{device};
  tee::test::TraceSink log;
};

inline std::string hex(const std::string &digits) {
  return tools::hex_decode(digits).value();
}

inline const uint8_t *u8(const std::string &bytes) {
  return reinterpret_cast<const uint8_t *>(bytes.data());
}

inline uint32_t len_of(const std::string &bytes) {
  return static_cast<uint32_t>(bytes.size());
}

inline std::string str(const secret_bytes &bytes) {
  return {reinterpret_cast<const char *>(bytes.data), bytes.len};
}

/// "function: message" of every line.
inline std::vector<std::string> lines_of(const tee::test::TraceSink &log) {
  std::vector<std::string> lines;
  for (const auto &line : log.lines()) lines.push_back(line.function + ": " + line.message);
  return lines;
}

/// Runs `work` with its n-th allocation failing, for every n, until none fails. It must pass then
/// and not before, and never leave a block behind.
template <class Work>
void fail_each_allocation(Work work) {
  bool fired = true;
  for (unsigned n = 1; fired; ++n) {
    SCOPED_TRACE(n);
    const tee::test::TraceSink log;
    tee::test::Device device;
    const tee::test::InsideTa inside(device);
    device.fail({}, tee::test::Fault::kAllocation, n);
    const bool passed = work();
    fired = device.fault_report().fired;
    EXPECT_EQ(passed, !fired);
    EXPECT_EQ(inside.stats().live_blocks, 0u);
  }
}

}  // namespace otrp_test

#endif
