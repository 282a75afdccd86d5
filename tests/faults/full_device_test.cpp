// SPDX-License-Identifier: BSD-2-Clause
// A device that is so full that it takes no more must still start, tell its state and be emptied.
#include <gtest/gtest.h>

#include "support/scene.h"

namespace otrp_test {
namespace {

std::string stored(const Json &record) {
  const std::string text = record.dump();
  return word(static_cast<uint32_t>(text.size())) + text;
}

Json sd_record(const std::string &name, const Json &talist) {
  return {{"name", name}, {"spid", "sp1"}, {"tsmid", "tsm1"}, {"talist", talist}};
}

std::string numbered(const std::string &prefix, size_t number, size_t len) {
  std::string digits = std::to_string(number);
  return prefix + std::string(len - prefix.size() - digits.size(), '0') + digits;
}

Json ta_entry(size_t number) {
  const std::string ta = numbered("ta", number, 32);
  return {{"taid", ta}, {"taname", ta}};
}

class FullDevice : public testing::Test {
 protected:
  void SetUp() override {
    ASSERT_TRUE(scene.get_device_state().response);
    ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
    empty = scene.device.snapshot();
  }

  using Fill = std::function<void(Snapshot &, size_t)>;

  /// The largest number for which a device with that many still carries `request` out.
  size_t find_limit(const Fill &fill, size_t above, MessageId id,
                    const tsm::RequestOptions &options) {
    size_t below = 1;
    while (above - below > 1) {
      const size_t middle = below + (above - below) / 2;
      Snapshot snapshot = empty;
      fill(snapshot, middle);
      (try_on(snapshot, id, options) ? below : above) = middle;
    }
    return below;
  }

  /// The request on a device with these objects; whatever comes of it, the device must start again.
  bool try_on(const Snapshot &snapshot, MessageId id, const tsm::RequestOptions &options) {
    Scene full(scene, snapshot);
    if (!full.device.open() || !full.get_device_state().response) return false;
    const bool passed = full.run(id, options).passed();
    EXPECT_TRUE(full.device.restart());
    full.device.expect_clean();
    return passed;
  }

  const tee::test::TraceSink log;
  Scene scene;
  Snapshot empty;
};

TEST_F(FullDevice, WithManyTasInOneSd) {
  const auto fill = [](Snapshot &snapshot, size_t num_tas) {
    Json talist = Json::array();
    for (size_t i = 0; i < num_tas; ++i) talist.push_back(ta_entry(i));
    snapshot.agent["SD_INFO_sd1"] = stored(sd_record("sd1", talist));
  };
  const size_t limit = find_limit(fill, 10000, MessageId::kInstallTa,
                                  {.spid = "sp1",
                                   .sdname = "sd1",
                                   .taid = taid("new"),
                                   .ta_version = "1",
                                   .image = make_image(100)});
  std::printf("TAs in one SD: %zu\n", limit + 1);
  EXPECT_GT(limit, 1000u);
}

TEST_F(FullDevice, WithManySds) {
  const auto fill = [](Snapshot &snapshot, size_t num_sds) {
    Json list = {"sd1"};
    for (size_t i = 1; i < num_sds; ++i) {
      const std::string name = numbered("sd", i, 10);
      list.push_back(name);
      snapshot.agent["SD_INFO_" + name] =
          stored(sd_record(name, {ta_entry(2 * i), ta_entry(2 * i + 1)}));
    }
    snapshot.agent["SD_LIST_ID"] = stored({{"sd_list", list}});
  };
  const size_t limit = find_limit(fill, 10000, MessageId::kCreateSd,
                                  {.spid = "sp1", .sdname = "new", .spcert = "certificate"});
  std::printf("SDs with two TAs each: %zu\n", limit + 1);
  EXPECT_GT(limit, 300u);
}

}  // namespace
}  // namespace otrp_test
