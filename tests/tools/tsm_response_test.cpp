// SPDX-License-Identifier: BSD-2-Clause
#include <gtest/gtest.h>

#include "tsm/protocol/dsi.h"
#include "tsm/protocol/response.h"
#include "tsm_fake_device.h"

namespace tsm {
namespace {

Response open(const std::string &text) {
  static const Json dsi = test_dsi();
  return open_response(text, {.tee_key = key_of(kTee), .tsm_key = test_tsm().key, .dsi = &dsi});
}

std::string created(const Json &content, const RsaKey &recipient = test_tsm().key) {
  const Json sealed = jwe_encrypt(recipient, serialize_as_device(content));
  return create_sd_response({{"status", "pass"}, {"content", sealed}});
}

TEST(Response, TaInfoIsSignedByTheSp) {
  const auto info = [](const char *spid, Role signer) {
    const Json members = {{"taid", "ta"}, {"spid", spid}, {"ta_version", "1"}};
    return sign_response({{"TAInformationTBS", members}}, "GetTAInfoResponse", signer);
  };
  EXPECT_EQ(open(info("sp", kAik)).members.at("ta_version"), "1");
  EXPECT_THROW(open(info("sp", kTee)), NotVerified);
  EXPECT_THROW(open(info("other", kAik)), NotVerified);
}

TEST(Response, OneChangedCharacterIsNoticedAnywhere) {
  const std::string good = create_sd_response(refusal(1));
  ASSERT_NO_THROW(open(good));
  const size_t header = good.find("\"header\"");
  for (size_t i = 0; i < header; ++i) {
    std::string bad = good;
    bad[i] = bad[i] == 'A' ? 'B' : 'A';
    EXPECT_THROW(open(bad), NotVerified) << "at " << i << ": " << good.substr(i, 20);
    EXPECT_THROW(open(good.substr(0, i)), NotVerified);
  }
}

TEST(Response, WhatIsNotAsItShouldBeIsRejected) {
  const std::string name = "CreateSDResponse";
  const Json content = {{"dsi", test_dsi().at("dsi")}};
  const Json none = Json::object();
  const Json good = {{"CreateSDTBSResponse", refusal(1)}};
  const struct {
    const char *name;
    std::string response;
  } kCases[] = {
      {"NotJson", "response"},
      {"TwoResponses", R"({"CreateSDResponse":{},"DeleteSDResponse":{}})"},
      {"NoEnvelope", R"({"CreateSDResponse":null})"},
      {"UnknownMessage", sign_response(good, "OtherResponse")},
      {"AnotherAlgorithm", sign_response(good, name, kTee, R"({"alg":"none"})")},
      {"SignedByAStranger", sign_response(good, name, kStranger)},
      {"PayloadOfAnotherMessage", sign_response({{"DeleteSDTBSResponse", refusal(1)}}, name)},
      {"PayloadNoObject", sign_response(Json::array(), "GetDeviceTEEStateResponse")},
      {"NoStatus", create_sd_response(none)},
      {"OtherStatus", create_sd_response({{"status", "PASS"}})},
      {"NoContent", create_sd_response({{"status", "pass"}, {"content", ""}})},
      {"ContentForAStranger", created(content, key_of(kStranger))},
      {"ContentNoObject", created(Json::array({1}))},
      {"ContentWithoutState", created({{"sdname", "sd"}})},
      {"StateWithoutLists", created({{"dsi", {{"tee", none}}}})},
      {"StateNotADocument", state_response("[]")},
      {"FailWithoutReason", create_sd_response({{"status", "fail"}})},
      {"NegativeCode", create_sd_response(refusal(-1))},
      {"CodeTooLarge", create_sd_response(refusal(0x100000000))},
      {"CodeAsText", create_sd_response(refusal("1"))},
  };
  ASSERT_NO_THROW(open(sign_response(good, name)));
  ASSERT_NO_THROW(open(created(content)));
  for (const auto &row : kCases) EXPECT_THROW(open(row.response), NotVerified) << row.name;
}

}  // namespace
}  // namespace tsm
