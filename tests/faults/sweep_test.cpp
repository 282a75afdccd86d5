// SPDX-License-Identifier: BSD-2-Clause
// Every scenario with every kind of fault, at every point.
#include "faults/sweep.h"

#include <gtest/gtest.h>

#include <cstdio>

#include "support/log_rows.h"

namespace otrp_test {
namespace {

using Options = tsm::RequestOptions;
using enum tsm::MessageId;
using tee::test::Fault;
using enum tee::test::Fault;

constexpr TEE_Result kNatural = 0;

const FaultKind kKinds[] = {
    {"Allocation", kAllocation},
    {"AllocationsFrom", kAllocation, true, false, kNatural, 3},
    {"FullHeap", kFullHeap},
    {"FullHeapForSps", kFullHeap, false, false, kNatural, 1, "SP_INFO_"},
    {"FullHeapForSds", kFullHeap, false, false, kNatural, 1, "SD_INFO_"},
    {"Storage", kStorage},
    {"Corrupt", kStorage, false, false, TEE_ERROR_CORRUPT_OBJECT},
    {"Crypto", kCrypto},
    {"TaCall", kTaCall},
    {"ShortRead", kShortRead},
    {"PowerCut", kPowerCut},
    {"PowerCutCreating", kPowerCut, false, true},
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

const std::set<Fault> kNoWrites = {kPowerCut};
const std::set<Fault> kNoCrypto = {kCrypto, kTaCall};
const std::set<Fault> kRecordsAlone = {kCrypto, kTaCall, kPowerCut};
const std::set<Fault> kKeyServiceAlone = {kAllocation, kStorage,  kCrypto,
                                          kShortRead,  kPowerCut, kFullHeap};

const Scenario kScenarios[] = {
    {.name = "FirstCreation", .prepare = no_objects, .never = kNoCrypto, .ask = Ask::kCreation},
    {.name = "Creation", .prepare = furnished, .never = kRecordsAlone, .ask = Ask::kCreation},
    {.name = "Query", .prepare = furnished, .never = kRecordsAlone, .ask = Ask::kStatusQuery},
    {.name = "DeviceId", .prepare = nothing, .never = kKeyServiceAlone, .ask = Ask::kDeviceId},
    {"GetDeviceState", nothing, kGetDeviceState},
    {"CreateSd", known_tsm, kCreateSd, {}, nullptr, {kSdExists}},
    {"CreateSdKnownSp", furnished, kCreateSd, {}, known_sp, {kSdExists}},
    {"CreateSdRefused", furnished, kCreateSd, kNoWrites, stale_hash, {kMismatch}},
    {"UpdateSd", furnished, kUpdateSd},
    // It is not listed then.
    {"DeleteSd", furnished, kDeleteSd, {}, nullptr, {kResponseFailed}, kTas},
    {"DeleteLastSd", furnished, kDeleteSd, {}, last_sd, {kResponseFailed}},
    {"InstallTa", furnished, kInstallTa, {}, nullptr, {kTaExists}},
    {"InstallFirstTa", one_sd, kInstallTa, {}, first_ta, {kTaExists}},
    {"InstallTaRefused", furnished, kInstallTa, kNoWrites, known_ta, {kTaExists}},
    {"UpdateTa", furnished, kUpdateTa},
    {"DeleteTa", furnished, kDeleteTa, {}, nullptr, {TEEC_ERROR_ITEM_NOT_FOUND}},
    {"GetTaInfo", furnished, kGetTaInfo, {kTaCall, kPowerCut}},
};

class FaultSweep : public testing::TestWithParam<Scenario> {};

TEST_P(FaultSweep, LeavesTheDeviceWhole) {
  Sweep sweep(GetParam());
  for (const FaultKind &kind : kKinds) {
    if (HasFailure()) break;
    const unsigned num_points = sweep.run(kind);
    std::printf("points tried: %-18s %-16s %5u\n", GetParam().name, kind.name, num_points);
    EXPECT_EQ(num_points == 0, GetParam().never.contains(kind.fault)) << kind.name;
  }
  for (const auto &[name, lines] : read_log_rows()) {
    if (!name.starts_with(GetParam().name + std::string(" as a whole, "))) continue;
    EXPECT_TRUE(sweep.log_rows().contains(lines)) << name;
  }
}

INSTANTIATE_TEST_SUITE_P(All, FaultSweep, testing::ValuesIn(kScenarios),
                         testing::PrintToStringParamName());

}  // namespace
}  // namespace otrp_test
