// SPDX-License-Identifier: BSD-2-Clause
// The 2 MiB heap: the most that each message needs of it, held to what it has been measured to
// need; and devices so full that they take no more, which must still start and tell their state.
#include <gtest/gtest.h>

#include "support/scene.h"

namespace otrp_test {
namespace {

std::string numbered(const std::string &prefix, size_t number) {
  const std::string digits = std::to_string(number);
  return prefix + std::string(6 - digits.size(), '0') + digits;
}

/// As many SDs more, two TAs in each.
void add_sds(Snapshot &snapshot, size_t num_sds) {
  Json list = Json::parse(snapshot.agent.at("SD_LIST_ID").substr(4));
  Json record = Json::parse(snapshot.agent.at("SD_INFO_sd1").substr(4));
  for (size_t i = 0; i < num_sds; ++i) {
    record["name"] = numbered("SD", i);
    for (size_t ta = 0; ta < 2; ++ta) {
      record["talist"][ta]["taid"] = record["talist"][ta]["taname"] =
          taid(numbered("TA", 2 * i + ta));
    }
    list["sd_list"].push_back(record["name"]);
    snapshot.agent["SD_INFO_" + record["name"].get<std::string>()] = stored(record.dump());
  }
  snapshot.agent["SD_LIST_ID"] = stored(list.dump());
}

/// As many TAs more in sd2.
void add_tas(Snapshot &snapshot, size_t num_tas) {
  Json record = Json::parse(snapshot.agent.at("SD_INFO_sd2").substr(4));
  for (size_t i = 0; i < num_tas; ++i) {
    const std::string ta = taid(numbered("TA", i));
    record["talist"].push_back({{"taid", ta}, {"taname", ta}});
  }
  snapshot.agent["SD_INFO_sd2"] = stored(record.dump());
}

class Capacity : public testing::Test {
 protected:
  void SetUp() override {
    scene.capacity = 4 << 20;
    scene.furnish();
    furnished = scene.device.snapshot();
  }

  /// In KiB, rounded up.
  uint32_t peak_of(const Snapshot &snapshot, MessageId id, const tsm::RequestOptions &options) {
    Scene device(scene, snapshot);
    EXPECT_TRUE(device.device.open());
    EXPECT_TRUE(device.get_device_state().passed());
    const std::string request = device.request(id, options);
    EXPECT_TRUE(device.device.restart());  // the peak is counted from here
    // The frame must have room for a large image.
    const Reply reply = device.device.send(static_cast<uint32_t>(id), request, 4 << 20);
    EXPECT_EQ(reply.status, 0u);
    return (device.device.stats().peak + 1023) / 1024;
  }

  void expect_peaks(MessageId id, const tsm::RequestOptions &options, uint32_t few_sds,
                    uint32_t many_sds) {
    SCOPED_TRACE(tsm::message_of(id).command);
    Snapshot crowded = furnished;
    add_sds(crowded, 100);
    const uint32_t with_few = peak_of(furnished, id, options);
    const uint32_t with_many = peak_of(crowded, id, options);
    std::printf("heap peak: %-16s %5u KiB, with 100 SDs more %5u KiB\n",
                tsm::message_of(id).command.data(), with_few, with_many);
    EXPECT_LE(with_few, few_sds);
    EXPECT_LE(with_many, many_sds);
  }

  /// Whatever comes of the request, the device must start again.
  bool takes(const Snapshot &snapshot, MessageId id) {
    Scene full(scene, snapshot);
    if (!full.device.open() || !full.get_device_state().passed()) return false;
    const bool passed = full.run(id, usual(id)).passed();
    EXPECT_TRUE(full.device.restart());
    full.device.expect_clean();
    return passed;
  }

  /// About the largest number for which a device that is so full carries the request out.
  size_t find_limit(void (*fill)(Snapshot &, size_t), MessageId id) {
    size_t below = 1;
    size_t above = 8192;
    while (above - below > above / 128) {
      const size_t middle = (below + above) / 2;
      Snapshot snapshot = furnished;
      fill(snapshot, middle);
      (takes(snapshot, id) ? below : above) = middle;
    }
    return below;
  }

  const tee::test::TraceSink log;
  Scene scene;
  Snapshot furnished;
};

TEST_F(Capacity, EachMessageKeepsItsHeapBudget) {
  for (int i = 1; i <= 8; ++i) {
    const auto id = static_cast<MessageId>(i);
    const bool is_small = id == MessageId::kGetTaInfo;
    expect_peaks(id, usual(id), is_small ? 10 : 21, is_small ? 115 : 175);
  }
  tsm::RequestOptions large = usual(MessageId::kInstallTa);
  large.image = make_image(1 << 20);
  expect_peaks(MessageId::kInstallTa, large, 1375, 1400);
}

TEST_F(Capacity, AFullDeviceStartsAndTellsItsState) {
  const size_t num_tas = find_limit(add_tas, MessageId::kInstallTa);
  const size_t num_sds = find_limit(add_sds, MessageId::kCreateSd);
  std::printf("TAs in one SD: %zu, SDs with two TAs each: %zu\n", num_tas, num_sds);
  EXPECT_GT(num_tas, 1000u);
  EXPECT_GT(num_sds, 300u);
}

}  // namespace
}  // namespace otrp_test
