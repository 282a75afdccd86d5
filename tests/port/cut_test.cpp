// SPDX-License-Identifier: BSD-2-Clause
// A life in two runs of the program, between which the tester cuts the power.
#include <gmock/gmock.h>

#include "port/any_scene.h"

namespace otrp_test {
namespace {

class Cut : public testing::Test {
 protected:
  AnyScene scene;
};

TEST_F(Cut, DISABLED_Before) {
  const std::string ta = taid(tsm::random_id());
  ASSERT_TRUE(scene.get_device_state().passed());
  ASSERT_THAT(scene.sd_names(), testing::IsEmpty()) << "expected a device without SDs";
  ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
  ASSERT_TRUE(scene.create_sd("sp1", "sd2").passed());
  ASSERT_TRUE(scene.install_ta("sp1", "sd1", ta).passed());
  ASSERT_TRUE(scene.delete_sd("sd2", "true").passed());
  ASSERT_TRUE(scene.update_ta("sp1", "sd1", ta).passed());
}

TEST_F(Cut, DISABLED_After) {
  ASSERT_TRUE(scene.get_device_state().passed());
  ASSERT_THAT(scene.sd_names(), testing::ElementsAre("sd1"));
  const Json tas = scene.sd_list()[0]["talist"];
  ASSERT_EQ(tas.size(), 1u);
  const Outcome info = scene.get_ta_info("sp1", tas[0]["taid"]);
  ASSERT_TRUE(info.passed());
  EXPECT_EQ(info.response->members["ta_version"], "2.0");
  EXPECT_TRUE(scene.update_ta("sp1", "sd1", tas[0]["taid"]).passed());
  EXPECT_TRUE(scene.create_sd("sp1", "sd2").passed());
  scene.leave_empty();
}

}  // namespace
}  // namespace otrp_test
