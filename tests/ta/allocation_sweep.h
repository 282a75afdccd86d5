// SPDX-License-Identifier: BSD-2-Clause
/// For unit tests of code that allocates and logs.
#ifndef ALLOCATION_SWEEP_H
#define ALLOCATION_SWEEP_H

#include <gtest/gtest.h>
#include <tee_test.h>

#include <string>
#include <vector>

namespace otrp_test {

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
