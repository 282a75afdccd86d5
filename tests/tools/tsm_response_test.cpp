// SPDX-License-Identifier: BSD-2-Clause
#include <gtest/gtest.h>

#include "tsm/dsi.h"
#include "tsm/response.h"
#include "tsm_fake_device.h"

namespace tsm {
namespace {

Json content_with_dsi() {
  Json content = {{"reason", Json::object()}, {"sdname", "sd"}};
  content["dsi"] = test_dsi().at("dsi");
  return content;
}

Json pass_members() {
  return {{"ver", "1.0"},
          {"rid", "r"},
          {"tid", "t"},
          {"status", "pass"},
          {"content", jwe_encrypt(test_tsm().key, serialize_as_device(content_with_dsi()))}};
}

Json fail_members(const Json &code) {
  return {{"reason", {{"error_code", code}, {"error_message", ""}}}, {"status", "fail"}};
}

Response open(const std::string &text) {
  static const Json dsi = test_dsi();
  return open_response(text, {.tee_key = tee_key(), .tsm_key = test_tsm().key, .dsi = &dsi});
}

TEST(Response, BothWaysToTheDeviceStateGiveTheSameDocument) {
  const std::string dsi_text = serialize_as_device(test_dsi());
  ASSERT_NE(dsi_text.find("sd\\/1"), std::string::npos);
  const Response state = open(state_response(dsi_text));
  const Response created = open(create_sd_response(pass_members()));
  EXPECT_EQ(state.dsi_text, dsi_text);
  EXPECT_EQ(created.dsi_text, dsi_text);
  EXPECT_EQ(dsi_hash(test_dsi()), dsi_hash_of_text(dsi_text));
  EXPECT_EQ(created.status, "pass");
  EXPECT_EQ(created.content.at("sdname"), "sd");
  EXPECT_FALSE(created.error_code);
}

TEST(Response, RefusalCarriesItsCode) {
  const Response response = open(create_sd_response(fail_members(0xDEAD0002)));
  EXPECT_EQ(response.status, "fail");
  EXPECT_EQ(response.error_code, 0xDEAD0002);
  EXPECT_FALSE(response.dsi_text);
}

TEST(Response, TaInfoIsSignedByTheSp) {
  const auto info = [](const char *spid, const RsaKey &key) {
    const Json members = {{"taid", "ta"}, {"spid", spid}, {"ta_version", "1"}};
    return sign_response(Json{{"TAInformationTBS", members}}.dump(), "GetTAInfoResponse", key);
  };
  EXPECT_EQ(open(info("sp", aik_key())).members.at("ta_version"), "1");
  EXPECT_THROW(open(info("sp", tee_key())), NotVerified);
  EXPECT_THROW(open(info("other", aik_key())), NotVerified);
}

TEST(Response, OneChangedCharacterIsNoticedAnywhere) {
  const std::string good = create_sd_response(fail_members(1));
  ASSERT_NO_THROW(open(good));
  const size_t header = good.find("\"header\"");
  for (size_t i = 0; i < header; ++i) {
    std::string bad = good;
    bad[i] = bad[i] == 'A' ? 'B' : 'A';
    EXPECT_THROW(open(bad), NotVerified) << "at " << i << ": " << good.substr(i, 20);
    EXPECT_THROW(open(good.substr(0, i)), NotVerified);
  }
}

TEST(Response, WhatIsSignedButNotAsItShouldBeIsRejected) {
  const auto with = [](const char *name, const Json &value) {
    Json members = pass_members();
    members[name] = value;
    return create_sd_response(members);
  };
  const auto with_content = [&with](const std::string &text, const RsaKey &key) {
    return with("content", jwe_encrypt(key, text));
  };
  const RsaKey &tsm = test_tsm().key;
  const struct {
    const char *name;
    std::string response;
  } kCases[] = {
      {"SignedByAStranger", sign_response("{}", "CreateSDResponse", stranger_key())},
      {"PayloadOfAnotherMessage",
       sign_response(R"({"DeleteSDTBSResponse":{"status":"fail"}})", "CreateSDResponse")},
      {"UnknownMessage", sign_response("{}", "OtherResponse")},
      {"PayloadNoObject", sign_response("[]", "GetDeviceTEEStateResponse")},
      {"NoStatus", with("status", nullptr)},
      {"OtherStatus", with("status", "PASS")},
      {"NoContent", with("content", "")},
      {"ContentForAStranger", with_content(content_with_dsi().dump(), stranger_key())},
      {"ContentNoObject", with_content("[1]", tsm)},
      {"ContentWithoutState", with_content(R"({"sdname":"sd"})", tsm)},
      {"StateWithoutLists", with_content(R"({"dsi":{"tee":{}}})", tsm)},
      {"FailWithoutReason", create_sd_response({{"status", "fail"}})},
      {"NegativeCode", create_sd_response(fail_members(-1))},
      {"CodeTooLarge", create_sd_response(fail_members(0x100000000))},
      {"CodeAsText", create_sd_response(fail_members("1"))},
      {"StateNotADocument", state_response("[]")},
      {"NotJson", "response"},
      {"TwoResponses", R"({"CreateSDResponse":{},"DeleteSDResponse":{}})"},
      {"NoEnvelope", R"({"CreateSDResponse":null})"},
  };
  for (const auto &row : kCases) {
    EXPECT_THROW(open(row.response), NotVerified) << row.name;
  }
}

TEST(Response, AnotherAlgorithmIsRejectedBeforeItsSignature) {
  const std::string protect = base64url_encode(R"({"alg":"none"})");
  const std::string payload = base64url_encode("{}");
  const Json envelope = {
      {"payload", payload},
      {"protect", protect},
      {"signature", base64url_encode(rs256_sign(tee_key(), protect + "." + payload))}};
  EXPECT_THROW(parse_envelope(Json{{"CreateSDResponse", envelope}}.dump()), NotVerified);
}

}  // namespace
}  // namespace tsm
