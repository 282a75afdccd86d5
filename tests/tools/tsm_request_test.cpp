// SPDX-License-Identifier: BSD-2-Clause
#include <gtest/gtest.h>

#include "common/error_line.h"
#include "tsm/dsi.h"
#include "tsm/image.h"
#include "tsm/request.h"
#include "tsm/trust.h"
#include "tsm_fake_device.h"

namespace tsm {
namespace {

RequestOptions full_options() {
  RequestOptions options;
  options.rid = "rid1";
  options.tid = "tid/1";
  options.dsihash = dsi_hash(test_dsi());
  options.spid = "sp";
  options.sdname = "sd";
  options.spcert = "cert";
  options.taid = "ta";
  options.ta_version = "1.0";
  options.image = pack_image("code");
  options.renew_aik = true;
  options.deleteta = "false";
  return options;
}

/// What a device makes of a request: every step here must succeed.
struct Received {
  Json envelope;
  Json members;  // of the to-be-signed request
  Json content;
};

Received receive(const Message &message, const std::string &request) {
  Received received;
  const Json root = parse_json(request).value();
  received.envelope = root.at(std::string(message.request));
  const std::string protect = received.envelope.at("protect");
  const std::string payload = received.envelope.at("payload");
  const Bytes signature =
      base64url_decode(received.envelope.at("signature").get<std::string>()).value();
  EXPECT_TRUE(rs256_verify(test_tsm().key, protect + "." + payload, signature));
  EXPECT_EQ(received.envelope.at("header").dump(), R"({"tsmid":"tsm1"})");

  const Json tbs = parse_json(base64url_decode(payload).value()).value();
  received.members = tbs.at(std::string(message.tbs_request));
  if (received.members.contains("content")) {
    received.content =
        parse_json(jwe_decrypt(tee_key(), received.members.at("content")).value()).value();
  }
  return received;
}

TEST(Request, EveryMessageCarriesItsMembersInOrder) {
  const struct {
    MessageId id;
    const char *members;
    const char *content;
  } kCases[] = {
      {MessageId::kGetDeviceState, "ver rid tid tsm_key_chain ", "null"},
      {MessageId::kInstallTa, "ver rid tid dsihash encrypted_ta content ",
       R"({"spid":"sp","taid":"ta","sdname":"sd","ta_version":"1.0"})"},
      {MessageId::kUpdateTa, "ver rid tid dsihash encrypted_ta content ",
       R"({"spid":"sp","taid":"ta","sdname":"sd","ta_version":"1.0"})"},
      {MessageId::kDeleteTa, "ver rid tid dsihash content ",
       R"({"tsmid":"tsm1","sdname":"sd","taid":"ta"})"},
      {MessageId::kCreateSd, "ver rid tid dsihash content ",
       R"({"spid":"sp","sdname":"sd","spcert":"cert","tsmid":"tsm1","did":"device-1"})"},
      {MessageId::kUpdateSd, "ver rid tid dsihash content ",
       R"({"tsmid":"tsm1","spid":"sp","sdname":"sd",)"
       R"("changes":{"renewteespaik":"true","spcert":"cert"}})"},
      {MessageId::kDeleteSd, "ver rid tid dsihash content ",
       R"({"tsmid":"tsm1","sdname":"sd","deleteta":"false"})"},
  };
  const Json dsi = test_dsi();
  for (const auto &row : kCases) {
    const Message &message = message_of(row.id);
    SCOPED_TRACE(message.command);
    RequestOptions options = full_options();
    if (row.id == MessageId::kGetDeviceState) options.dsihash.clear();
    const Received received =
        receive(message, make_request(row.id, options, test_tsm(), test_device(), &dsi));
    std::string names;
    for (const auto &member : received.members.items()) names += member.key() + " ";
    EXPECT_EQ(names, row.members);
    EXPECT_EQ(received.content.dump(), row.content);
    EXPECT_EQ(received.envelope.contains("signature2"), !image_member(row.id).empty());
  }
}

TEST(Request, ImageAndSecondSignatureAreAsTheDeviceChecksThem) {
  const Json dsi = test_dsi();
  const RequestOptions options = full_options();
  const Received received =
      receive(message_of(MessageId::kUpdateTa),
              make_request(MessageId::kUpdateTa, options, test_tsm(), test_device(), &dsi));

  const Json &image = received.members.at("encrypted_ta");
  const auto bytes = [&image](const char *name) {
    return base64url_decode(image.at(name).get<std::string>()).value();
  };
  const Bytes key = rsa1_5_decrypt(aik_key(), bytes("key")).value();
  ASSERT_EQ(key.size(), 32u);
  EXPECT_EQ(aes_cbc_decrypt(key.substr(16), bytes("iv"), bytes("ciphernewtadata")), options.image);

  const Bytes second =
      base64url_decode(received.envelope.at("signature2").get<std::string>()).value();
  EXPECT_TRUE(rs256_verify(ca_key(), "tid/1rid1device-1tatsm1", second));
}

TEST(Request, KeyChainEntryIsSignedOverItsBlock) {
  EXPECT_EQ(hex_encode(tsm_entry_block(3, 256)), "304800700300000103000001");

  const Json &chain = test_tsm().key_chain;
  EXPECT_EQ(chain.at("ca_tsm_hash"), hex_encode(sha256(base64url_encode(ca_key().encoded()))));
  const Json &entry = chain.at("tsm_list").at(0);
  const Bytes key = base64url_decode(entry.at("tsm_pub_key").get<std::string>()).value();
  EXPECT_EQ(key, test_tsm().key.encoded());
  const Bytes block = hex_decode("304800700300000104000001").value();
  EXPECT_TRUE(rs256_verify(ca_key(), block + "tsm1" + key,
                           base64url_decode(entry.at("signature").get<std::string>()).value()));
}

TEST(Request, TaInfoIsAskedInPlain) {
  EXPECT_EQ(make_request(MessageId::kGetTaInfo, full_options(), test_tsm(), test_device(), nullptr),
            R"({"GetTAInfoRequest":{"spid":"sp","taid":"ta"}})");
}

TEST(Request, WhatCannotBeMadeIsExplained) {
  const Json dsi = test_dsi();
  Identity without_ca = test_tsm();
  without_ca.ca.reset();
  RequestOptions unknown_sp = full_options();
  unknown_sp.spid = "other";
  RequestOptions not_utf8 = full_options();
  not_utf8.spcert = "\xFF";
  const auto make = [&](MessageId id, const RequestOptions &options, const Identity &tsm) {
    return make_request(id, options, tsm, test_device(), &dsi);
  };
  EXPECT_THROW(make(MessageId::kInstallTa, full_options(), without_ca), tools::UsageError);
  EXPECT_THROW(make(MessageId::kInstallTa, unknown_sp, test_tsm()), tools::UsageError);
  EXPECT_THROW(make(MessageId::kCreateSd, not_utf8, test_tsm()), tools::UsageError);
}

TEST(Image, HeaderCarriesTheDigestOfThePayload) {
  Bytes image = pack_image("payload");
  EXPECT_EQ(hex_encode(image.substr(16, 4)), "20000000");
  EXPECT_EQ(image.substr(20, 32), sha256("payload"));
  EXPECT_TRUE(parse_image(image)->digest_matches);
  EXPECT_EQ(parse_image(image)->payload, "payload");
  EXPECT_TRUE(parse_image(pack_image(""))->digest_matches);
  EXPECT_FALSE(parse_image(image.substr(0, kImageHeaderLen - 1)));
  image.back() = '!';
  EXPECT_FALSE(parse_image(image)->digest_matches);
  image[16] = 48;
  EXPECT_FALSE(parse_image(image));
}

}  // namespace
}  // namespace tsm
