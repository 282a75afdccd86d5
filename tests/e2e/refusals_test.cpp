// SPDX-License-Identifier: BSD-2-Clause
// Requests that a handler refuses: the code in "reason", which members the answer has, and what is
// stored afterwards.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/scene.h"
#include "tsm/jwe.h"
#include "tsm/trust.h"

namespace otrp_test {
namespace {

using Options = tsm::RequestOptions;

constexpr uint32_t kMismatch = 0xDEAD0001;
constexpr uint32_t kSdExists = 0xDEAD0002;
constexpr uint32_t kSdMismatch = 0xDEAD0004;
constexpr uint32_t kBadRequest = 0xDEAD0006;
constexpr uint32_t kNotDecrypted = 0xDEAD0007;
constexpr uint32_t kTaExists = 0xDEAD0008;
constexpr uint32_t kNotFound = 0xDEAD000A;
constexpr uint32_t kBroken = 0xDEAD000E;
constexpr uint32_t kCaCheckFailed = 0xDEAD0010;
constexpr uint32_t kNoMemory = 0xDEAD1002;
constexpr uint32_t kMissing = 0xDEAD1004;
constexpr uint32_t kSetterFailed = 0xFFFFFFFF;

constexpr bool kWithIds = true;
constexpr bool kWithoutIds = false;

constexpr auto kStaleHash = "bbdc1d13e56fe3b3d81a742a6f9de14c813b002661c90f39cfe1bfd324bea9e5";

struct RefusalCase {
  const char *name;
  MessageId id;
  std::function<void(Options &)> options;
  Edits edits;
  uint32_t code;
  bool has_ids;
};

std::ostream &operator<<(std::ostream &out, const RefusalCase &c) {
  return out << c.name;
}

std::function<void(Options &)> as_it_is() {
  return [](Options &) {};
}

Edits content(std::function<void(Json &)> edit) {
  return {.content = std::move(edit)};
}

Edits without(const char *member) {
  return content([member](Json &json) { json.erase(member); });
}

Edits tbs(std::function<void(Json &)> edit) {
  return {.tbs = [edit](Json &json) { edit(*json.begin()); }};
}

Edits tbs_without(const char *member) {
  return tbs([member](Json &json) { json.erase(member); });
}

Edits extra(std::function<void(Json &)> edit) {
  return {.extra = std::move(edit)};
}

Json garbled(const Json &jwe, const char *member) {
  Json changed = jwe;
  std::string text = changed[member];
  text[text.size() / 2] = text[text.size() / 2] == 'A' ? 'B' : 'A';
  changed[member] = text;
  return changed;
}

Edits garbled_content() {
  return tbs([](Json &json) { json["content"] = garbled(json["content"], "ciphertext"); });
}

const MessageId kCreate = MessageId::kCreateSd;
const MessageId kUpdate = MessageId::kUpdateSd;
const MessageId kDelete = MessageId::kDeleteSd;
const MessageId kInstall = MessageId::kInstallTa;
const MessageId kUpdateTa = MessageId::kUpdateTa;
const MessageId kDeleteTa = MessageId::kDeleteTa;

// The scene has sp1 with sd1, which holds ta1, and sp2 with sd2; tsm1 manages both.
const RefusalCase kRefusals[] = {
    {"CreateStaleHash",
     kCreate,
     [](Options &o) { o.dsihash = kStaleHash; },
     {},
     kMismatch,
     kWithIds},
    {"CreateUpperCaseHash", kCreate, as_it_is(), tbs([](Json &json) {
       std::string hash = json["dsihash"];
       for (char &c : hash) c = static_cast<char>(toupper(c));
       json["dsihash"] = hash;
     }),
     kMismatch, kWithIds},
    {"CreateNoHash", kCreate, as_it_is(), tbs_without("dsihash"), kMismatch, kWithIds},
    {"CreateNoRid", kCreate, as_it_is(), tbs_without("rid"), kBadRequest, kWithoutIds},
    {"CreateGarbledContent", kCreate, as_it_is(), garbled_content(), kBadRequest, kWithIds},
    {"CreateNoContent", kCreate, as_it_is(), tbs_without("content"), kBadRequest, kWithIds},
    {"CreateContentIsAnArray", kCreate, as_it_is(),
     content([](Json &json) { json = Json::array({1}); }), kMissing, kWithIds},
    {"CreateSameName", kCreate, [](Options &o) { o.sdname = "sd1"; }, {}, kSdExists, kWithIds},
    {"CreateNoName", kCreate, as_it_is(), without("sdname"), kMissing, kWithIds},
    {"CreateNoSp", kCreate, as_it_is(), without("spid"), TEEC_ERROR_NO_DATA, kWithIds},
    {"CreateEmptySp", kCreate, as_it_is(), content([](Json &json) { json["spid"] = ""; }), kMissing,
     kWithIds},
    {"CreateNumberAsSp", kCreate, as_it_is(), content([](Json &json) { json["spid"] = 5; }),
     TEEC_ERROR_NO_DATA, kWithIds},
    {"CreateControlCharacterInName", kCreate, as_it_is(),
     content([](Json &json) { json["sdname"] = "sd\x01"; }), kNoMemory, kWithIds},
    {"CreateControlCharacterInCert", kCreate, as_it_is(),
     content([](Json &json) { json["spcert"] = "cert\x1f"; }), kNoMemory, kWithIds},
    {"CreateNoCertForANewSp", kCreate, as_it_is(), without("spcert"), kSetterFailed, kWithIds},
    {"CreateSpIdTooLong",
     kCreate,
     [](Options &o) { o.spid = std::string(57, 's'); },
     {},
     TEEC_ERROR_BAD_PARAMETERS,
     kWithIds},

    {"UpdateSdStaleHash",
     kUpdate,
     [](Options &o) { o.dsihash = kStaleHash; },
     {},
     kMismatch,
     kWithoutIds},
    {"UpdateSdUnknownSd", kUpdate, [](Options &o) { o.sdname = "sd9"; }, {}, kNotFound, kWithIds},
    {"UpdateSdOtherSp", kUpdate, [](Options &o) { o.spid = "sp2"; }, {}, kSdMismatch, kWithIds},
    {"UpdateSdOtherTsm", kUpdate, as_it_is(), content([](Json &json) { json["tsmid"] = "tsm2"; }),
     kSdMismatch, kWithIds},
    {"UpdateSdNoChanges", kUpdate, as_it_is(), without("changes"), kBadRequest, kWithoutIds},
    {"UpdateSdContentUnreadable", kUpdate, as_it_is(),
     tbs([](Json &json) { json["content"] = "text"; }), kNoMemory, kWithoutIds},
    {"UpdateSdGarbledContent", kUpdate, as_it_is(), garbled_content(), kBadRequest, kWithoutIds},
    {"UpdateSdContentIsAnArray", kUpdate, as_it_is(),
     content([](Json &json) { json = Json::array({1}); }), kNoMemory, kWithoutIds},
    {"UpdateSdControlCharacterInCert", kUpdate, as_it_is(),
     content([](Json &json) { json["changes"]["spcert"] = "cert\x02"; }), kNoMemory, kWithIds},

    {"DeleteSdStaleHash",
     kDelete,
     [](Options &o) { o.dsihash = kStaleHash; },
     {},
     kMismatch,
     kWithIds},
    {"DeleteSdNotListed", kDelete, [](Options &o) { o.sdname = "sd9"; }, {}, kBroken, kWithIds},
    {"DeleteSdNoName", kDelete, as_it_is(), without("sdname"), kBroken, kWithIds},
    {"DeleteSdOtherTsm", kDelete, as_it_is(), content([](Json &json) { json["tsmid"] = "tsm2"; }),
     kMismatch, kWithIds},
    {"DeleteSdNoTsm", kDelete, as_it_is(), without("tsmid"), kMismatch, kWithIds},
    {"DeleteSdFlagInTitleCase",
     kDelete,
     [](Options &o) { o.deleteta = "True"; },
     {},
     kBadRequest,
     kWithIds},
    {"DeleteSdNoFlag", kDelete, as_it_is(), without("deleteta"), kBadRequest, kWithIds},
    {"DeleteSdGarbledContent", kDelete, as_it_is(), garbled_content(), kBadRequest, kWithIds},

    {"InstallStaleHash",
     kInstall,
     [](Options &o) { o.dsihash = kStaleHash; },
     {},
     kMismatch,
     kWithIds},
    {"InstallNoImage", kInstall, as_it_is(), tbs_without("encrypted_ta"), kNoMemory, kWithIds},
    {"InstallContentUnreadable", kInstall, as_it_is(),
     tbs([](Json &json) { json["content"] = "text"; }), kNoMemory, kWithIds},
    {"InstallGarbledContent", kInstall, as_it_is(), garbled_content(), kBadRequest, kWithIds},
    {"InstallNoTaid", kInstall, as_it_is(), without("taid"), kMissing, kWithIds},
    {"InstallNoSignature2", kInstall, as_it_is(),
     extra([](Json &json) { json.erase("signature2"); }), kNoMemory, kWithIds},
    {"InstallSignature2OfAnotherTa", kInstall, as_it_is(),
     content([](Json &json) { json["taid"] = taid("other"); }), kCaCheckFailed, kWithIds},
    {"InstallSignature2OfAnotherTransaction", kInstall, as_it_is(),
     tbs([](Json &json) { json["tid"] = "another"; }), kCaCheckFailed, kWithIds},
    {"InstallKeyOfAnotherSp", kInstall, [](Options &o) { o.sdname = "sd2"; },
     content([](Json &json) { json["spid"] = "sp2"; }), kNotDecrypted, kWithIds},
    {"InstallKeyNotBase64", kInstall, as_it_is(),
     tbs([](Json &json) { json["encrypted_ta"]["key"] = "!"; }), kNotDecrypted, kWithIds},
    {"InstallIvOneByte", kInstall, as_it_is(),
     tbs([](Json &json) { json["encrypted_ta"]["iv"] = "AA"; }), kNotDecrypted, kWithIds},
    {"InstallPartOfABlock", kInstall, as_it_is(), tbs([](Json &json) {
       std::string text = json["encrypted_ta"]["ciphertadata"];
       json["encrypted_ta"]["ciphertadata"] = text.substr(0, text.size() - 4);
     }),
     kNotDecrypted, kWithIds},
    {"InstallUnknownSp", kInstall, [](Options &o) { o.spid = "sp9"; }, {}, kNotDecrypted, kWithIds},
    {"InstallUnknownSd", kInstall, [](Options &o) { o.sdname = "sd9"; }, {}, kNotFound, kWithIds},
    {"InstallTwice", kInstall, [](Options &o) { o.taid = taid("ta1"); }, {}, kTaExists, kWithIds},
    {"InstallNoVersion", kInstall, as_it_is(), without("ta_version"), kMissing, kWithIds},
    {"InstallControlCharacterInVersion", kInstall, as_it_is(),
     content([](Json &json) { json["ta_version"] = "1\x1e"; }), kNoMemory, kWithIds},

    {"InstallTaidTooLongForARecord",
     kInstall,
     [](Options &o) { o.taid = std::string(57, 'a'); },
     {},
     TEEC_ERROR_BAD_PARAMETERS,
     kWithIds},

    {"UpdateTaStaleHash",
     kUpdateTa,
     [](Options &o) { o.dsihash = kStaleHash; },
     {},
     kMismatch,
     kWithoutIds},
    {"UpdateTaNotListed",
     kUpdateTa,
     [](Options &o) { o.taid = taid("ta9"); },
     {},
     kNotFound,
     kWithIds},
    {"UpdateTaBadSignature2", kUpdateTa, as_it_is(),
     extra([](Json &json) { json["signature2"] = std::string(342, 'A'); }), kCaCheckFailed,
     kWithoutIds},
    {"UpdateTaNoImage", kUpdateTa, as_it_is(), tbs_without("encrypted_ta"), kNoMemory, kWithoutIds},
    {"UpdateTaKeyNotBase64", kUpdateTa, as_it_is(),
     tbs([](Json &json) { json["encrypted_ta"]["key"] = "!"; }), kNotDecrypted, kWithoutIds},

    {"DeleteTaStaleHash",
     kDeleteTa,
     [](Options &o) { o.dsihash = kStaleHash; },
     {},
     kMismatch,
     kWithoutIds},
    {"DeleteTaOtherTsm", kDeleteTa, as_it_is(), content([](Json &json) { json["tsmid"] = "tsm2"; }),
     kMismatch, kWithoutIds},
    {"DeleteTaUnknownSd",
     kDeleteTa,
     [](Options &o) { o.sdname = "sd9"; },
     {},
     kNotFound,
     kWithoutIds},
    {"DeleteTaNoTaid", kDeleteTa, as_it_is(), without("taid"), kMissing, kWithoutIds},
    {"DeleteTaGarbledContent", kDeleteTa, as_it_is(), garbled_content(), kBadRequest, kWithoutIds},
    {"DeleteTaWithoutRecord",
     kDeleteTa,
     [](Options &o) { o.taid = taid("ta9"); },
     {},
     TEEC_ERROR_ITEM_NOT_FOUND,
     kWithoutIds},
    {"DeleteTaTooLongForARecord",
     kDeleteTa,
     [](Options &o) { o.taid = std::string(57, 'a'); },
     {},
     TEEC_ERROR_BAD_PARAMETERS,
     kWithoutIds},
};

class Refusal : public testing::TestWithParam<RefusalCase> {};

// Options under which the message would pass.
Options good_options(MessageId id) {
  switch (id) {
    case MessageId::kCreateSd:
      return {.spid = "sp3", .sdname = "sd3", .spcert = "cert"};
    case MessageId::kUpdateSd:
      return {.spid = "sp1", .sdname = "sd1", .spcert = "cert", .renew_aik = true};
    case MessageId::kDeleteSd:
      return {.sdname = "sd1", .deleteta = "true"};
    case MessageId::kDeleteTa:
      return {.sdname = "sd1", .taid = taid("ta1")};
    default:
      break;
  }
  const std::string ta = id == MessageId::kInstallTa ? "ta2" : "ta1";
  return {.spid = "sp1",
          .sdname = "sd1",
          .taid = taid(ta),
          .ta_version = "2",
          .image = make_image(100)};
}

TEST_P(Refusal, SaysWhyAndChangesNothing) {
  Scene scene;
  ASSERT_TRUE(scene.get_device_state().response);
  ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
  ASSERT_TRUE(scene.create_sd("sp2", "sd2").passed());
  ASSERT_TRUE(scene.install_ta("sp1", "sd1", taid("ta1")).passed());
  const auto stored = scene.device.objects();
  const std::string dsi = scene.dsi_text;

  tee::test::TraceSink log;
  Options options = good_options(GetParam().id);
  GetParam().options(options);
  const Outcome outcome = scene.run(GetParam().id, options, GetParam().edits);
  ASSERT_TRUE(outcome.response) << std::hex << outcome.code();
  EXPECT_EQ(outcome.response->status, "fail");
  EXPECT_EQ(outcome.code(), GetParam().code);
  EXPECT_EQ(outcome.response->members["reason"]["error_message"], "");
  for (const char *id : {"rid", "tid"}) {
    EXPECT_EQ(outcome.response->members.contains(id), GetParam().has_ids) << id;
  }
  EXPECT_FALSE(outcome.response->members.contains("content"));
  EXPECT_FALSE(outcome.reply.image);
  EXPECT_EQ(scene.device.objects(), stored);
  scene.device.expect_clean();
  ASSERT_TRUE(scene.get_device_state().response);
  EXPECT_EQ(scene.dsi_text, dsi);

  ASSERT_TRUE(scene.device.restart());
  EXPECT_TRUE(scene.get_device_state().response);
  EXPECT_TRUE(scene.run(GetParam().id, good_options(GetParam().id)).passed());
}

INSTANTIATE_TEST_SUITE_P(All, Refusal, testing::ValuesIn(kRefusals),
                         [](const auto &row) { return std::string(row.param.name); });

// ---- What is reported after records were written

class HalfDone : public testing::Test {
 protected:
  void SetUp() override {
    ASSERT_TRUE(scene.get_device_state().response);
    ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
    ASSERT_TRUE(scene.create_sd("sp1", "sd2").passed());
  }
  void TearDown() override { scene.device.expect_clean(); }

  Scene scene;
};

TEST_F(HalfDone, ATaOfAnotherSdIsRecordedButNotRegistered) {
  ASSERT_TRUE(scene.install_ta("sp1", "sd1", taid("ta1")).passed());
  const std::string image = make_image(64, 5);
  const Outcome outcome = scene.install_ta("sp1", "sd2", taid("ta1"), image);
  EXPECT_EQ(outcome.code(), kTaExists);
  EXPECT_EQ(outcome.reply.image, image);
  EXPECT_THAT(*scene.device.record("SD_INFO_sd2"), testing::HasSubstr(taid("ta1")));
}

TEST_F(HalfDone, AnIdThatTheRegisterDoesNotTakeIsRecorded) {
  const Outcome outcome = scene.install_ta("sp1", "sd1", "short");
  EXPECT_EQ(outcome.code(), kMissing);
  EXPECT_TRUE(outcome.reply.image);
  EXPECT_EQ(outcome.response->members["taid"], "short");
  EXPECT_TRUE(scene.device.record("TA_INFO_short"));
  EXPECT_FALSE(scene.device.record("OTRP_TA_REGISTER_INFO"));
}

TEST_F(HalfDone, ImagesWithoutAHeaderAreHandedOverButNotRegistered) {
  for (const size_t len : {1u, 51u}) {
    const Outcome outcome =
        scene.install_ta("sp1", "sd1", taid("ta" + std::to_string(len)), std::string(len, 'x'));
    EXPECT_EQ(outcome.code(), kMissing);
    EXPECT_EQ(outcome.reply.image, std::string(len, 'x'));
    ASSERT_TRUE(scene.get_device_state().response);
  }
}

TEST_F(HalfDone, ATaThatTheRegisterForgotIsUpdatedAndDeletedAllTheSame) {
  ASSERT_TRUE(scene.install_ta("sp1", "sd1", taid("ta1")).passed());
  scene.device.put_record("OTRP_TA_REGISTER_INFO", word(0));
  const Outcome updated = scene.update_ta("sp1", "sd1", taid("ta1"));
  EXPECT_EQ(updated.code(), kNotFound);
  EXPECT_TRUE(updated.reply.image);
  EXPECT_THAT(*scene.device.record("TA_INFO_" + taid("ta1")), testing::HasSubstr("2.0"));
  const Outcome deleted = scene.delete_ta("sd1", taid("ta1"));
  EXPECT_EQ(deleted.code(), kNotFound);
  EXPECT_EQ(deleted.response->members["taid"], taid("ta1"));
  EXPECT_FALSE(scene.device.record("TA_INFO_" + taid("ta1")));
}

TEST_F(HalfDone, ACountThatTheRegisterCannotHoldIsNotBelieved) {
  for (const uint32_t count : {1u, 0x04000000u, 0xFFFFFFFFu}) {
    scene.device.put_record("OTRP_TA_REGISTER_INFO", word(count));
    const std::string ta = taid("ta" + std::to_string(count & 0xFF));
    EXPECT_EQ(scene.install_ta("sp1", "sd1", ta).code(), TEEC_ERROR_BAD_FORMAT);
    EXPECT_EQ(scene.device.record("OTRP_TA_REGISTER_INFO"), word(count));
    ASSERT_TRUE(scene.get_device_state().response);
  }
}

TEST_F(HalfDone, AContentForAnUnknownTsmIsCarriedOutAndNotAnswered) {
  Edits edits = content([](Json &json) { json["tsmid"] = "nobody"; });
  const Outcome outcome =
      scene.run(MessageId::kCreateSd, {.spid = "sp1", .sdname = "sd3", .spcert = "cert"}, edits);
  EXPECT_FALSE(outcome.response);
  EXPECT_EQ(outcome.code(), TEEC_ERROR_ITEM_NOT_FOUND);
  EXPECT_TRUE(scene.device.record("SD_INFO_sd3"));
}

// ---- The one message without a signature

TEST(GetTaInfo, RefusalsHaveNoResponse) {
  Scene scene;
  ASSERT_TRUE(scene.get_device_state().response);
  ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
  ASSERT_TRUE(scene.install_ta("sp1", "sd1", taid("ta1")).passed());
  const std::string record = "TA_INFO_" + taid("ta1");
  const struct {
    std::string message;
    std::string ta_record;
    uint32_t status;
  } cases[] = {
      {R"({"GetTAInfoRequest":{"spid":"sp1","taid":"other"}})", "{}", kNotFound},
      {R"({"GetTAInfoRequest":{"spid":"sp1"}})", "{}", kNoMemory},
      {R"({"Other":{}})", "{}", kBadRequest},
      {tsm::ta_info_request("sp1", taid("ta1")).dump(), "{}", 0xDEAD1001},
      {tsm::ta_info_request("sp1", taid("ta1")).dump(), R"({"sdid":"sd1"})", 0xDEAD1001},
      {tsm::ta_info_request("sp1", taid("ta1")).dump(), R"({"sdid":"sd9","ta_version":"1"})",
       kNotFound},
      {tsm::ta_info_request("sp9", taid("ta1")).dump(), R"({"sdid":"sd1","ta_version":"1"})",
       0xDEAD1005},
  };
  for (const auto &c : cases) {
    scene.device.put_record(record, c.ta_record);
    const Reply reply = scene.device.send(8, c.message);
    EXPECT_EQ(reply.status, c.status) << c.message << c.ta_record;
    EXPECT_TRUE(reply.response.empty());
    scene.device.expect_clean();
  }
}

}  // namespace
}  // namespace otrp_test
