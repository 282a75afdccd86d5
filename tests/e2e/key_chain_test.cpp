// SPDX-License-Identifier: BSD-2-Clause
// GetDeviceState from outside: how a TSM becomes known, and what its envelope must have.
#include <gtest/gtest.h>

#include "support/scene.h"
#include "tsm/protocol/trust.h"

namespace otrp_test {
namespace {

class KeyChain : public testing::Test {
 protected:
  void TearDown() override { scene.device.expect_clean(); }

  Outcome ask_with(const Json &chain) {
    return scene.run(MessageId::kGetDeviceState, {}, {.tbs = patch({{"tsm_key_chain", chain}})});
  }

  bool is_admitted(const std::string &tsmid) {
    return scene.device.record("TSM_INFO_" + tsmid).has_value();
  }

  const tee::test::TraceSink log;
  Scene scene;
  const Json entry = scene.tsm().key_chain["tsm_list"][0];
  const Json no_list = {{"tsm_list", nullptr}};
};

TEST_F(KeyChain, BringsTheKeyThatTheAnswerIsFor) {
  const Outcome first = scene.run(MessageId::kGetDeviceState, {},
                                  {.tbs = patch({{"ver", "9.9"}, {"signerreq", "false"}})});
  ASSERT_TRUE(first.response);
  EXPECT_EQ(first.response->members["ver"], "1.0");
  EXPECT_EQ(first.response->members["signerreq"], "true");
  EXPECT_EQ(scene.dsihash(), "bbdc1d13e56fe3b3d81a742a6f9de14c813b002661c90f39cfe1bfd324bea9e5");
  EXPECT_EQ(scene.device.record("SD_LIST_ID"), R"({"sd_list":[]})");
  EXPECT_EQ(scene.device.record("TSM_INFO_tsm1"), entry["tsm_pub_key"].get<std::string>());

  // The case of the hash that names the CA does not matter.
  std::string hash = scene.tsm().key_chain["ca_tsm_hash"];
  for (char &c : hash) c = static_cast<char>(toupper(c));
  const Outcome second = ask_with({{"ca_tsm_hash", hash}});
  ASSERT_TRUE(second.passed());
  EXPECT_NE(second.response->members["edsi"], first.response->members["edsi"]);
  EXPECT_EQ(second.response->content, first.response->content);
}

TEST_F(KeyChain, IsRefusedWithACodeAndAdmitsNobody) {
  const std::string hash = scene.tsm().key_chain["ca_tsm_hash"];
  const auto ca_hash = [](const Json &value) { return Json({{"ca_tsm_hash", value}}); };
  const auto with = [&](const char *member, const Json &value) {
    Json changed = entry;
    changed.merge_patch({{member, value}});
    return Json({{"tsm_list", Json::array({changed})}});
  };
  const tsm::RsaKey &stranger = key_named("stranger");
  const std::string key = scene.tsm().key.encoded();
  const Json by_stranger = tsm::tsm_entry(stranger, "tsm1", key)["signature"];
  const Json for_tsm2 = tsm::tsm_entry(dev_ca(), "tsm2", key)["signature"];
  const struct {
    const char *name;
    Json chain;
    uint32_t status;
  } cases[] = {
      {"NoHash", ca_hash(nullptr), kNoMemory},
      {"EmptyHash", ca_hash(""), kNoMemory},
      {"HashOneDigitShort", ca_hash(hash.substr(1)), kNoMemory},
      {"HashOneByteShort", ca_hash(hash.substr(2)), kCaCheckFailed},
      {"HashWithASpace", ca_hash(hash.substr(0, 63) + " "), kNoMemory},
      {"HashWithTheLetterG", ca_hash("g" + hash.substr(1)), kCaCheckFailed},
      {"SignatureOfAnother", with("signature", by_stranger), kCaCheckFailed},
      {"SignatureForAnotherName", with("signature", for_tsm2), kCaCheckFailed},
      {"SignatureNotBase64", with("signature", "!"), kNoMemory},
      {"KeyOfAStranger", with("tsm_pub_key", tools::base64url_encode(stranger.encoded())),
       kCaCheckFailed},
      {"KeyNotBase64", with("tsm_pub_key", "!"), kNoMemory},
      {"NoKey", with("tsm_pub_key", nullptr), kMissing},
      {"NumberAsName", with("tsmid", 5), kMissing},
      {"EntryIsNoObject", {{"tsm_list", {"x"}}}, kMissing},
  };
  // A TSM that is known is not more easily replaced than made known.
  for (const bool is_known : {false, true}) {
    if (is_known) {
      ASSERT_TRUE(scene.get_device_state().passed());
    }
    const auto stored = scene.device.objects();
    for (const auto &c : cases) {
      SCOPED_TRACE(c.name);
      const Outcome outcome = ask_with(c.chain);
      EXPECT_EQ(outcome.reply.status, c.status);
      EXPECT_FALSE(outcome.response);
      EXPECT_EQ(scene.device.objects(), stored);
      scene.device.expect_clean();
    }
  }
}

TEST_F(KeyChain, WithoutAListAdmitsNobody) {
  EXPECT_EQ(ask_with(no_list).reply.status, TEEC_ERROR_ITEM_NOT_FOUND);
  EXPECT_FALSE(is_admitted("tsm1"));
  ASSERT_TRUE(scene.get_device_state().passed());
  EXPECT_TRUE(ask_with(no_list).passed());
  scene.device.put_record("TSM_INFO_tsm1", "");
  EXPECT_EQ(ask_with(no_list).reply.status, kBadRequest);
}

TEST_F(KeyChain, EntriesBeforeABadOneStayAdmitted) {
  const Json bad = tsm::tsm_entry(key_named("stranger"), "tsm9", scene.tsm().key.encoded());
  EXPECT_EQ(ask_with({{"tsm_list", {entry, bad}}}).reply.status, kCaCheckFailed);
  EXPECT_TRUE(is_admitted("tsm1"));
  EXPECT_FALSE(is_admitted("tsm9"));
}

TEST_F(KeyChain, ANewKeyReplacesTheOldOne) {
  ASSERT_TRUE(scene.get_device_state().passed());
  const Json renewed = tsm::tsm_entry(dev_ca(), "tsm1", key_named("new key").encoded());
  // Signed with the old key, so refused; but the chain has been admitted by then.
  EXPECT_EQ(ask_with({{"tsm_list", Json::array({renewed})}}).reply.status, kBadRequest);
  EXPECT_EQ(ask_with(no_list).reply.status, kBadRequest);
  EXPECT_TRUE(scene.get_device_state().passed());
}

TEST_F(KeyChain, AnEnvelopeMustHaveAllItsMembers) {
  for (const char *member : {"payload", "protect", "signature", "header"}) {
    const Edits edits = {.envelope = patch({{member, nullptr}})};
    EXPECT_EQ(scene.run(MessageId::kGetDeviceState, {}, edits).reply.status, kBadRequest);
  }
}

TEST_F(KeyChain, TheProtectedHeaderIsSignedButNotInterpreted) {
  const auto protect_with = [&](const std::string &protect) -> Edit {
    return [&, protect](Json &envelope) {
      const std::string signed_text = protect + "." + envelope["payload"].get<std::string>();
      envelope["protect"] = protect;
      envelope["signature"] = tsm::base64url_encode(tsm::rs256_sign(scene.tsm().key, signed_text));
    };
  };
  for (const char *protect : {"bm90IGpzb24", "e30", "x"}) {
    const Edits edits = {.envelope = protect_with(protect)};
    EXPECT_TRUE(scene.run(MessageId::kGetDeviceState, {}, edits).response);
  }
}

}  // namespace
}  // namespace otrp_test
