// SPDX-License-Identifier: BSD-2-Clause
// What an attacker may try who holds old requests, shares the buffers or is a TSM himself.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <openssl/hmac.h>

#include <atomic>
#include <thread>

#include "support/scene.h"
#include "tsm/jwe.h"
#include "tsm/trust.h"

namespace otrp_test {
namespace {

constexpr uint32_t kMismatch = 0xDEAD0001;
constexpr uint32_t kBadRequest = 0xDEAD0006;
constexpr uint32_t kCaCheckFailed = 0xDEAD0010;

class Attack : public testing::Test {
 protected:
  void SetUp() override {
    ASSERT_TRUE(scene.get_device_state().response);
    ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
    ASSERT_TRUE(scene.install_ta("sp1", "sd1", taid("ta1")).passed());
  }
  void TearDown() override { scene.device.expect_clean(); }

  const tee::test::TraceSink log;
  Scene scene;
};

const std::pair<MessageId, tsm::RequestOptions> kRequests[] = {
    {MessageId::kGetDeviceState, {}},
    {MessageId::kCreateSd, {.spid = "sp2", .sdname = "sd2", .spcert = "c"}},
    {MessageId::kUpdateSd, {.spid = "sp1", .sdname = "sd1", .spcert = "c", .renew_aik = true}},
    {MessageId::kDeleteSd, {.sdname = "sd1", .deleteta = "true"}},
    {MessageId::kInstallTa,
     {.spid = "sp1", .sdname = "sd1", .taid = taid("ta2"), .ta_version = "1", .image = "image"}},
    {MessageId::kUpdateTa,
     {.spid = "sp1", .sdname = "sd1", .taid = taid("ta1"), .ta_version = "1", .image = "image"}},
    {MessageId::kDeleteTa, {.sdname = "sd1", .taid = taid("ta1")}},
};

TEST_F(Attack, ARequestCountsForItsOwnMessageOnly) {
  const auto stored = scene.device.objects();
  for (const auto &[id, options] : kRequests) {
    const std::string text = scene.request(id, options);
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
  const auto stored = scene.device.objects();
  for (const auto &[id, options] : kRequests) {
    const Json request = Json::parse(scene.request(id, options));
    for (const char *member : {"payload", "protect", "signature"}) {
      // Not the last character: its lowest bits may be spare.
      const std::string text = request.front()[member];
      for (const size_t at : {size_t{0}, text.size() / 2, text.size() - 2}) {
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

TEST_F(Attack, AStrangerCannotTakeOverAnAdmittedName) {
  const auto stored = scene.device.objects();
  const tsm::RsaKey &stranger = key_named("stranger");
  const auto edit = [&](Json &tbs) {
    tbs.front()["tsm_key_chain"]["tsm_list"][0] =
        tsm::tsm_entry(stranger, "tsm1", stranger.encoded());
  };
  EXPECT_EQ(scene.run(MessageId::kGetDeviceState, {}, {.tbs = edit}).code(), kCaCheckFailed);
  EXPECT_EQ(scene.device.objects(), stored);
}

TEST_F(Attack, AnotherTaSeesNoneOfTheRecords) {
  const tee::test::InsideTa other(scene.device.host(), {.uuid = {0x0BAD, 0, 0, {}}});
  for (const auto &[id, data] : scene.device.objects()) {
    TEE_ObjectHandle object = TEE_HANDLE_NULL;
    EXPECT_EQ(
        TEE_OpenPersistentObject(TEE_STORAGE_PRIVATE, id.data(), static_cast<uint32_t>(id.size()),
                                 TEE_DATA_FLAG_ACCESS_READ, &object),
        TEE_ERROR_ITEM_NOT_FOUND);
  }
}

TEST_F(Attack, AnOldRequestIsRefusedOnceTheStateHasMoved) {
  const std::string create =
      scene.request(MessageId::kCreateSd, {.spid = "sp1", .sdname = "sd2", .spcert = "c"});
  ASSERT_TRUE(scene.send(MessageId::kCreateSd, create).passed());
  EXPECT_EQ(scene.send(MessageId::kCreateSd, create).code(), kMismatch);
}

// ---- Contents that do not decrypt

tsm::Sealed seal_raw(const std::string &cek, const std::string &iv, const std::string &ciphertext,
                     size_t tag_len) {
  const std::string aad =
      tools::base64url_encode(tsm::protected_header_of(tsm::ContentCipher::kA128CbcHs256));
  const size_t num_bits = aad.size() * 8;
  const std::string al =
      std::string(6, 0) + static_cast<char>(num_bits >> 8) + static_cast<char>(num_bits & 0xFF);
  const std::string input = aad + iv + ciphertext + al;
  std::string mac(32, 0);
  unsigned len = 0;
  HMAC(EVP_sha256(), cek.data(), 16, reinterpret_cast<const uint8_t *>(input.data()), input.size(),
       reinterpret_cast<uint8_t *>(mac.data()), &len);
  return {ciphertext, mac.substr(0, tag_len)};
}

class Contents : public Attack {
 protected:
  Outcome send_with(const Json &content) {
    return scene.run(MessageId::kCreateSd,
                     {.rid = "r", .tid = "t", .spid = "sp1", .sdname = "sd2", .spcert = "c"},
                     {.tbs = [&content](Json &tbs) { tbs.front()["content"] = content; }});
  }

  Json sealed(const std::string &wrapped_cek, const tsm::Sealed &parts) const {
    return tsm::jwe_object(tsm::protected_header_of(tsm::ContentCipher::kA128CbcHs256), wrapped_cek,
                           iv, parts);
  }

  std::string wrap(const std::string &key) const {
    return tsm::rsa1_5_encrypt(scene.info.tee_key, key);
  }

  const std::string cek = std::string(32, 'k');
  const std::string iv = std::string(16, 'i');
};

TEST_F(Contents, EveryWayToFailLooksTheSame) {
  const std::string plain = R"({"spid":"sp1"})";
  const auto seal = [&](const std::string &text) {
    return seal_raw(cek, iv, tsm::aes_cbc_encrypt(cek.substr(16), iv, text), 16);
  };
  tsm::Sealed bad_tag = seal(plain);
  bad_tag.tag[15] ^= 1;
  std::string bad_padding = tsm::aes_cbc_encrypt(cek.substr(16), iv, std::string(31, 'x'));
  bad_padding.resize(16);  // its last block would have been the padding
  const std::pair<const char *, Json> cases[] = {
      {"RsaPadding", sealed(std::string(256, 'x'), seal(plain))},
      {"KeyTooShort", sealed(wrap(cek.substr(1)), seal(plain))},
      {"KeyTooLong", sealed(wrap(cek + "k"), seal(plain))},
      {"Tag", sealed(wrap(cek), bad_tag)},
      {"Padding", sealed(wrap(cek), seal_raw(cek, iv, bad_padding, 16))},
      {"NoBlocks", sealed(wrap(cek), seal_raw(cek, iv, "15 bytes are few", 16))},
      {"NoJson", sealed(wrap(cek), seal("no JSON"))},
  };
  size_t len = 0;
  for (const auto &[name, content] : cases) {
    SCOPED_TRACE(name);
    const Outcome outcome = send_with(content);
    ASSERT_TRUE(outcome.response);
    EXPECT_EQ(outcome.code(), kBadRequest);
    if (len == 0) len = outcome.reply.response.size();
    EXPECT_EQ(outcome.reply.response.size(), len);
  }
}

// A property of the protocol: whoever needs whole tags must demand them of the TSM.
TEST_F(Contents, ATagCountsForAsManyBytesAsItHas) {
  const std::string plain =
      R"({"spid":"sp1","sdname":"sd1","spcert":"c","tsmid":"tsm1","did":"d"})";
  const std::string cipher = tsm::aes_cbc_encrypt(cek.substr(16), iv, plain);
  for (const size_t tag_len : {1, 15, 16, 17, 32}) {
    const Outcome outcome = send_with(sealed(wrap(cek), seal_raw(cek, iv, cipher, tag_len)));
    EXPECT_EQ(outcome.code(), 0xDEAD0002) << tag_len;  // understood: the SD exists
  }
  tsm::Sealed too_long = seal_raw(cek, iv, cipher, 32);
  too_long.tag += "x";
  EXPECT_EQ(send_with(sealed(wrap(cek), too_long)).code(), kBadRequest);
}

// ---- The second signature of a request that brings an image

TEST_F(Attack, TheSecondSignatureIsForThisTransactionDeviceTaAndTsm) {
  const std::string ta = taid("ta2");
  const std::string &did = scene.info.device_id;
  const auto stored = scene.device.objects();
  const std::vector<std::string> others[] = {{"t2", "r", did, ta, "tsm1"},
                                             {"t", "r2", did, ta, "tsm1"},
                                             {"t", "r", "another device", ta, "tsm1"},
                                             {"t", "r", did, taid("ta3"), "tsm1"},
                                             {"t", "r", did, ta, "tsm2"},
                                             {"r", "t", did, ta, "tsm1"}};
  for (const auto &parts : others) {
    const std::string signature =
        tsm::signature2(dev_ca(), parts[0], parts[1], parts[2], parts[3], parts[4]);
    const Outcome outcome =
        scene.run(MessageId::kInstallTa,
                  {.rid = "r",
                   .tid = "t",
                   .spid = "sp1",
                   .sdname = "sd1",
                   .taid = ta,
                   .ta_version = "1",
                   .image = "image"},
                  {.extra = [&signature](Json &extra) { extra["signature2"] = signature; }});
    EXPECT_EQ(outcome.code(), kCaCheckFailed);
    EXPECT_FALSE(outcome.reply.image);
  }
  EXPECT_EQ(scene.device.objects(), stored);
}

// ---- Look-alikes: the first match counts, wherever it stands

struct LookAlike {
  const char *name;
  std::function<void(Json &members)> edit;  // of the signed request
  bool passes;
};

const std::string kStale(64, '0');

Json in_front(const char *name, const Json &value, const Json &members) {
  Json result = {{name, value}};
  result.update(members);
  return result;
}

TEST_F(Attack, WhatIsSignedIsWhatIsUsed) {
  const LookAlike cases[] = {
      {"ValueNamedLikeAKey", [](Json &m) { m = in_front("x", "dsihash", m); }, false},
      {"KeyInAnArray",
       [](Json &m) {
         m = in_front("x", {"dsihash", kStale}, m);
       },
       false},
      {"NestedKeyBeforeTheRealOne",
       [](Json &m) {
         m = in_front("x", {{"dsihash", kStale}}, m);
       },
       false},
      {"NestedKeyBehindTheRealOne",
       [](Json &m) {
         m["x"] = {{"dsihash", kStale}};
       },
       true},
      {"NestedKeyForTheRealOne",
       [](Json &m) {
         m = in_front("x", {{"dsihash", m["dsihash"]}}, m);
         m["dsihash"] = kStale;
       },
       true},
  };
  for (const LookAlike &c : cases) {
    SCOPED_TRACE(c.name);
    const Outcome outcome =
        scene.run(MessageId::kCreateSd, {.spid = "sp1", .sdname = c.name, .spcert = "c"},
                  {.tbs = [&c](Json &tbs) { c.edit(tbs.front()); }});
    EXPECT_EQ(outcome.passed(), c.passes);
  }
}

// The envelope's "tsmid" is not signed; it only chooses whose key opens the answer.
TEST_F(Attack, AnUnsignedTsmidChoosesOnlyWhoReadsTheState) {
  Scene other = Scene(scene, scene.device.snapshot());
  ASSERT_TRUE(other.device.open());
  other.use_tsm("tsm2");
  ASSERT_TRUE(other.get_device_state().response);

  const std::string request = scene.request(MessageId::kGetDeviceState, {});
  const std::string edited = R"({"x":{"tsmid":"tsm2"},)" + request.substr(1);
  const Reply reply = other.device.send(1, edited);
  ASSERT_EQ(reply.status, 0u);
  EXPECT_THROW(tsm::open_response(reply.response, {scene.info.tee_key, tsm_named("tsm1").key}),
               tsm::NotVerified);
  EXPECT_NO_THROW(tsm::open_response(reply.response, {scene.info.tee_key, tsm_named("tsm2").key}));
  const std::string unknown = R"({"x":{"tsmid":"nobody"},)" + request.substr(1);
  EXPECT_NE(other.device.send(1, unknown).status, 0u);
  other.device.expect_clean();
}

// ---- Shared buffers

/// A session of its own, for buffers that the test shares with the agent.
class SharedBuffers : public testing::Test {
 protected:
  void SetUp() override {
    ASSERT_TRUE(scene.device.open());
    uint32_t origin = 0;
    ASSERT_EQ(TEEC_OpenSession(scene.device.door().context(), &session, &device::kAgentUuid,
                               TEEC_LOGIN_PUBLIC, nullptr, nullptr, &origin),
              TEEC_SUCCESS);
  }
  void TearDown() override {
    TEEC_CloseSession(&session);
    scene.device.expect_clean();
  }

  TEEC_Result invoke(char *in, size_t in_len, char *out, size_t *out_len) {
    TEEC_Operation operation{};
    operation.paramTypes =
        TEEC_PARAM_TYPES(TEEC_MEMREF_TEMP_INPUT, TEEC_MEMREF_TEMP_OUTPUT, TEEC_NONE, TEEC_NONE);
    operation.params[0].tmpref = {in, in_len};
    operation.params[1].tmpref = {out, *out_len};
    uint32_t origin = 0;
    const TEEC_Result result = TEEC_InvokeCommand(&session, 0, &operation, &origin);
    *out_len = operation.params[1].tmpref.size;
    return result;
  }

  const tee::test::TraceSink log;
  Scene scene;
  TEEC_Session session{};
};

TEST_F(SharedBuffers, MayOverlapInAnyWay) {
  const std::string request = frame(1, scene.request(MessageId::kGetDeviceState, {}));
  for (size_t offset = 0; offset < 3000; offset += 7) {
    std::string memory = request + std::string(8000, 0);
    size_t len = 4000;
    invoke(memory.data(), request.size(), memory.data() + offset, &len);
    memory = std::string(offset, 0) + request + std::string(8000, 0);
    len = memory.size();
    invoke(memory.data() + offset, request.size(), memory.data(), &len);
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
    size_t len = answer.size();
    EXPECT_EQ(invoke(request.data(), request.size(), answer.data(), &len), TEEC_SUCCESS);
    if (answer.substr(0, 4) != word(0)) continue;
    const tsm::Response response =
        tsm::open_response(answer.substr(8, len - 8), {scene.info.tee_key, scene.tsm().key});
    EXPECT_EQ(response.members["rid"], "aaaaaaaa");
    ++num_answered;
  }
  stop = true;
  normal_world.join();
  std::printf("changing input: %d of 300 requests answered\n", num_answered);
}

}  // namespace
}  // namespace otrp_test
