// SPDX-License-Identifier: BSD-2-Clause
// Every scenario with every kind of fault, at every point.
#include "faults/sweep.h"

#include <gtest/gtest.h>

#include <cstdio>

namespace otrp_test {
namespace {

using Options = tsm::RequestOptions;
using enum tsm::MessageId;
using tee::test::Fault;

const FaultKind kKinds[] = {
    {"Allocation", Fault::kAllocation}, {"AllocationsFrom", Fault::kAllocation, true},
    {"Storage", Fault::kStorage},       {"Crypto", Fault::kCrypto},
    {"TaCall", Fault::kTaCall},         {"ShortRead", Fault::kShortRead},
    {"PowerCut", Fault::kPowerCut},     {"PowerCutCreating", Fault::kPowerCut, false, true},
};

void nothing(Scene &) {}

void no_objects(Scene &scene) {
  scene.device.close();
  scene.device.remove_record("SD_LIST_ID");
}

void known_tsm(Scene &scene) {
  ASSERT_TRUE(scene.get_device_state().passed());
}

void furnished(Scene &scene) {
  scene.furnish();
}

void stale_hash(Options &options) {
  options.dsihash = std::string(64, '0');
}

void one_sd(Scene &scene) {
  known_tsm(scene);
  ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
}

void known_sp(Options &options) {
  options.spid = "sp1";
}

void last_sd(Options &options) {
  options = {.sdname = "sd3", .deleteta = "false"};
}

void first_ta(Options &options) {
  options.sdname = "sd1";
}

void known_ta(Options &options) {
  options.sdname = "sd1";
  options.taid = taid("ta1");
}

const std::set<std::string> kTas = {"TA_INFO_" + taid("ta1"), "TA_INFO_" + taid("ta2")};

const Scenario kScenarios[] = {
    {.name = "FirstCreation", .prepare = no_objects, .ask = Ask::kCreation},
    {.name = "Creation", .prepare = furnished, .ask = Ask::kCreation},
    {.name = "StatusQuery", .prepare = furnished, .ask = Ask::kStatusQuery},
    {.name = "DeviceId", .prepare = nothing, .ask = Ask::kDeviceId},
    {"GetDeviceState", nothing, kGetDeviceState},
    {"CreateSd", known_tsm, kCreateSd, nullptr, {kSdExists}},
    {"CreateSdKnownSp", furnished, kCreateSd, known_sp, {kSdExists}},
    {"CreateSdRefused", furnished, kCreateSd, stale_hash, {kMismatch}},
    {"UpdateSd", furnished, kUpdateSd},
    {"DeleteSd", furnished, kDeleteSd, nullptr, {kResponseFailed}, kTas},  // it is not listed then
    {"DeleteLastSd", furnished, kDeleteSd, last_sd, {kResponseFailed}},
    {"InstallTa", furnished, kInstallTa, nullptr, {kTaExists}},
    {"InstallFirstTa", one_sd, kInstallTa, first_ta, {kTaExists}},
    {"InstallTaRefused", furnished, kInstallTa, known_ta, {kTaExists}},
    {"UpdateTa", furnished, kUpdateTa},
    {"DeleteTa", furnished, kDeleteTa, nullptr, {TEEC_ERROR_ITEM_NOT_FOUND}},
    {"GetTaInfo", furnished, kGetTaInfo},
};

struct Case {
  const Scenario &scenario;
  const FaultKind &kind;
};

std::ostream &operator<<(std::ostream &out, const Case &c) {
  return out << c.scenario.name << "_" << c.kind.name;
}

std::vector<Case> all_cases() {
  std::vector<Case> cases;
  for (const Scenario &scenario : kScenarios) {
    for (const FaultKind &kind : kKinds) cases.push_back({scenario, kind});
  }
  return cases;
}

class FaultSweep : public testing::TestWithParam<Case> {};

TEST_P(FaultSweep, LeavesTheDeviceWhole) {
  const auto &[scenario, kind] = GetParam();
  std::printf("points tried: %-18s %-16s %5u\n", scenario.name, kind.name, sweep(scenario, kind));
}

INSTANTIATE_TEST_SUITE_P(All, FaultSweep, testing::ValuesIn(all_cases()),
                         testing::PrintToStringParamName());

}  // namespace
}  // namespace otrp_test
