// SPDX-License-Identifier: BSD-2-Clause
// A device's life: all messages, with every response, record and device state checked.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/scene.h"
#include "tsm/dsi.h"
#include "tsm/image.h"

namespace otrp_test {
namespace {

using testing::ElementsAre;

std::vector<std::string> names_of(const Json &object) {
  std::vector<std::string> names;
  for (const auto &item : object.items()) names.push_back(item.key());
  return names;
}

std::string aik_of(const Scene &scene, const std::string &spid) {
  return tsm::find_aik(scene.dsi, spid).value().fingerprint();
}

class Life : public testing::Test {
 protected:
  void SetUp() override { ASSERT_TRUE(scene.get_device_state().response); }
  void TearDown() override { scene.device.expect_clean(); }

  /// The device says the same of itself after a restart.
  void expect_same_after_restart() {
    const std::string before = scene.dsi_text;
    ASSERT_TRUE(scene.device.restart());
    ASSERT_TRUE(scene.get_device_state().response);
    EXPECT_EQ(scene.dsi_text, before);
  }

  Scene scene;
};

TEST_F(Life, CreateSdGivesAnSpItsAikOnce) {
  const Outcome first = scene.create_sd("sp1", "sd1");
  ASSERT_TRUE(first.passed());
  EXPECT_THAT(names_of(first.response->members),
              ElementsAre("ver", "rid", "tid", "status", "content"));
  EXPECT_THAT(names_of(first.response->content),
              ElementsAre("reason", "did", "sdname", "cert", "teespaik", "teespaiktype", "dsi"));
  EXPECT_EQ(first.response->content["sdname"], "sd1");
  EXPECT_EQ(first.response->content["reason"], Json::object());
  EXPECT_EQ(first.response->content["teespaiktype"], "");
  EXPECT_EQ(scene.device.record("SD_INFO_sd1"),
            R"({"name":"sd1","spid":"sp1","tsmid":"tsm1","talist":[]})");
  EXPECT_EQ(scene.device.record("SD_LIST_ID"), R"({"sd_list":["sd1"]})");
  const std::string sp_info = scene.device.record("SP_INFO_sp1").value();
  EXPECT_TRUE(sp_info.starts_with(R"({"spid":"sp1","spcert":"certificate of sp1","aik":")"));

  const Outcome second =
      scene.run(MessageId::kCreateSd, {.spid = "sp1", .sdname = "sd2", .spcert = "another"});
  ASSERT_TRUE(second.passed());
  EXPECT_EQ(second.response->content["teespaik"], first.response->content["teespaik"]);
  EXPECT_EQ(scene.device.record("SP_INFO_sp1"), sp_info);
  ASSERT_TRUE(scene.create_sd("sp2", "sd3").passed());
  EXPECT_THAT(scene.sd_names(), ElementsAre("sd1", "sd2", "sd3"));
  EXPECT_EQ(scene.dsi["dsi"]["tee"]["sdlist"]["cnt"], 3);
  EXPECT_EQ(scene.dsi["dsi"]["tee"]["teeaiklist"].size(), 2u);
  expect_same_after_restart();
}

TEST_F(Life, InstallTaHandsTheImageBackAndRecordsIt) {
  ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
  const std::string image = make_image(300000);
  const Outcome installed = scene.install_ta("sp1", "sd1", taid("ta1"), image);
  ASSERT_TRUE(installed.passed());
  EXPECT_EQ(installed.reply.image, image);
  EXPECT_EQ(installed.reply.answer.size, 12 + installed.reply.response.size() + image.size());
  EXPECT_THAT(names_of(installed.response->members),
              ElementsAre("ver", "rid", "tid", "taid", "status", "content"));
  EXPECT_EQ(installed.response->content["sdname"], "");
  EXPECT_EQ(scene.device.record("SD_INFO_sd1"),
            R"({"name":"sd1","spid":"sp1","tsmid":"tsm1","talist":[{"taid":")" + taid("ta1") +
                R"(","taname":")" + taid("ta1") + R"("}]})");
  EXPECT_EQ(scene.device.record("TA_INFO_" + taid("ta1")),
            R"({"spid":"sp1","sdid":"sd1","taid":")" + taid("ta1") + R"(","ta_version":"1.0"})");
  EXPECT_EQ(scene.device.record("OTRP_TA_REGISTER_INFO"),
            word(1) + taid("ta1") + tsm::parse_image(image)->digest);
  expect_same_after_restart();
}

TEST_F(Life, UpdateTaReplacesImageAndVersionAndNothingElse) {
  ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
  ASSERT_TRUE(scene.install_ta("sp1", "sd1", taid("ta1")).passed());
  ASSERT_TRUE(scene.install_ta("sp1", "sd1", taid("ta2")).passed());
  const std::string sd_info = scene.device.record("SD_INFO_sd1").value();
  const std::string dsi = scene.dsi_text;
  const std::string image = make_image(2000, 7);
  const Outcome updated = scene.update_ta("sp1", "sd1", taid("ta1"), image);
  ASSERT_TRUE(updated.passed());
  EXPECT_EQ(updated.reply.image, image);
  EXPECT_EQ(scene.device.record("SD_INFO_sd1"), sd_info);
  EXPECT_EQ(scene.dsi_text, dsi);
  EXPECT_EQ(scene.device.record("TA_INFO_" + taid("ta1")),
            R"({"spid":"sp1","sdid":"sd1","taid":")" + taid("ta1") + R"(","ta_version":"2.0"})");
  const std::string rows = scene.device.record("OTRP_TA_REGISTER_INFO").value();
  EXPECT_EQ(rows.substr(0, 68), word(2) + taid("ta1") + tsm::parse_image(image)->digest);
  EXPECT_EQ(rows.substr(68, 32), taid("ta2"));

  // A record that got lost comes back.
  scene.device.host().remove_object(kAgentUuid, "TA_INFO_" + taid("ta1"));
  EXPECT_TRUE(scene.update_ta("sp1", "sd1", taid("ta1")).passed());
  EXPECT_TRUE(scene.device.record("TA_INFO_" + taid("ta1")));
}

TEST_F(Life, GetTaInfoIsSignedWithTheAikOfTheSpInTheRequest) {
  ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
  ASSERT_TRUE(scene.create_sd("sp2", "sd2").passed());
  ASSERT_TRUE(scene.install_ta("sp1", "sd1", taid("ta1")).passed());
  const Outcome info = scene.get_ta_info("sp1", taid("ta1"));
  ASSERT_TRUE(info.response);
  EXPECT_EQ(info.response->payload_text, R"({"TAInformationTBS":{"taid":")" + taid("ta1") +
                                             R"(","spid":"sp1","tsmid":"tsm1","ta_version":"1.0",)"
                                             R"("signercert":"certificate of sp1"}})");
  const Outcome other_sp = scene.get_ta_info("sp2", taid("ta1"));
  ASSERT_TRUE(other_sp.response);
  EXPECT_EQ(other_sp.response->members["signercert"], "certificate of sp2");
}

TEST_F(Life, UpdateSdRenewsTheAikOfAllSdsOfTheSp) {
  ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
  ASSERT_TRUE(scene.create_sd("sp2", "sd2").passed());
  const std::string old_aik = aik_of(scene, "sp1");
  ASSERT_TRUE(scene.update_sd("sp1", "sd1", false).passed());
  EXPECT_EQ(aik_of(scene, "sp1"), old_aik);

  const Outcome renewed = scene.update_sd("sp1", "sd1");
  ASSERT_TRUE(renewed.passed());
  EXPECT_EQ(renewed.response->content["teespaiktype"], "RSA");
  EXPECT_EQ(renewed.response->content["sdname"], "");
  EXPECT_NE(aik_of(scene, "sp1"), old_aik);
  EXPECT_EQ(scene.dsi["dsi"]["tee"]["teeaiklist"][1]["spid"], "sp1");
  EXPECT_THAT(*scene.device.record("SP_INFO_sp1"),
              testing::HasSubstr("renewed certificate of sp1"));
  const Outcome next = scene.create_sd("sp1", "sd3");
  EXPECT_EQ(next.response->content["teespaik"], renewed.response->content["teespaik"]);
  EXPECT_TRUE(scene.install_ta("sp1", "sd3", taid("ta1")).passed());

  scene.device.host().remove_object(kAgentUuid, "SP_INFO_sp2");
  EXPECT_TRUE(scene.update_sd("sp2", "sd2").passed());
  EXPECT_TRUE(scene.device.record("SP_INFO_sp2"));
}

TEST_F(Life, DeleteTaTakesTheLastTaIntoTheFreedPlace) {
  ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
  for (const char *name : {"ta1", "ta2", "ta3"}) {
    ASSERT_TRUE(scene.install_ta("sp1", "sd1", taid(name)).passed());
  }
  const Outcome deleted = scene.delete_ta("sd1", taid("ta1"));
  ASSERT_TRUE(deleted.passed());
  EXPECT_THAT(names_of(deleted.response->members),
              ElementsAre("ver", "rid", "tid", "taid", "status", "content"));
  const Json talist = Json::parse(*scene.device.record("SD_INFO_sd1"))["talist"];
  ASSERT_EQ(talist.size(), 2u);
  EXPECT_EQ(talist[0]["taid"], taid("ta3"));
  EXPECT_EQ(talist[1]["taid"], taid("ta2"));
  EXPECT_EQ(scene.dsi["dsi"]["tee"]["sdlist"]["sd"][0]["talist"], talist);
  EXPECT_FALSE(scene.device.record("TA_INFO_" + taid("ta1")));
  const std::string rows = scene.device.record("OTRP_TA_REGISTER_INFO").value();
  EXPECT_EQ(rows.substr(0, 4), word(2));
  EXPECT_EQ(rows.substr(4, 32), taid("ta2"));
  EXPECT_EQ(rows.substr(68, 32), taid("ta3"));
  expect_same_after_restart();
}

TEST_F(Life, ARefreshedSdMovesToTheEndUntilTheNextStart) {
  for (const char *name : {"A", "B", "D"}) ASSERT_TRUE(scene.create_sd("sp1", name).passed());
  ASSERT_TRUE(scene.install_ta("sp1", "A", taid("ta1")).passed());
  EXPECT_THAT(scene.sd_names(), ElementsAre("D", "B", "A"));
  const std::string before = scene.dsihash();
  ASSERT_TRUE(scene.device.restart());
  // The order is the stored list's again, and the hash of the old order is stale.
  EXPECT_EQ(scene.create_sd("sp1", "E").code(), 0xDEAD0001u);
  ASSERT_TRUE(scene.get_device_state().response);
  EXPECT_THAT(scene.sd_names(), ElementsAre("A", "B", "D"));
  EXPECT_NE(scene.dsihash(), before);
}

TEST_F(Life, DeleteSdTakesTheSpAlongWithItsLastSd) {
  for (const char *name : {"sd1", "sd2"}) ASSERT_TRUE(scene.create_sd("sp1", name).passed());
  ASSERT_TRUE(scene.create_sd("sp2", "sd3").passed());
  ASSERT_TRUE(scene.install_ta("sp1", "sd1", taid("ta1")).passed());
  ASSERT_TRUE(scene.install_ta("sp1", "sd2", taid("ta2")).passed());
  const std::string first_aik = aik_of(scene, "sp1");

  const Outcome deleted = scene.delete_sd("sd1", "false");
  ASSERT_TRUE(deleted.passed());
  EXPECT_THAT(names_of(deleted.response->members),
              ElementsAre("ver", "rid", "tid", "status", "content"));
  EXPECT_EQ(scene.device.record("SD_LIST_ID"), R"({"sd_list":["sd3","sd2"]})");
  EXPECT_FALSE(scene.device.record("SD_INFO_sd1"));
  EXPECT_TRUE(scene.device.record("SP_INFO_sp1"));
  EXPECT_TRUE(scene.device.record("TA_INFO_" + taid("ta1")));
  EXPECT_EQ(scene.get_ta_info("sp1", taid("ta1")).code(), 0xDEAD000Au);

  ASSERT_TRUE(scene.delete_sd("sd2", "true").passed());
  EXPECT_FALSE(scene.device.record("SP_INFO_sp1"));
  EXPECT_FALSE(scene.device.record("TA_INFO_" + taid("ta2")));
  EXPECT_FALSE(tsm::find_aik(scene.dsi, "sp1"));
  EXPECT_EQ(scene.device.record("OTRP_TA_REGISTER_INFO")->substr(0, 4), word(2));
  ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
  EXPECT_NE(aik_of(scene, "sp1"), first_aik);
  // The order of the AIKs is the stored SD list's after a restart.
  ASSERT_TRUE(scene.device.restart());
  ASSERT_TRUE(scene.get_device_state().response);
  EXPECT_THAT(scene.sd_names(), ElementsAre("sd3", "sd1"));
}

TEST_F(Life, AnImageThatDoesNotFitIsReportedWithTheSizeItNeeds) {
  ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
  const std::string image = make_image(5000);
  const tsm::RequestOptions options = {
      .spid = "sp1", .sdname = "sd1", .taid = taid("ta1"), .ta_version = "1", .image = image};
  // Every install of the same TA on the same state has the same length; take it from one.
  const Outcome whole = scene.run(MessageId::kInstallTa, options);
  ASSERT_TRUE(whole.passed());
  const size_t needed = whole.reply.answer.size;
  ASSERT_TRUE(scene.delete_ta("sd1", taid("ta1")).passed());
  const std::string again = scene.request(MessageId::kInstallTa, options);
  const Reply exact = scene.device.send(2, again, needed);
  EXPECT_EQ(exact.status, 0u);
  EXPECT_EQ(exact.image, image);

  ASSERT_TRUE(scene.get_device_state().response);
  ASSERT_TRUE(scene.delete_ta("sd1", taid("ta1")).passed());
  const Reply one_short =
      scene.device.send(2, scene.request(MessageId::kInstallTa, options), needed - 1);
  EXPECT_EQ(one_short.status, 0xDEAD1002u);
  EXPECT_EQ(one_short.answer.size, needed);
  EXPECT_FALSE(one_short.response.empty());
}

}  // namespace
}  // namespace otrp_test
