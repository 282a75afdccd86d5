// SPDX-License-Identifier: BSD-2-Clause
// Requests that a handler refuses: the code in "reason", which members the answer has, what the log
// says (log_rows.txt), and what is stored afterwards.
#include <gtest/gtest.h>

#include "support/log_rows.h"
#include "support/scene.h"

namespace otrp_test {
namespace {

constexpr uint32_t kBadParameters = TEEC_ERROR_BAD_PARAMETERS;
constexpr uint32_t kNoData = TEEC_ERROR_NO_DATA;
constexpr uint32_t kNoItem = TEEC_ERROR_ITEM_NOT_FOUND;

constexpr auto kContent = &Edits::content;
constexpr auto kTbs = &Edits::tbs;
constexpr auto kEnvelope = &Edits::envelope;

constexpr bool kWithIds = true;
constexpr bool kWithoutIds = false;

const MessageId kCreate = MessageId::kCreateSd;
const MessageId kUpdate = MessageId::kUpdateSd;
const MessageId kDelete = MessageId::kDeleteSd;
const MessageId kInstall = MessageId::kInstallTa;
const MessageId kUpdateTa = MessageId::kUpdateTa;
const MessageId kDeleteTa = MessageId::kDeleteTa;

struct RefusalCase {
  const char *name;
  MessageId id;
  Edit Edits::*part;
  Json patch;  // to a request that would pass
  uint32_t code;
  bool has_ids;
  std::string taid = {};  // in place of the request's own
};

const std::string kStaleHash(64, '0');
const std::string kTooLong(57, 'x');  // for the ID of a record
const Json kNoObject = Json::array({1});
const Json kGarbledContent = {{"content", {{"ciphertext", "AAAA"}}}};
const Json kSpoiledCert = {{"changes", {{"spcert", "\2"}}}};
const Json kSdOfAnotherSp = {{"spid", "sp2"}, {"sdname", "sd3"}};
const Json kBadSignature2 = {{"signature2", std::string(342, 'A')}};

Json image_with(const char *member, const char *value) {
  return {{"encrypted_ta", {{member, value}}}};
}

const RefusalCase kRefusals[] = {
    {"CreateStaleHash", kCreate, kTbs, {{"dsihash", kStaleHash}}, kMismatch, kWithIds},
    {"CreateNoHash", kCreate, kTbs, {{"dsihash", nullptr}}, kMismatch, kWithIds},
    {"CreateNoRid", kCreate, kTbs, {{"rid", nullptr}}, kBadRequest, kWithoutIds},
    {"CreateNoContent", kCreate, kTbs, {{"content", nullptr}}, kBadRequest, kWithIds},
    {"CreateContentIsText", kCreate, kTbs, {{"content", "text"}}, kBadRequest, kWithIds},
    {"CreateGarbledContent", kCreate, kTbs, kGarbledContent, kBadRequest, kWithIds},
    {"CreateContentIsAnArray", kCreate, kContent, kNoObject, kMissing, kWithIds},
    {"CreateSameName", kCreate, kContent, {{"sdname", "sd1"}}, kSdExists, kWithIds},
    {"CreateNoName", kCreate, kContent, {{"sdname", nullptr}}, kMissing, kWithIds},
    {"CreateNoSp", kCreate, kContent, {{"spid", nullptr}}, kNoData, kWithIds},
    {"CreateEmptySp", kCreate, kContent, {{"spid", ""}}, kMissing, kWithIds},
    {"CreateSpIdTooLong", kCreate, kContent, {{"spid", kTooLong}}, kBadParameters, kWithIds},
    {"CreateControlCharacterInName", kCreate, kContent, {{"sdname", "\1"}}, kNoMemory, kWithIds},
    {"CreateControlCharacterInCert", kCreate, kContent, {{"spcert", "\1"}}, kNoMemory, kWithIds},
    {"CreateNoCertForANewSp", kCreate, kContent, {{"spcert", nullptr}}, kSetterFailed, kWithIds},

    {"UpdateSdStaleHash", kUpdate, kTbs, {{"dsihash", kStaleHash}}, kMismatch, kWithoutIds},
    {"UpdateSdNoRid", kUpdate, kTbs, {{"rid", nullptr}}, kBadRequest, kWithoutIds},
    {"UpdateSdContentIsText", kUpdate, kTbs, {{"content", "text"}}, kNoMemory, kWithoutIds},
    {"UpdateSdGarbledContent", kUpdate, kTbs, kGarbledContent, kBadRequest, kWithoutIds},
    {"UpdateSdContentIsAnArray", kUpdate, kContent, kNoObject, kNoMemory, kWithoutIds},
    {"UpdateSdNoChanges", kUpdate, kContent, {{"changes", nullptr}}, kBadRequest, kWithoutIds},
    {"UpdateSdUnknownSd", kUpdate, kContent, {{"sdname", "sd9"}}, kNotFound, kWithIds},
    {"UpdateSdOtherSp", kUpdate, kContent, {{"spid", "sp2"}}, kSdMismatch, kWithIds},
    {"UpdateSdOtherTsm", kUpdate, kContent, {{"tsmid", "tsm2"}}, kSdMismatch, kWithIds},
    {"UpdateSdControlCharacterInCert", kUpdate, kContent, kSpoiledCert, kNoMemory, kWithIds},

    {"DeleteSdStaleHash", kDelete, kTbs, {{"dsihash", kStaleHash}}, kMismatch, kWithIds},
    {"DeleteSdNoContent", kDelete, kTbs, {{"content", nullptr}}, kBadRequest, kWithIds},
    {"DeleteSdGarbledContent", kDelete, kTbs, kGarbledContent, kBadRequest, kWithIds},
    {"DeleteSdNotListed", kDelete, kContent, {{"sdname", "sd9"}}, kResponseFailed, kWithIds},
    {"DeleteSdOtherTsm", kDelete, kContent, {{"tsmid", "tsm2"}}, kMismatch, kWithIds},
    {"DeleteSdNoTsm", kDelete, kContent, {{"tsmid", nullptr}}, kMismatch, kWithIds},
    {"DeleteSdFlagInTitleCase", kDelete, kContent, {{"deleteta", "True"}}, kBadRequest, kWithIds},
    {"DeleteSdNoFlag", kDelete, kContent, {{"deleteta", nullptr}}, kBadRequest, kWithIds},

    {"InstallStaleHash", kInstall, kTbs, {{"dsihash", kStaleHash}}, kMismatch, kWithIds},
    {"InstallNoRid", kInstall, kTbs, {{"rid", nullptr}}, kBadRequest, kWithoutIds},
    {"InstallNoImage", kInstall, kTbs, {{"encrypted_ta", nullptr}}, kNoMemory, kWithIds},
    {"InstallContentIsText", kInstall, kTbs, {{"content", "text"}}, kNoMemory, kWithIds},
    {"InstallContentIsAnArray", kInstall, kContent, kNoObject, kNoMemory, kWithIds},
    {"InstallGarbledContent", kInstall, kTbs, kGarbledContent, kBadRequest, kWithIds},
    {"InstallOtherTransaction", kInstall, kTbs, {{"tid", "another"}}, kCaCheckFailed, kWithIds},
    {"InstallKeyNotBase64", kInstall, kTbs, image_with("key", "!"), kNotDecrypted, kWithIds},
    {"InstallPartOfABlock", kInstall, kTbs, image_with("ciphertadata", "AAAA"), kNotDecrypted,
     kWithIds},
    {"InstallNoSignature2", kInstall, kEnvelope, {{"signature2", nullptr}}, kNoMemory, kWithIds},
    {"InstallOtherTa", kInstall, kContent, {{"taid", taid("ta9")}}, kCaCheckFailed, kWithIds},
    {"InstallNoTaid", kInstall, kContent, {{"taid", nullptr}}, kMissing, kWithIds},
    {"InstallNoVersion", kInstall, kContent, {{"ta_version", nullptr}}, kMissing, kWithIds},
    {"InstallControlCharacter", kInstall, kContent, {{"ta_version", "\3"}}, kNoMemory, kWithIds},
    {"InstallUnknownSp", kInstall, kContent, {{"spid", "sp9"}}, kNotDecrypted, kWithIds},
    {"InstallKeyOfAnotherSp", kInstall, kContent, kSdOfAnotherSp, kNotDecrypted, kWithIds},
    {"InstallUnknownSd", kInstall, kContent, {{"sdname", "sd9"}}, kNotFound, kWithIds},
    {"InstallTwice", kInstall, kContent, {{"sdname", "sd1"}}, kTaExists, kWithIds, taid("ta1")},
    {"InstallTaidTooLong", kInstall, kTbs, {}, kBadParameters, kWithIds, kTooLong},

    {"UpdateTaStaleHash", kUpdateTa, kTbs, {{"dsihash", kStaleHash}}, kMismatch, kWithoutIds},
    {"UpdateTaNoRid", kUpdateTa, kTbs, {{"rid", nullptr}}, kBadRequest, kWithoutIds},
    {"UpdateTaContentIsText", kUpdateTa, kTbs, {{"content", "text"}}, kNoMemory, kWithoutIds},
    {"UpdateTaContentIsAnArray", kUpdateTa, kContent, kNoObject, kNoMemory, kWithoutIds},
    {"UpdateTaNoImage", kUpdateTa, kTbs, {{"encrypted_ta", nullptr}}, kNoMemory, kWithoutIds},
    {"UpdateTaBadSignature2", kUpdateTa, kEnvelope, kBadSignature2, kCaCheckFailed, kWithoutIds},
    {"UpdateTaNotListed", kUpdateTa, kTbs, {}, kNotFound, kWithIds, taid("ta9")},

    {"DeleteTaStaleHash", kDeleteTa, kTbs, {{"dsihash", kStaleHash}}, kMismatch, kWithoutIds},
    {"DeleteTaNoContent", kDeleteTa, kTbs, {{"content", nullptr}}, kBadRequest, kWithoutIds},
    {"DeleteTaGarbledContent", kDeleteTa, kTbs, kGarbledContent, kBadRequest, kWithoutIds},
    {"DeleteTaContentIsAnArray", kDeleteTa, kContent, kNoObject, kMissing, kWithoutIds},
    {"DeleteTaOtherTsm", kDeleteTa, kContent, {{"tsmid", "tsm2"}}, kMismatch, kWithoutIds},
    {"DeleteTaUnknownSd", kDeleteTa, kContent, {{"sdname", "sd9"}}, kNotFound, kWithoutIds},
    {"DeleteTaNoTaid", kDeleteTa, kContent, {{"taid", nullptr}}, kMissing, kWithoutIds},
    {"DeleteTaWithoutRecord", kDeleteTa, kContent, {{"taid", taid("ta9")}}, kNoItem, kWithoutIds},
    {"DeleteTaTooLong", kDeleteTa, kContent, {{"taid", kTooLong}}, kBadParameters, kWithoutIds},
};

class Refusals : public testing::Test {
 protected:
  void SetUp() override { scene.furnish(); }
  void TearDown() override { scene.device.expect_clean(); }

  tee::test::TraceSink log;
  const LogRows log_rows = read_log_rows();
  Scene scene;
};

void expect_refusal(const RefusalCase &c, const Outcome &outcome) {
  EXPECT_EQ(outcome.code(), c.code);
  EXPECT_FALSE(outcome.reply.image);
  ASSERT_TRUE(outcome.response);
  const Json &members = outcome.response->members;
  ASSERT_EQ(outcome.response->status, "fail");
  EXPECT_EQ(members["reason"]["error_message"], "");
  EXPECT_EQ(members.contains("rid"), c.has_ids);
  EXPECT_EQ(members.contains("tid"), c.has_ids);
  EXPECT_FALSE(members.contains("content"));
}

TEST_F(Refusals, SayWhyAndChangeNothing) {
  ASSERT_TRUE(scene.device.restart());
  ASSERT_TRUE(scene.get_device_state().passed());
  const Snapshot snapshot = scene.device.snapshot();
  for (const RefusalCase &c : kRefusals) {
    SCOPED_TRACE(c.name);
    Scene device(scene, snapshot);
    ASSERT_TRUE(device.device.open());
    tsm::RequestOptions options = usual(c.id);
    if (!c.taid.empty()) options.taid = c.taid;
    Edits edits;
    if (!c.patch.is_null()) edits.*c.part = patch(c.patch);
    log.clear();
    expect_refusal(c, device.run(c.id, options, edits));
    EXPECT_EQ(said(log), row_of(log_rows, c.name));
    EXPECT_EQ(device.device.objects(), snapshot.agent);
    device.device.expect_clean();
    ASSERT_TRUE(device.get_device_state().passed());
    EXPECT_EQ(device.dsi_text, scene.dsi_text);
    EXPECT_TRUE(device.run(c.id, usual(c.id)).passed());
  }
}

// ---- What is reported after records were written

TEST_F(Refusals, WhatTheRegisterDoesNotTakeIsHandedOverAndRecorded) {
  const std::string rows = scene.device.record("OTRP_TA_REGISTER_INFO").value();
  const std::pair<std::string, std::string> cases[] = {
      {"short", make_image(1)}, {taid("ta3"), "x"}, {taid("ta4"), std::string(51, 'x')}};
  for (const auto &[ta, image] : cases) {
    SCOPED_TRACE(ta);
    const Outcome outcome = scene.install_ta("sp1", "sd1", ta, image);
    EXPECT_EQ(outcome.code(), kMissing);
    EXPECT_EQ(outcome.reply.image, image);
    EXPECT_EQ(outcome.response->members["taid"], ta);
    EXPECT_TRUE(scene.device.record("TA_INFO_" + ta));
    EXPECT_EQ(scene.device.record("OTRP_TA_REGISTER_INFO"), rows);
    ASSERT_TRUE(scene.get_device_state().passed());
  }
}

TEST_F(Refusals, ARecordThatGotLostComesBackWithAnUpdate) {
  for (const std::string &id : {std::string("SP_INFO_sp1"), "TA_INFO_" + taid("ta1")}) {
    scene.device.remove_record(id);
    EXPECT_TRUE(scene.update_sd("sp1", "sd1").passed());
    EXPECT_TRUE(scene.update_ta("sp1", "sd1", taid("ta1")).passed());
    EXPECT_TRUE(scene.device.record(id)) << id;
  }
}

TEST_F(Refusals, AContentForAnUnknownTsmIsCarriedOutAndNotAnswered) {
  const Outcome outcome =
      scene.run(kCreate, usual(kCreate), {.content = patch({{"tsmid", "nobody"}})});
  EXPECT_FALSE(outcome.response);
  EXPECT_EQ(outcome.code(), kNoItem);
  EXPECT_TRUE(scene.device.record("SD_INFO_sd4"));
}

// ---- What is not signed

TEST_F(Refusals, AQueryThatNamesNoTaIsNotFound) {
  log.clear();
  EXPECT_EQ(scene.device.invoke(1, word(0) + word(2) + "{}", 57).result, kNotFound);
  EXPECT_EQ(said(log), row_of(log_rows, "QueryNoTaid"));
}

TEST_F(Refusals, GetTaInfoHasNoResponseThen) {
  const auto asked = [](const char *spid, const std::string &ta) {
    return tsm::ta_info_request(spid, ta).dump();
  };
  const struct {
    std::string message;
    std::string ta_record;
    uint32_t status;
  } cases[] = {
      {R"({"Other":{}})", "{}", kBadRequest},
      {R"({"GetTAInfoRequest":{"spid":"sp1"}})", "{}", kNoMemory},
      {asked("sp1", "other"), "{}", kNotFound},
      {asked("sp1", taid("ta1")), "{}", kTaInfoIncomplete},
      {asked("sp1", taid("ta1")), R"({"sdid":"sd1"})", kTaInfoIncomplete},
      {asked("sp1", taid("ta1")), R"({"sdid":"sd9","ta_version":"1"})", kNotFound},
      {asked("sp9", taid("ta1")), R"({"sdid":"sd1","ta_version":"1"})", kSpNotFound},
  };
  for (const auto &c : cases) {
    SCOPED_TRACE(c.message + c.ta_record);
    scene.device.put_record("TA_INFO_" + taid("ta1"), c.ta_record);
    const Reply reply = scene.device.send(8, c.message);
    EXPECT_EQ(reply.status, c.status);
    EXPECT_TRUE(reply.response.empty());
    scene.device.expect_clean();
  }
}

}  // namespace
}  // namespace otrp_test
