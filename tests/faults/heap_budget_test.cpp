// SPDX-License-Identifier: BSD-2-Clause
// The most that each message needs of the 2 MiB heap, held to what it has been measured to need.
#include <gtest/gtest.h>

#include "support/scene.h"

namespace otrp_test {
namespace {

struct Budget {
  MessageId id;
  const char *name;
  tsm::RequestOptions options;
  uint32_t few_sds;   // KiB, on a device with the SDs that the request needs
  uint32_t many_sds;  // KiB, with 100 SDs more
};

std::string stored(const std::string &text) {
  return word(static_cast<uint32_t>(text.size())) + text;
}

/// The same device with 100 SDs more, two TAs in each.
Snapshot with_many_sds(Snapshot snapshot) {
  Json list = Json::parse(snapshot.agent.at("SD_LIST_ID").substr(4));
  for (int i = 0; i < 100; ++i) {
    const std::string name = "another SD " + std::to_string(i);
    list["sd_list"].push_back(name);
    Json sd = {{"name", name}, {"spid", "sp1"}, {"tsmid", "tsm1"}, {"talist", Json::array()}};
    for (const char *ta : {"first", "second"}) {
      const std::string id = taid(ta + std::to_string(i));
      sd["talist"].push_back({{"taid", id}, {"taname", id}});
    }
    snapshot.agent["SD_INFO_" + name] = stored(sd.dump());
  }
  snapshot.agent["SD_LIST_ID"] = stored(list.dump());
  return snapshot;
}

class HeapBudget : public testing::Test {
 protected:
  void SetUp() override {
    ASSERT_TRUE(scene.get_device_state().response);
    ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
    ASSERT_TRUE(scene.create_sd("sp1", "sd2").passed());
    ASSERT_TRUE(scene.install_ta("sp1", "sd1", taid("ta1")).passed());
    few = scene.device.snapshot();
    many = with_many_sds(few);
  }

  /// KiB, rounded up.
  uint32_t peak_of(const Snapshot &snapshot, const Budget &budget) {
    const tee::test::TraceSink log;
    Scene device(scene, snapshot);
    EXPECT_TRUE(device.device.open());
    EXPECT_TRUE(device.get_device_state().response);
    const std::string request = device.request(budget.id, budget.options);
    EXPECT_TRUE(device.device.restart());  // the peak is counted from here
    // The frame must have room for a large image.
    const Reply reply =
        device.device.send(static_cast<uint32_t>(budget.id), request, size_t{4} << 20);
    EXPECT_EQ(reply.status, 0u);
    EXPECT_FALSE(reply.response.empty());
    return (device.device.stats().peak + 1023) / 1024;
  }

  Scene scene;
  Snapshot few;
  Snapshot many;
};

TEST_F(HeapBudget, OfEachMessageIsKept) {
  const std::string image = make_image(1000);
  const std::string large = make_image(1 << 20);
  const Budget budgets[] = {
      {MessageId::kGetDeviceState, "GetDeviceState", {}, 20, 175},
      {MessageId::kCreateSd, "CreateSD", {.spid = "sp9", .sdname = "new", .spcert = "c"}, 20, 175},
      {MessageId::kUpdateSd,
       "UpdateSD",
       {.spid = "sp1", .sdname = "sd2", .spcert = "c", .renew_aik = true},
       20,
       175},
      {MessageId::kDeleteSd, "DeleteSD", {.sdname = "sd1", .deleteta = "true"}, 20, 175},
      {MessageId::kInstallTa,
       "InstallTA",
       {.spid = "sp1", .sdname = "sd2", .taid = taid("new"), .ta_version = "1", .image = image},
       20,
       175},
      {MessageId::kInstallTa,
       "InstallTA 1 MiB",
       {.spid = "sp1", .sdname = "sd2", .taid = taid("new"), .ta_version = "1", .image = large},
       1375,
       1400},
      {MessageId::kUpdateTa,
       "UpdateTA",
       {.spid = "sp1", .sdname = "sd1", .taid = taid("ta1"), .ta_version = "2", .image = image},
       20,
       175},
      {MessageId::kDeleteTa, "DeleteTA", {.sdname = "sd1", .taid = taid("ta1")}, 20, 175},
      {MessageId::kGetTaInfo, "GetTAInfo", {.spid = "sp1", .taid = taid("ta1")}, 10, 115},
  };
  for (const Budget &budget : budgets) {
    SCOPED_TRACE(budget.name);
    const uint32_t with_few = peak_of(few, budget);
    const uint32_t with_many = peak_of(many, budget);
    std::printf("heap peak: %-16s %5u KiB, with 100 SDs more %5u KiB\n", budget.name, with_few,
                with_many);
    EXPECT_LE(with_few, budget.few_sds);
    EXPECT_LE(with_many, budget.many_sds);
  }
}

}  // namespace
}  // namespace otrp_test
