// SPDX-License-Identifier: BSD-2-Clause
// A new device: the key service makes its identity, the agent its first records. Each call of
// either that can fail does, power goes at each change of storage, and the device lives on.
#include <gtest/gtest.h>

#include <cstdio>

#include "faults/sweep.h"

namespace otrp_test {
namespace {

using enum tee::test::Fault;

const FaultKind kStartKinds[] = {
    {"Allocation", kAllocation},
    {"Storage", kStorage},
    {"Crypto", kCrypto},
    {"TaCall", kTaCall},
    {"ShortRead", kShortRead},
    {"PowerCut", kPowerCut},
    {"PowerCutCreating", kPowerCut, false, true},
};

class FirstStart : public testing::Test {
 protected:
  bool ask_for_state(AgentDevice &device) {
    return device.open() && device.send(1, request_).status == 0;
  }

  /// False when the device started without being hit.
  bool start(const FaultKind &kind, const TEE_UUID &ta, unsigned nth) {
    const tee::test::TraceSink log;
    AgentDevice device;
    device.host().create_at_once(kind.create_at_once);
    device.host().fail(ta, kind.fault, nth);
    std::string told;
    if (device.open()) {
      const Answer answer = device.invoke(2, "", 100);
      if (answer.result == TEEC_SUCCESS) told = answer.buffer.substr(0, answer.size);
      (void)ask_for_state(device);
    }
    const tee::test::FaultReport report = device.host().fault_report();
    SCOPED_TRACE(report.call);
    device.host().clear_faults();
    device.host().restore_power();
    const bool was_cut = kind.fault == kPowerCut && report.fired;
    EXPECT_TRUE(was_cut || ask_for_state(device));
    check_what_is_left(device.snapshot(), told, kind.fault == kPowerCut);
    if (was_cut) cuts_.insert(report.call);
    return report.fired;
  }

  static void check_what_is_left(const Snapshot &left, const std::string &told, bool is_cut) {
    Scene scene(left);
    EXPECT_TRUE(left.key_service.empty() || told.empty() || scene.info.device_id == told);
    EXPECT_TRUE(scene.get_device_state().passed());
    if (is_cut) live_on(scene);
  }

  const std::string request_ = Scene().request(MessageId::kGetDeviceState, {});
  std::set<std::string> cuts_;  // what they met
};

TEST_F(FirstStart, MayFailAnywhere) {
  for (const FaultKind &kind : kStartKinds) {
    SCOPED_TRACE(kind.name);
    unsigned num_points = 0;
    for (const TEE_UUID &ta : {kCorvelUuid, kAgentUuid}) {
      for (unsigned n = 1; start(kind, ta, n) && !HasFailure(); ++n) ++num_points;
    }
    std::printf("points tried: %-18s %-16s %5u\n", "FirstStart", kind.name, num_points);
    EXPECT_GT(num_points, 0u);
    EXPECT_TRUE(kind.fault != kPowerCut || cuts_.contains("save IDENTITY"));
    cuts_.clear();
  }
}

}  // namespace
}  // namespace otrp_test
