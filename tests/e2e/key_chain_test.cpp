// SPDX-License-Identifier: BSD-2-Clause
// GetDeviceState from outside: how a TSM becomes known, and what its signature covers.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/scene.h"
#include "tsm/dsi.h"
#include "tsm/trust.h"

namespace otrp_test {
namespace {

constexpr uint32_t kBadRequest = 0xDEAD0006;
constexpr uint32_t kCaCheckFailed = 0xDEAD0010;
constexpr uint32_t kNoMemory = 0xDEAD1002;
constexpr uint32_t kMissing = 0xDEAD1004;
constexpr char kEmptyDeviceHash[] =
    "bbdc1d13e56fe3b3d81a742a6f9de14c813b002661c90f39cfe1bfd324bea9e5";

Json &chain_of(Json &tbs) {
  return tbs["GetDeviceStateTBSRequest"]["tsm_key_chain"];
}

std::vector<std::string> member_names(const Json &object) {
  std::vector<std::string> names;
  for (const auto &item : object.items()) names.push_back(item.key());
  return names;
}

TEST(GetDeviceState, AnswersATsmWithTheKeyThatItBrings) {
  Scene scene;
  Edits edits;
  edits.tbs = [](Json &tbs) {
    tbs.begin()->operator[]("ver") = "9.9";
    tbs.begin()->operator[]("signerreq") = "false";
  };
  const Outcome first = scene.run(MessageId::kGetDeviceState, {.rid = "7", .tid = "x1"}, edits);
  ASSERT_TRUE(first.response);
  EXPECT_THAT(member_names(first.response->members),
              testing::ElementsAre("ver", "rid", "tid", "signerreq", "edsi"));
  EXPECT_EQ(first.response->members["ver"], "1.0");
  EXPECT_EQ(first.response->members["rid"], "7");
  EXPECT_EQ(first.response->members["tid"], "x1");
  EXPECT_EQ(first.response->members["signerreq"], "true");
  EXPECT_EQ(scene.dsihash(), kEmptyDeviceHash);
  EXPECT_EQ(first.response->header, Json({{"deviceId", "test_device_id"}}));
  scene.device.expect_clean();

  ASSERT_TRUE(scene.device.restart());
  const Outcome second = scene.get_device_state();
  ASSERT_TRUE(second.response);
  EXPECT_NE(second.response->members["edsi"], first.response->members["edsi"]);
  EXPECT_EQ(second.response->content, first.response->content);
  EXPECT_EQ(scene.device.record("SD_LIST_ID"), R"({"sd_list":[]})");
  const Json entry = scene.tsm().key_chain["tsm_list"][0];
  EXPECT_EQ(scene.device.record("TSM_INFO_tsm1"), entry["tsm_pub_key"].get<std::string>());
}

struct ChainCase {
  const char *name;
  std::function<void(Json &chain)> edit;
  uint32_t status;
  const char *log;  // a line that appears
};

std::ostream &operator<<(std::ostream &out, const ChainCase &c) {
  return out << c.name;
}

std::string hash_of_chain(const Json &chain) {
  return chain["ca_tsm_hash"].get<std::string>();
}

const ChainCase kChains[] = {
    {"HashInUpperCase",
     [](Json &chain) {
       std::string hash = hash_of_chain(chain);
       for (char &c : hash) c = static_cast<char>(toupper(c));
       chain["ca_tsm_hash"] = hash;
     },
     0, nullptr},
    {"HashOneDigitShort",
     [](Json &chain) { chain["ca_tsm_hash"] = hash_of_chain(chain).substr(1); }, kNoMemory,
     "input in param bad format"},
    {"HashOneByteShort", [](Json &chain) { chain["ca_tsm_hash"] = hash_of_chain(chain).substr(2); },
     kCaCheckFailed, "ca_tsm not match with ca_tsm_in_tee"},
    {"HashWithASpace",
     [](Json &chain) { chain["ca_tsm_hash"] = hash_of_chain(chain).replace(9, 1, " "); }, kNoMemory,
     "convert_java_hash_string_to_c_byte_array get NULL"},
    {"HashWithTheLetterG",
     [](Json &chain) { chain["ca_tsm_hash"] = hash_of_chain(chain).replace(9, 1, "g"); },
     kCaCheckFailed, "ca_tsm not match with ca_tsm_in_tee"},
    {"HashEmpty", [](Json &chain) { chain["ca_tsm_hash"] = ""; }, kNoMemory,
     "input in param bad format"},
    {"HashMissing", [](Json &chain) { chain.erase("ca_tsm_hash"); }, kNoMemory,
     "convert_java_hash_string_to_c_byte_array input is NULL"},
    {"SignatureOfAnother",
     [](Json &chain) {
       chain["tsm_list"][0] =
           tsm::tsm_entry(key_named("stranger"), "tsm1", tsm_named("tsm1").key.encoded());
     },
     kCaCheckFailed, "sha_verify_signature error code: 0xffff3072"},
    {"SignatureForAnotherName",
     [](Json &chain) {
       const Json entry = tsm::tsm_entry(dev_ca(), "tsm2", tsm_named("tsm1").key.encoded());
       chain["tsm_list"][0]["signature"] = entry["signature"];
     },
     kCaCheckFailed, "sha_verify_signature error code: 0xffff3072"},
    {"SignatureNotBase64", [](Json &chain) { chain["tsm_list"][0]["signature"] = "!"; }, kNoMemory,
     "Failed to base64 decode signature"},
    {"KeyNotBase64", [](Json &chain) { chain["tsm_list"][0]["tsm_pub_key"] = "!"; }, kNoMemory,
     "Failed to base64 decode tam pub key"},
    {"EntryWithoutKey", [](Json &chain) { chain["tsm_list"][0].erase("tsm_pub_key"); }, kMissing,
     "verify_tsm_pub_key input is NULL"},
    {"EntryOfNumbers", [](Json &chain) { chain["tsm_list"][0]["tsmid"] = 5; }, kMissing,
     "verify_tsm_pub_key input is NULL"},
    {"EntryIsNoObject", [](Json &chain) { chain["tsm_list"][0] = "x"; }, kMissing,
     "verify_tsm_pub_key input is NULL"},
};

class KeyChain : public testing::TestWithParam<ChainCase> {};

TEST_P(KeyChain, IsAdmittedOrRefused) {
  Scene scene;
  tee::test::TraceSink log;
  Edits edits;
  edits.tbs = [](Json &tbs) { GetParam().edit(chain_of(tbs)); };
  const Outcome outcome = scene.run(MessageId::kGetDeviceState, {}, edits);
  EXPECT_EQ(outcome.reply.status, GetParam().status);
  EXPECT_EQ(outcome.response.has_value(), GetParam().status == 0);
  EXPECT_EQ(scene.device.record("TSM_INFO_tsm1").has_value(), GetParam().status == 0);
  if (GetParam().log != nullptr) {
    EXPECT_THAT(log.lines(), testing::Contains(testing::Field(&tee::test::TraceSink::Line::message,
                                                              GetParam().log)));
  }
  scene.device.expect_clean();
}

INSTANTIATE_TEST_SUITE_P(All, KeyChain, testing::ValuesIn(kChains),
                         [](const auto &row) { return std::string(row.param.name); });

TEST(KeyChain, WithoutAListAdmitsNobody) {
  Scene scene;
  Edits edits;
  edits.tbs = [](Json &tbs) { chain_of(tbs).erase("tsm_list"); };
  EXPECT_EQ(scene.run(MessageId::kGetDeviceState, {}, edits).reply.status,
            TEEC_ERROR_ITEM_NOT_FOUND);
  EXPECT_FALSE(scene.device.record("TSM_INFO_tsm1"));
  ASSERT_TRUE(scene.get_device_state().response);
  EXPECT_TRUE(scene.run(MessageId::kGetDeviceState, {}, edits).response);
}

TEST(KeyChain, EntriesBeforeABadOneStayAdmitted) {
  Scene scene;
  Edits edits;
  edits.tbs = [](Json &tbs) {
    Json bad = tsm::tsm_entry(key_named("stranger"), "tsm9", tsm_named("tsm1").key.encoded());
    chain_of(tbs)["tsm_list"].push_back(bad);
  };
  EXPECT_EQ(scene.run(MessageId::kGetDeviceState, {}, edits).reply.status, kCaCheckFailed);
  EXPECT_TRUE(scene.device.record("TSM_INFO_tsm1"));
  EXPECT_FALSE(scene.device.record("TSM_INFO_tsm9"));
}

TEST(KeyChain, ANewKeyReplacesTheOldOne) {
  Scene scene;
  ASSERT_TRUE(scene.get_device_state().response);
  const std::string with_old_key = scene.request(MessageId::kGetDeviceState, {});
  const tsm::RsaKey &new_key = key_named("new key of tsm1");
  Edits renewal;
  renewal.tbs = [&](Json &tbs) {
    chain_of(tbs)["tsm_list"][0] = tsm::tsm_entry(dev_ca(), "tsm1", new_key.encoded());
  };
  // Signed with the old key, so refused; but the chain has been admitted by then.
  EXPECT_EQ(scene.run(MessageId::kGetDeviceState, {}, renewal).reply.status, kBadRequest);
  Edits no_list;
  no_list.tbs = [](Json &tbs) { chain_of(tbs).erase("tsm_list"); };
  EXPECT_EQ(scene.run(MessageId::kGetDeviceState, {}, no_list).reply.status, kBadRequest);
  EXPECT_TRUE(scene.send(MessageId::kGetDeviceState, with_old_key).response);
}

TEST(Signature, EveryChangedCharacterIsNoticed) {
  Scene scene;
  ASSERT_TRUE(scene.get_device_state().response);
  const Json request = Json::parse(scene.request(MessageId::kGetDeviceState, {}));
  for (const char *member : {"payload", "protect", "signature"}) {
    const std::string text = request["GetDeviceStateRequest"][member];
    const size_t step = std::max<size_t>(1, text.size() / 20);
    for (size_t i = 0; i < text.size(); i += step) {
      Json changed = request;
      std::string edited = text;
      edited[i] = edited[i] == 'A' ? 'B' : 'A';
      changed["GetDeviceStateRequest"][member] = edited;
      const Reply reply = scene.device.send(1, tsm::serialize_as_device(changed));
      // A changed payload may end as a key chain that does not parse.
      EXPECT_NE(reply.status, 0u) << member << i;
      if (std::string(member) != "payload") {
        EXPECT_EQ(reply.status, kBadRequest) << member << i;
      }
      EXPECT_TRUE(reply.response.empty());
    }
  }
  scene.device.expect_clean();
}

TEST(Signature, TheProtectedHeaderIsNotInterpreted) {
  Scene scene;
  const std::string payload = tsm::serialize_as_device(Json::parse(*tsm::base64url_decode(
      Json::parse(scene.request(MessageId::kGetDeviceState, {}))["GetDeviceStateRequest"]["payload"]
          .get<std::string>())));
  const std::string payload_text = tsm::base64url_encode(payload);
  for (const std::string protect : {"bm90IGpzb24", "e30", "x"}) {
    const std::string signature =
        tsm::base64url_encode(tsm::rs256_sign(scene.tsm().key, protect + "." + payload_text));
    const Json message = {{"GetDeviceStateRequest",
                           {{"signature", signature},
                            {"header", {{"tsmid", "tsm1"}}},
                            {"protect", protect},
                            {"payload", payload_text}}}};
    EXPECT_TRUE(scene.send(MessageId::kGetDeviceState, message.dump()).response) << protect;
  }
}

TEST(Envelope, MissingMembersAreNamedInTheLog) {
  Scene scene;
  const Json request = Json::parse(scene.request(MessageId::kGetDeviceState, {}));
  const struct {
    const char *member;
    const char *log;
  } cases[] = {{"payload", "get base64 payload error"},
               {"protect", "get base64_protect error"},
               {"signature", "get base64 signature error"},
               {"header", "request header is NULL"}};
  for (const auto &c : cases) {
    Json changed = request;
    changed["GetDeviceStateRequest"].erase(c.member);
    tee::test::TraceSink log;
    const Reply reply = scene.device.send(1, changed.dump());
    EXPECT_EQ(reply.status, kBadRequest);
    EXPECT_THAT(log.lines(),
                testing::Contains(testing::Field(&tee::test::TraceSink::Line::message, c.log)));
  }
  Json other_name = {{"InstallTARequest", request["GetDeviceStateRequest"]}};
  EXPECT_EQ(scene.device.send(1, other_name.dump()).status, kBadRequest);
  scene.device.expect_clean();
}

TEST(Envelope, AnEmptyKeyRecordLeavesNothingToProcess) {
  Scene scene;
  Edits no_list;
  no_list.tbs = [](Json &tbs) { chain_of(tbs).erase("tsm_list"); };
  scene.device.put_record("TSM_INFO_tsm1", "");
  tee::test::TraceSink log;
  EXPECT_EQ(scene.run(MessageId::kGetDeviceState, {}, no_list).reply.status, kBadRequest);
  EXPECT_THAT(log.lines(),
              testing::Contains(testing::Field(&tee::test::TraceSink::Line::message,
                                               "after verify_decode get tbs json is NULL")));
}

}  // namespace
}  // namespace otrp_test
