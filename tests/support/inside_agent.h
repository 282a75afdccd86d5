// SPDX-License-Identifier: BSD-2-Clause
/// Unit tests of the agent's code run as an instance of a trusted application.
#ifndef SUPPORT_INSIDE_AGENT_H
#define SUPPORT_INSIDE_AGENT_H

#include <gtest/gtest.h>
#include <tee_test.h>

#include <string>

#include "common/encoding.h"
#include "ownership.h"
#include "support/exact.h"

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

inline std::string str(const secret_bytes &bytes) {
  return {reinterpret_cast<const char *>(bytes.data), bytes.len};
}

}  // namespace otrp_test

#endif
