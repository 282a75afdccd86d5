// SPDX-License-Identifier: BSD-2-Clause
// The inspector: nothing to say against the exchanges of docs/examples, and the line that each
// broken message must show.
#include <otrp.h>

#include <algorithm>

#include "common/result_names.h"
#include "program.h"
#include "tsm/inspect/input.h"
#include "tsm/protocol/dsi.h"
#include "tsm/protocol/image.h"
#include "tsm/protocol/request.h"
#include "tsm/protocol/trust.h"
#include "tsm_fake_device.h"

namespace tsm {
namespace {

const Json &state() {
  static const Json document = [] {
    Json dsi = test_dsi();
    dsi["dsi"]["tee"]["sdlist"]["sd"][0]["name"] = "sd/>>>???x";  // all readings differ
    return dsi;
  }();
  return document;
}

AtHand all_at_hand() {
  return {{{"the TSM's key", test_tsm().key, Party::kTsm},
           {"the CA's key", key_of(kCa), Party::kCa},
           {"the TEE key", key_of(kTee), Party::kDevice},
           {"the AIK", key_of(kAik), Party::kProvider}},
          {{"the state", serialize_as_device(state())}},
          test_device().device_id};
}

std::string hash_of(std::string_view text) {
  return hex_encode(sha256(text));
}

/// Patches (RFC 7396) to the parts of a request that has no fault.
struct Patches {
  Json content = Json::object();
  Json tbs = Json::object();
  Json envelope = Json::object();
};

constexpr char kTaid[] = "00112233445566778899aabbccddeeff";

std::string request(MessageId id, const Patches &patches, std::string_view image) {
  const RequestOptions options = {.rid = "r",
                                  .tid = "t",
                                  .dsihash = dsi_hash(state()),
                                  .spid = "sp",
                                  .sdname = "sd",
                                  .spcert = "cert",
                                  .taid = kTaid,
                                  .ta_version = "1",
                                  .renew_aik = true,
                                  .deleteta = "true"};
  Json content = request_content(id, options, test_tsm().tsmid);
  Json chain;
  Json encrypted;
  Json extra = Json::object();
  if (id == MessageId::kGetDeviceState) chain = test_tsm().key_chain;
  if (!image_member(id).empty()) {
    encrypted = encrypted_ta(key_of(kAik), image, image_member(id));
    extra["signature2"] = signature2(key_of(kCa), "t", "r", "device-1", kTaid, "tsm1");
  }
  if (!content.is_null()) {
    content.merge_patch(patches.content);
    content = jwe_encrypt(key_of(kTee), content.dump());
  }
  const Message &message = message_of(id);
  Json tbs = tbs_request(message, options, chain, encrypted, content);
  tbs.front().merge_patch(patches.tbs);
  Json sealed = Json::parse(seal(tbs, message.request, "tsm1", test_tsm().key, extra));
  sealed.front().merge_patch(patches.envelope);
  return sealed.dump();
}

std::string text_of(const std::string &bytes) {
  Report report;
  inspect_bytes("file", bytes, all_at_hand(), &report);
  return report_text(report, false);
}

/// The lines that begin with FAILED, without their padding.
std::string failures_in(const std::string &text) {
  std::string failures;
  for (size_t at = text.find("FAILED"); at != text.npos; at = text.find("FAILED", at + 1)) {
    const std::string line = text.substr(at, text.find('\n', at) - at);
    for (size_t i = 0; i < line.size(); ++i) {
      if (line[i] != ' ' || line[i + 1] != ' ') failures += line[i];
    }
    failures += '\n';
  }
  return failures;
}

struct BrokenRequest {
  const char *name;
  MessageId id;
  Patches patches;
  std::string failure;  // the one that it must show
  std::string image = pack_image("code");
};

Bytes big_endian_key() {
  Bytes key = test_tsm().key.encoded();
  std::reverse(key.begin(), key.begin() + 4);
  return key;
}

TEST(Inspect, EachFaultOfARequestHasItsLine) {
  const std::string document = serialize_as_device(state());
  const std::string inner = serialize_as_device(state().at("dsi"));
  const std::string encoded = base64_encode(document);
  const std::string unpadded = encoded.substr(0, encoded.find('='));
  std::string url = encoded;
  std::ranges::replace(url, '+', '-');
  std::ranges::replace(url, '/', '_');
  std::string upper = dsi_hash(state());
  std::ranges::transform(upper, upper.begin(), toupper);
  const auto hash = [](const std::string &text) { return Patches{.tbs = {{"dsihash", text}}}; };
  const auto content = [](const Json &patch) { return Patches{.content = patch}; };
  const auto chain = [](const Json &patch) { return Patches{.tbs = {{"tsm_key_chain", patch}}}; };
  const auto jwe = [](const Json &patch) { return Patches{.tbs = {{"content", patch}}}; };
  const auto envelope = [](const Json &patch) { return Patches{.envelope = patch}; };
  const Json no_list =
      Json::array({tsm_entry(key_of(kStranger), "tsm1", test_tsm().key.encoded())});
  const Json big_endian = Json::array({tsm_entry(key_of(kCa), "tsm1", big_endian_key())});
  const MessageId kGet = MessageId::kGetDeviceState;
  const MessageId kCreate = MessageId::kCreateSd;
  const MessageId kInstall = MessageId::kInstallTa;

  const BrokenRequest kCases[] = {
      {"UrlAlphabet", kCreate, hash(hash_of(url)),
       "another way than the device does (URL alphabet)"},
      {"Unpadded", kCreate, hash(hash_of(unpadded)), "(no padding)"},
      {"Inner", kCreate, hash(hash_of(base64_encode(inner))), "(inner document)"},
      {"Slashes", kCreate, hash(hash_of(base64_encode(state().dump()))), "(slashes not escaped)"},
      {"NoBase64", kCreate, hash(hash_of(document)), "(no base64)"},
      {"UpperCase", kCreate, hash(upper), "expected 64 lower-case hexadecimal digits"},
      {"OtherState", kCreate, hash(hash_of("")), "not of the state"},
      {"NoRid", kCreate, {.tbs = {{"rid", nullptr}}}, "FAILED rid missing: expected a string"},
      {"Version", kCreate, {.tbs = {{"ver", "2.0"}}}, "FAILED ver 2.0: expected 1.0"},
      {"NumberAsCert", kCreate, content({{"spcert", 5}}), "spcert is 5: expected a string"},
      {"LongName", kCreate, content({{"sdname", std::string(57, 'x')}}),
       "57 bytes, expected 1 to 56"},
      {"DeleteTaTrue", MessageId::kDeleteSd, content({{"deleteta", true}}),
       "deleteta is true: expected"},
      {"RenewTrue", MessageId::kUpdateSd, content({{"changes", {{"renewteespaik", true}}}}),
       "renewteespaik is true: expected a string"},
      {"ShortTaid", kInstall, content({{"taid", "short"}}), "5 characters, expected 32"},
      {"TagChanged", kCreate, jwe({{"tag", std::string(22, 'A')}}), "fits, but the tag does not"},
      {"ShortIv", kCreate, jwe({{"iv", "AAAA"}}), "FAILED iv 3 bytes: expected 16"},
      {"OtherTee",
       kCreate,
       {.tbs = {{"content", jwe_encrypt(key_of(kStranger), "{}")}}},
       "FAILED decryption not by the TEE key"},
      {"Payload", kCreate, envelope({{"payload", "e30"}}),
       "payload is not one \"CreateSDTBSRequest\""},
      {"Signature", kCreate, envelope({{"payload", "e30"}}), "not by the TSM's key"},
      {"Padding", kCreate, envelope({{"signature", "AA=="}}), "signature has padding"},
      {"Algorithm", kCreate, envelope({{"protect", base64url_encode(R"({"alg":"none"})")}}),
       R"(expected {"alg":"RS256"})"},
      {"NoSender", kCreate, envelope({{"header", {{"tsmid", nullptr}}}}), "tsmid missing"},
      {"CaHash", kGet, chain({{"ca_tsm_hash", hash_of(key_of(kCa).encoded())}}),
       "(the encoded key, not its base64url text)"},
      {"OtherCa", kGet, chain({{"ca_tsm_hash", hash_of("")}}), "not by the CA's key"},
      {"Entry", kGet, chain({{"tsm_list", no_list}}), "encoded key: not by the CA's key"},
      {"BigEndian", kGet, chain({{"tsm_list", big_endian}}), "its lengths are big-endian"},
      {"Approval", kInstall, envelope({{"signature2", std::string(342, 'A')}}),
       "tsmid: not by the CA's key"},
      {"NoApproval", kInstall, envelope({{"signature2", nullptr}}), "signature2 missing"},
      {"ImageMember",
       MessageId::kUpdateTa,
       {.tbs = {{"encrypted_ta", {{"ciphernewtadata", nullptr}}}}},
       "ciphernewtadata missing"},
      {"NoHeader", kInstall, {}, "FAILED header none", "code"},
  };
  for (const BrokenRequest &broken : kCases) {
    SCOPED_TRACE(broken.name);
    EXPECT_EQ(failures_in(text_of(request(broken.id, {}, pack_image("code")))), "");
    const std::string text = text_of(request(broken.id, broken.patches, broken.image));
    EXPECT_NE(failures_in(text).find(broken.failure), std::string::npos) << text;
  }
}

std::string frame(uint32_t id, std::string_view text) {
  std::string bytes(OTRP_FRAME_LEN + text.size(), '\0');
  otrp_put_frame(reinterpret_cast<uint8_t *>(bytes.data()), id, text.data(),
                 static_cast<uint32_t>(text.size()));
  return bytes;
}

TEST(Inspect, EachFaultOfAnAnswerOrAFrameHasItsLine) {
  const std::string query = frame(OTRP_GET_TA_INFO, ta_info_request("sp", kTaid).dump());
  const std::string answer(8, '\0');
  const struct {
    std::string bytes;
    const char *line;
  } kCases[] = {
      {sign_response({{"CreateSDTBSResponse", refusal(1)}}, "CreateSDResponse", kStranger),
       "not by the TEE key"},
      {create_sd_response({{"status", "ok"}}), "status ok: expected pass or fail"},
      {create_sd_response(refusal("1")), "error_code missing or no number"},
      {create_sd_response({{"status", "pass"}, {"rid", "r"}, {"tid", "t"}}), "content missing"},
      {state_response("{}"), "FAILED dsi missing: expected an object"},
      {frame(OTRP_DELETE_TA, ta_info_request("sp", kTaid).dump()),
       "the request is a GetTAInfoRequest"},
      {frame(9, "{}"), "message ID 9: expected 1 to 8"},
      {query.substr(0, query.size() - 1), "the request takes 76 bytes, but 75 are left"},
      {query + "!", "frame 1 byte behind its end"},
      {answer + "behind", "no message"},
      {"\1\2\3", "neither JSON nor a frame"},
      {"", "no JSON"},
      {R"({"CreateSDRequest": )", "no JSON"},
      {R"({"FlyRequest": {}})", "FlyRequest: no message has this name"},
      {"[]", "expected an object with one member"},
      {std::string(9999, '['), "nested deeper than 64 levels"},
  };
  for (const auto &[bytes, line] : kCases) {
    const std::string text = text_of(bytes);
    EXPECT_NE((failures_in(text) + text).find(line), std::string::npos) << text;
    EXPECT_NE(failures_in(text), "") << text;
  }
}

TEST(Inspect, RefusalsAreNamedAndNoFailures) {
  const std::string text = text_of(create_sd_response(refusal(OTRP_SD_EXISTS)));
  EXPECT_EQ(failures_in(text), "");
  EXPECT_NE(text.find("0xdead0002 (OTRP_SD_EXISTS): "), std::string::npos) << text;
}

class InspectProgram : public Program {
 protected:
  InspectProgram() : Program(OTRP_TSM_PROGRAM) {}

  static size_t count(const std::string &text, std::string_view word) {
    size_t num = 0;
    for (size_t at = text.find(word); at != text.npos; at = text.find(word, at + 1)) ++num;
    return num;
  }
};

TEST_F(InspectProgram, ExamplesAreVerifiedWhereAKeyFits) {
  const std::string examples = OTRP_EXAMPLES_DIR;
  const std::string files = "inspect " + examples + "/[a-jl-z]*.json ";
  const Outcome without = run(files);
  EXPECT_EQ(without.exit_code, 0) << without.out;
  const Outcome with =
      run(files + "--key " + examples + "/keys.json --key ca=" OTRP_CA_FILE " --device " +
          examples + "/keys.json");
  EXPECT_EQ(with.exit_code, 0) << with.err;
  EXPECT_EQ(count(with.out, "\n  FAILED"), 0u) << with.out;
  EXPECT_EQ(count(with.out, "\n  not checked"), 2u) << "the AIK's private half is on the device";
  EXPECT_EQ(count(with.out, "\n  verified    signature   "), 7u + 8u + 1u) << with.out;
  EXPECT_EQ(count(with.out, "\n  verified    decryption  "), 6u + 7u) << with.out;
  EXPECT_EQ(count(with.out, "\n  verified    dsihash     "), 6u) << with.out;
}

TEST_F(InspectProgram, WhatFailedIsInTheExitCode) {
  write("message.json", R"({"CreateSDRequest": {}})");
  const Outcome outcome = run("inspect - message.json --json", "{}");
  EXPECT_EQ(outcome.exit_code, 3);
  const std::optional<Json> report = parse_json(outcome.out);
  ASSERT_TRUE(report) << outcome.out;
  EXPECT_EQ(report->at(1).at("findings").at(0).at("check"), "FAILED");
  for (const char *wrong : {"inspect missing", "inspect message.json --key message.json",
                            "inspect message.json --device message.json"}) {
    EXPECT_EQ(run(wrong).exit_code, 2) << wrong;
  }
}

TEST(ResultNames, AreFoundHoweverTheyAreWritten) {
  for (const char *text : {"0xdead0002", "DEAD0002", "3735879682", "OTRP_SD_EXISTS", "sd_exists"}) {
    const tools::ResultName *result = tools::find_result_by_text(text);
    ASSERT_NE(result, nullptr) << text;
    EXPECT_EQ(result->code, OTRP_SD_EXISTS) << text;
  }
  for (const char *text : {"", "0x", "dead", "2", "99999999999", "OTRP_"}) {
    EXPECT_EQ(tools::find_result_by_text(text), nullptr) << text;
  }
}

}  // namespace
}  // namespace tsm
