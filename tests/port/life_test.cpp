// SPDX-License-Identifier: BSD-2-Clause
// A device's life as its TSM sees it: all messages, over the Client API alone.
#include <gmock/gmock.h>

#include "port/any_scene.h"
#include "tsm/protocol/dsi.h"

namespace otrp_test {
namespace {

using testing::ElementsAre;

class Life : public testing::Test {
 protected:
  void SetUp() override {
    ASSERT_TRUE(scene.get_device_state().passed());
    ASSERT_THAT(scene.sd_names(), testing::IsEmpty()) << "expected a device without SDs";
    ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
  }

  void TearDown() override { scene.leave_empty(); }

  std::string aik_of(const std::string &spid) {
    return tsm::find_aik(scene.dsi, spid).value().fingerprint();
  }

  Answer query(const std::string &ta) {
    return scene.device.invoke(1, device::build_query(ta), 100);
  }

  Json ta_info(const std::string &spid) {
    const Outcome outcome = scene.get_ta_info(spid, ta1);
    EXPECT_TRUE(outcome.passed());
    return outcome.response ? outcome.response->members : Json::object();
  }

  void expect_same_after_restart() {
    const std::string before = scene.dsi_text;
    scene.restart();
    ASSERT_TRUE(scene.get_device_state().passed());
    EXPECT_EQ(scene.dsi_text, before);
  }

  AnyScene scene;
  const std::string ta1 = taid(tsm::random_id());  // a device that lives on has seen others
};

TEST_F(Life, AnSpGetsItsAikWithItsFirstSdAndLosesItWithItsLast) {
  const std::string first_aik = aik_of("sp1");
  ASSERT_TRUE(scene.create_sd("sp1", "sd2").passed());
  ASSERT_TRUE(scene.create_sd("sp2", "sd3").passed());
  EXPECT_EQ(aik_of("sp1"), first_aik);
  EXPECT_THAT(scene.sd_names(), ElementsAre("sd1", "sd2", "sd3"));
  EXPECT_EQ(scene.dsi["dsi"]["tee"]["sdlist"]["cnt"], 3);
  expect_same_after_restart();

  ASSERT_TRUE(scene.delete_sd("sd1", "false").passed());
  EXPECT_EQ(aik_of("sp1"), first_aik);
  ASSERT_TRUE(scene.delete_sd("sd2", "true").passed());
  EXPECT_FALSE(tsm::find_aik(scene.dsi, "sp1"));
  ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
  EXPECT_NE(aik_of("sp1"), first_aik);
}

TEST_F(Life, UpdateSdRenewsTheAikOfAllSdsOfTheSp) {
  const std::string old_aik = aik_of("sp1");
  ASSERT_TRUE(scene.update_sd("sp1", "sd1", false).passed());
  EXPECT_EQ(aik_of("sp1"), old_aik);
  const Outcome renewed = scene.update_sd("sp1", "sd1");
  ASSERT_TRUE(renewed.passed());
  EXPECT_NE(aik_of("sp1"), old_aik);
  const Outcome next = scene.create_sd("sp1", "sd2");
  ASSERT_TRUE(next.passed());
  EXPECT_EQ(next.response->content["teespaik"], renewed.response->content["teespaik"]);
}

TEST_F(Life, ATaIsHandedOverAndRecordedUntilItIsDeleted) {
  EXPECT_TRUE(gave(kNotFound, query(ta1)));
  for (const std::string &image : {make_image(1 << 20), make_image(1)}) {
    const bool is_update = query(ta1).result == TEEC_SUCCESS;
    const Outcome outcome = is_update ? scene.update_ta("sp1", "sd1", ta1, image)
                                      : scene.install_ta("sp1", "sd1", ta1, image);
    ASSERT_TRUE(outcome.passed());
    EXPECT_EQ(outcome.reply.image, image);
    EXPECT_EQ(outcome.reply.answer.size, 12 + outcome.reply.response.size() + image.size());
    EXPECT_EQ(ta_info("sp1")["ta_version"], is_update ? "2.0" : "1.0");
    expect_same_after_restart();
  }
  ASSERT_TRUE(scene.delete_ta("sd1", ta1).passed());
  EXPECT_TRUE(gave(kNotFound, query(ta1)));
  EXPECT_TRUE(gave(kNotFound, scene.get_ta_info("sp1", ta1).reply));
  expect_same_after_restart();
}

TEST_F(Life, GetTaInfoIsSignedWithTheAikOfTheSpInTheRequest) {
  ASSERT_TRUE(scene.create_sd("sp2", "sd2").passed());
  ASSERT_TRUE(scene.install_ta("sp1", "sd1", ta1).passed());
  for (const std::string sp : {"sp1", "sp2"}) {
    const Json expected = {{"taid", ta1},
                           {"spid", sp},
                           {"tsmid", "tsm1"},
                           {"ta_version", "1.0"},
                           {"signercert", "certificate of " + sp}};
    EXPECT_EQ(ta_info(sp).dump(), expected.dump());
  }
}

TEST_F(Life, NamesFillObjectIdsToTheLastByte) {
  // Of 64 bytes, the prefixes of both records take 8.
  const std::string spid(56, 'p');
  const std::string sdname(56, 's');
  ASSERT_TRUE(scene.create_sd(spid, sdname).passed());
  expect_same_after_restart();
  EXPECT_THAT(scene.sd_names(), ElementsAre("sd1", sdname));
  EXPECT_TRUE(tsm::find_aik(scene.dsi, spid));
}

TEST_F(Life, FiftySdsHaveRoom) {
  for (int i = 2; i <= 50; ++i) {
    ASSERT_TRUE(scene.create_sd("sp1", "sd" + std::to_string(i)).passed()) << i;
  }
  expect_same_after_restart();
  EXPECT_EQ(scene.sd_names().size(), 50u);
}

TEST_F(Life, ContentsMayComeInGcm) {
  const Outcome outcome = scene.run(MessageId::kCreateSd, usual(MessageId::kCreateSd),
                                    {.cipher = tsm::ContentCipher::kA128Gcm});
  ASSERT_TRUE(outcome.passed());
  EXPECT_THAT(scene.sd_names(), ElementsAre("sd1", "sd4"));
}

TEST_F(Life, AnImageThatDoesNotFitIsReportedWithTheSizeItNeeds) {
  const tsm::RequestOptions options = {
      .spid = "sp1", .sdname = "sd1", .taid = ta1, .ta_version = "1", .image = make_image(5000)};
  // Every install of the same TA on the same state has the same length; take it from one.
  const Outcome whole = scene.run(MessageId::kInstallTa, options);
  ASSERT_TRUE(whole.passed());
  const size_t needed = whole.reply.answer.size;
  for (const size_t capacity : {needed, needed - 1}) {
    ASSERT_TRUE(scene.delete_ta("sd1", ta1).passed());
    const Reply reply =
        scene.device.send(2, scene.request(MessageId::kInstallTa, options), capacity);
    EXPECT_TRUE(gave(capacity == needed ? 0u : uint32_t{kNoMemory}, reply));
    EXPECT_EQ(reply.image.has_value(), capacity == needed);
    EXPECT_EQ(reply.answer.size, needed);
    EXPECT_FALSE(reply.response.empty());
    ASSERT_TRUE(scene.get_device_state().passed());
  }
}

}  // namespace
}  // namespace otrp_test
