// SPDX-License-Identifier: BSD-2-Clause
// Every scenario with every kind of fault, at every point.
#include "faults/sweep.h"

#include <gtest/gtest.h>

#include <cstdio>

namespace otrp_test {
namespace {

using tee::test::Fault;

const FaultKind kKinds[] = {
    {"Allocation", Fault::kAllocation, false}, {"AllocationsFrom", Fault::kAllocation, true},
    {"Storage", Fault::kStorage, false},       {"Crypto", Fault::kCrypto, false},
    {"TaCall", Fault::kTaCall, false},         {"ShortRead", Fault::kShortRead, false},
    {"PowerCut", Fault::kPowerCut, false},
};

struct Case {
  const Scenario *scenario;
  const FaultKind *kind;
};

std::ostream &operator<<(std::ostream &out, const Case &c) {
  return out << c.scenario->name << ", " << c.kind->name;
}

std::vector<Case> all_cases() {
  std::vector<Case> cases;
  for (const Scenario &scenario : scenarios()) {
    for (const FaultKind &kind : kKinds) cases.push_back({&scenario, &kind});
  }
  return cases;
}

class FaultSweep : public testing::TestWithParam<Case> {};

TEST_P(FaultSweep, LeavesTheDeviceWhole) {
  const unsigned num_points = sweep(*GetParam().scenario, *GetParam().kind);
  std::printf("points tried: %-18s %-16s %5u\n", GetParam().scenario->name, GetParam().kind->name,
              num_points);
}

INSTANTIATE_TEST_SUITE_P(All, FaultSweep, testing::ValuesIn(all_cases()), [](const auto &row) {
  return std::string(row.param.scenario->name) + "_" + row.param.kind->name;
});

}  // namespace
}  // namespace otrp_test
