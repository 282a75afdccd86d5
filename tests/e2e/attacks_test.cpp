// SPDX-License-Identifier: BSD-2-Clause
// What an attacker may try who holds old requests, shares the buffers or is a TSM himself.
#include <gtest/gtest.h>

#include <atomic>
#include <set>
#include <thread>

#include "support/log_rows.h"
#include "support/scene.h"
#include "tsm/protocol/jwe.h"
#include "tsm/protocol/trust.h"

namespace otrp_test {
namespace {

class Attack : public testing::Test {
 protected:
  void SetUp() override {
    scene.furnish();
    stored = scene.device.objects();
  }
  void TearDown() override { scene.device.expect_clean(); }

  tee::test::TraceSink log;
  Scene scene;
  std::map<std::string, std::string> stored;
};

const MessageId kSigned[] = {
    MessageId::kGetDeviceState, MessageId::kInstallTa, MessageId::kUpdateTa, MessageId::kDeleteTa,
    MessageId::kCreateSd,       MessageId::kUpdateSd,  MessageId::kDeleteSd};

TEST_F(Attack, ARequestCountsForItsOwnMessageOnly) {
  for (const MessageId id : kSigned) {
    const std::string text = scene.request(id, usual(id));
    for (uint32_t other = 0; other <= 9; ++other) {
      if (other == static_cast<uint32_t>(id)) continue;
      const Reply reply = scene.device.send(other, text);
      EXPECT_EQ(reply.status, kBadRequest) << other;
      EXPECT_TRUE(reply.response.empty());
    }
  }
  EXPECT_EQ(scene.device.objects(), stored);
}

TEST_F(Attack, OneChangedCharacterInAnyMessageIsNoticed) {
  for (const MessageId id : kSigned) {
    const Json request = Json::parse(scene.request(id, usual(id)));
    for (const char *member : {"payload", "protect", "signature"}) {
      const std::string text = request.front()[member];
      // Not the last character: its lowest bits may be spare.
      for (size_t at = 0; at < text.size() - 1; at += 1 + text.size() / 7) {
        Json changed = request;
        std::string edited = text;
        edited[at] = text[at] == 'A' ? 'B' : 'A';
        changed.front()[member] = edited;
        const Reply reply = scene.device.send(static_cast<uint32_t>(id), changed.dump());
        EXPECT_NE(reply.status, 0u) << member << at;
        EXPECT_TRUE(reply.response.empty());
      }
    }
  }
  EXPECT_EQ(scene.device.objects(), stored);
}

TEST_F(Attack, TheSecondSignatureIsForThisTransactionDeviceTaAndTsm) {
  tsm::RequestOptions options = usual(MessageId::kInstallTa);
  options.rid = "r";
  options.tid = "t";
  const std::string &ta = options.taid;
  const std::string &did = scene.info.device_id;
  const std::string others[][5] = {
      {"t2", "r", did, ta, "tsm1"},      {"t", "r2", did, ta, "tsm1"},
      {"t", "r", "another", ta, "tsm1"}, {"t", "r", did, taid("ta9"), "tsm1"},
      {"t", "r", did, ta, "tsm2"},       {"r", "t", did, ta, "tsm1"},
  };
  for (const auto &[tid, rid, device, other_ta, tsmid] : others) {
    const Json signature = tsm::signature2(dev_ca(), tid, rid, device, other_ta, tsmid);
    const Edits edits = {.envelope = patch({{"signature2", signature}})};
    EXPECT_EQ(scene.run(MessageId::kInstallTa, options, edits).code(), kCaCheckFailed);
  }
  EXPECT_EQ(scene.device.objects(), stored);
}

TEST_F(Attack, EveryContentThatDoesNotOpenLooksTheSame) {
  const auto with_key = [](const std::string &wrapped) -> Json {
    const Json recipient = {{"header", {{"alg", "RSA1_5"}}},
                            {"encrypted_key", tools::base64url_encode(wrapped)}};
    return {{"recipients", Json::array({recipient})}};
  };
  const auto wrap = [&](size_t len) {
    return tsm::rsa1_5_encrypt(scene.info.tee_key, std::string(len, 'k'));
  };
  const struct {
    const char *name;
    Json changes;
    const char *line = "";  // of the log
  } cases[] = {
      {"RsaPadding", with_key(std::string(256, 'x'))},
      {"KeyTooShort", with_key(wrap(31)), "the content key has 31 bytes, not 32"},
      {"KeyTooLong", with_key(wrap(33)), "the content key has 33 bytes, not 32"},
      {"OtherKey", with_key(wrap(32))},
      {"Tag", {{"tag", tools::base64url_encode(std::string(16, 'x'))}}},
      {"NoBlocks", {{"ciphertext", "AAAA"}}},
      {"NoJson", tsm::jwe_encrypt(scene.info.tee_key, "no JSON")},
  };
  std::set<size_t> lengths;
  for (const auto &[name, changes, line] : cases) {
    SCOPED_TRACE(name);
    log.clear();
    const Outcome outcome = scene.run(MessageId::kCreateSd, {.rid = "r", .tid = "t"},
                                      {.tbs = patch({{"content", changes}})});
    ASSERT_TRUE(outcome.response);
    EXPECT_EQ(outcome.code(), kBadRequest);
    lengths.insert(outcome.reply.response.size());
    EXPECT_NE(said(log).find(line), std::string::npos);
  }
  EXPECT_EQ(lengths.size(), 1u);
}

/// A member ahead of all others.
Edit in_front(const char *name, const Json &value) {
  return [=](Json &members) {
    Json edited = {{name, value}};
    edited.update(members);
    members = edited;
  };
}

// Of members that look alike the first counts, wherever it stands.
TEST_F(Attack, WhatIsSignedIsWhatIsUsed) {
  const std::string stale(64, '0');
  const std::pair<Edit, bool> cases[] = {
      {in_front("x", "dsihash"), false},
      {in_front("x", Json::array({"dsihash", stale})), false},
      {in_front("x", {{"dsihash", stale}}), false},
      {patch({{"x", {{"dsihash", stale}}}}), true},
  };
  for (const auto &[edit, passes] : cases) {
    EXPECT_EQ(scene.run(MessageId::kCreateSd, usual(MessageId::kCreateSd), {.tbs = edit}).passed(),
              passes);
  }
}

// The envelope's "tsmid" is not signed; it only chooses whose key opens the answer.
TEST_F(Attack, AnUnsignedTsmidChoosesOnlyWhoReadsTheState) {
  const std::string request = scene.request(MessageId::kGetDeviceState, {});
  scene.use_tsm("tsm2");
  ASSERT_TRUE(scene.get_device_state().passed());
  const auto with_name = [&](const std::string &tsmid) {
    return scene.device.send(1, R"({"x":{"tsmid":")" + tsmid + R"("},)" + request.substr(1));
  };
  const auto open_as = [&](const std::string &tsmid, const Reply &reply) {
    return tsm::open_response(reply.response, {scene.info.tee_key, tsm_named(tsmid).key});
  };
  const Reply reply = with_name("tsm2");
  ASSERT_EQ(reply.status, 0u);
  EXPECT_THROW(open_as("tsm1", reply), tsm::NotVerified);
  EXPECT_NO_THROW(open_as("tsm2", reply));
  EXPECT_NE(with_name("nobody").status, 0u);
}

// ---- Buffers that the normal world shares with the agent

class SharedBuffers : public testing::Test {
 protected:
  void TearDown() override { scene.device.expect_clean(); }

  /// Returns the size of the answer.
  size_t invoke(char *in, size_t in_len, char *out, size_t out_len) {
    TEEC_Operation operation{};
    operation.paramTypes = device::kMessageTypes;
    operation.params[0].tmpref = {in, in_len};
    operation.params[1].tmpref = {out, out_len};
    device::Origin origin;
    result = session.invoke(0, operation, origin);
    return operation.params[1].tmpref.size;
  }

  const tee::test::TraceSink log;
  Scene scene;
  device::Session session{scene.device.door(), device::kAgentUuid};
  TEEC_Result result = TEEC_SUCCESS;
};

TEST_F(SharedBuffers, MayOverlapInAnyWay) {
  const std::string request = frame(1, scene.request(MessageId::kGetDeviceState, {}));
  for (size_t offset = 0; offset < 3000; offset += 7) {
    std::string memory = request + std::string(8000, 0);
    invoke(memory.data(), request.size(), memory.data() + offset, 4000);
    memory = std::string(offset, 0) + request + std::string(8000, 0);
    invoke(memory.data() + offset, request.size(), memory.data(), memory.size());
  }
}

TEST_F(SharedBuffers, WhatIsCheckedIsWhatIsUsed) {
  std::string request = frame(1, scene.request(MessageId::kGetDeviceState, {.rid = "aaaaaaaa"}));
  // One character of the payload's text, inside the "rid".
  const std::string payload = R"({"GetDeviceStateTBSRequest":{"ver":"1.0","rid":"aaaa)";
  char *character = request.data() + request.find("payload") + 10 + payload.size() * 4 / 3;
  const char honest = *character;
  std::atomic<bool> stop = false;
  std::thread normal_world([&] {
    while (!stop) {
      *static_cast<volatile char *>(character) = honest == 'A' ? 'B' : 'A';
      *static_cast<volatile char *>(character) = honest;
    }
  });
  int num_answered = 0;
  for (int i = 0; i < 300; ++i) {
    std::string answer(8000, 0);
    const size_t len = invoke(request.data(), request.size(), answer.data(), answer.size());
    EXPECT_EQ(result, TEEC_SUCCESS);
    if (word_at(answer, 0) != 0) continue;
    const tsm::Response response =
        tsm::open_response(answer.substr(8, len - 8), {scene.info.tee_key, scene.tsm().key});
    EXPECT_EQ(response.members["rid"], "aaaaaaaa");
    ++num_answered;
  }
  stop = true;
  normal_world.join();
  // A request that is read between two changes is whole.
  std::printf("changing input: %d of 300 requests answered\n", num_answered);
  EXPECT_GT(num_answered, 0);
}

}  // namespace
}  // namespace otrp_test
