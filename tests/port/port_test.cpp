// SPDX-License-Identifier: BSD-2-Clause
// A device behind any TEE Client API, as a TSM meets it. A real device is left as it was found, but
// for the TSM that makes itself known and a row in the register of images.
#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <set>

#include "common/files.h"
#include "device/device_client.h"
#include "tsm/dsi.h"
#include "tsm/image.h"
#include "tsm/request.h"
#include "tsm/response.h"

namespace {

using tsm::Json;
using tsm::MessageId;
using tsm::RequestOptions;

constexpr uint32_t kDsiMismatch = 0xDEAD0001;
constexpr uint32_t kSdExists = 0xDEAD0002;
constexpr uint32_t kBadRequest = 0xDEAD0006;

std::string environment(const char *name, const std::string &otherwise) {
  const char *value = std::getenv(name);
  return value != nullptr && *value != '\0' ? value : otherwise;
}

const tsm::Identity &the_tsm() {
  static const tsm::Identity identity = [] {
    const std::string pem = tools::read_file(environment("OTRP_TEST_CA", OTRP_DEV_CA_TSM_KEY));
    return tsm::make_identity("port-test-" + tsm::random_id(), tsm::RsaKey::from_pem(pem).value());
  }();
  return identity;
}

std::string image_of(size_t payload_len) {
  std::string payload(payload_len, '\0');
  for (size_t i = 0; i < payload_len; ++i) payload[i] = static_cast<char>(i * i >> 3);
  return tsm::pack_image(payload);
}

/// Of a host TEE, while nothing else is to be tested.
struct StateDirectory {
  StateDirectory() = default;
  StateDirectory(const StateDirectory &) = delete;
  StateDirectory &operator=(const StateDirectory &) = delete;
  ~StateDirectory() { std::filesystem::remove_all(path); }

  const std::string path = testing::TempDir() + "port-test-" + tsm::random_id();
};

class Port : public testing::Test {
 protected:
  Port() { agent_.emplace(door_, device::kAgentUuid); }
  void SetUp() override { ASSERT_NO_FATAL_FAILURE(get_device_state()); }

  tsm::DeviceInfo device_info() {
    const std::string file = environment("OTRP_TEST_DEVICE", "");
    if (!file.empty()) return tsm::parse_device_info(tools::read_file(file));
    const device::Info info = device::read_info(door_);
    return {info.device_id, tsm::RsaKey::from_encoded(info.tee_public_key).value()};
  }

  std::string request(MessageId id, RequestOptions options = {}) const {
    if (options.dsihash.empty() && !dsi_.is_null()) options.dsihash = tsm::dsi_hash(dsi_);
    return tsm::make_request(id, options, the_tsm(), info_, dsi_.is_null() ? nullptr : &dsi_);
  }

  device::Answer send(MessageId id, const std::string &text, uint32_t capacity = 4 << 20) {
    const std::string name(tsm::message_of(id).command);
    return device::send(*agent_, *device::find_message(name), text, capacity);
  }

  tsm::Response open(const device::Answer &answer) {
    tsm::Response response =
        tsm::open_response(answer.response, {info_.tee_key, the_tsm().key, &dsi_});
    if (response.dsi_text) dsi_ = tsm::parse_json(*response.dsi_text).value();
    return response;
  }

  /// One exchange that must succeed; the TA image that came back.
  std::optional<std::string> pass(MessageId id, const RequestOptions &options = {}) {
    SCOPED_TRACE(tsm::message_of(id).command);
    const device::Answer answer = send(id, request(id, options));
    EXPECT_EQ(answer.status, 0u);
    if (answer.response.empty()) return std::nullopt;
    const tsm::Response response = open(answer);
    EXPECT_FALSE(response.error_code) << std::hex << *response.error_code;
    return answer.image;
  }

  void get_device_state() {
    pass(MessageId::kGetDeviceState);
    ASSERT_TRUE(tsm::is_dsi_document(dsi_));
  }

  void restart() {
    agent_.reset();
    agent_.emplace(door_, device::kAgentUuid);
  }

  /// Security domains and AIKs as sets: a restart may order them anew.
  std::multiset<std::string> inventory() const {
    std::multiset<std::string> all;
    const Json &tee = dsi_.at("dsi").at("tee");
    for (const Json &sd : tee.at("sdlist").at("sd")) all.insert(sd.dump());
    for (const Json &aik : tee.at("teeaiklist")) all.insert(aik.dump());
    return all;
  }

  const std::string mark_ = tsm::random_id();
  const std::string sp_ = "sp-" + mark_;
  const std::string sd_ = "sd-" + mark_;
  const std::string taid_ = mark_ + mark_;

  const StateDirectory state_directory_;
  device::Device door_{environment("OTRP_TEST_CONTEXT", state_directory_.path)};
  const tsm::DeviceInfo info_ = device_info();
  std::optional<device::Session> agent_;
  Json dsi_;
};

TEST_F(Port, DeviceIdIsTheOneThatTheDeviceFileNames) {
  EXPECT_EQ(device::device_id(*agent_), info_.device_id);
}

TEST_F(Port, ALifeOfASecurityDomainLeavesTheDeviceAsItWas) {
  const auto found = inventory();
  pass(MessageId::kCreateSd, {.spid = sp_, .sdname = sd_, .spcert = "certificate"});
  const tsm::RsaKey aik = tsm::find_aik(dsi_, sp_).value();

  const std::string image = image_of(60000);
  EXPECT_EQ(pass(MessageId::kInstallTa,
                 {.spid = sp_, .sdname = sd_, .taid = taid_, .ta_version = "1.0", .image = image}),
            image);
  EXPECT_EQ(device::query(*agent_, taid_).result, TEEC_SUCCESS);

  const auto installed = inventory();
  restart();
  get_device_state();
  EXPECT_EQ(inventory(), installed);

  const tsm::Response told = open(
      send(MessageId::kGetTaInfo, request(MessageId::kGetTaInfo, {.spid = sp_, .taid = taid_})));
  EXPECT_EQ(told.members.value("ta_version", ""), "1.0");

  const std::string update = image_of(1);
  EXPECT_EQ(pass(MessageId::kUpdateTa,
                 {.spid = sp_, .sdname = sd_, .taid = taid_, .ta_version = "1.1", .image = update}),
            update);
  pass(MessageId::kUpdateSd,
       {.spid = sp_, .sdname = sd_, .spcert = "certificate 2", .renew_aik = true});
  EXPECT_NE(tsm::find_aik(dsi_, sp_).value().fingerprint(), aik.fingerprint());

  pass(MessageId::kDeleteTa, {.sdname = sd_, .taid = taid_});
  EXPECT_NE(device::query(*agent_, taid_).result, TEEC_SUCCESS);
  pass(MessageId::kDeleteSd, {.sdname = sd_, .deleteta = "true"});
  EXPECT_EQ(inventory(), found);
}

TEST_F(Port, RefusalsAreSignedAndChangeNothing) {
  const RequestOptions domain = {.spid = sp_, .sdname = sd_, .spcert = "certificate"};
  const std::string outdated = request(MessageId::kDeleteSd, {.sdname = sd_, .deleteta = "true"});
  pass(MessageId::kCreateSd, domain);
  const auto before = inventory();
  EXPECT_EQ(open(send(MessageId::kCreateSd, request(MessageId::kCreateSd, domain))).error_code,
            kSdExists);
  EXPECT_EQ(open(send(MessageId::kDeleteSd, outdated)).error_code, kDsiMismatch);
  get_device_state();
  EXPECT_EQ(inventory(), before);
  pass(MessageId::kDeleteSd, {.sdname = sd_, .deleteta = "true"});
}

TEST_F(Port, WhatIsNotARequestOfTheTsmHasNoResponse) {
  std::string changed = request(MessageId::kDeleteSd, {.sdname = sd_, .deleteta = "true"});
  char &last = changed[changed.find("\"payload\"") + 20];
  last = last == 'A' ? 'B' : 'A';
  const struct {
    const char *name;
    std::string text;
  } cases[] = {
      {"OneCharacterChanged", changed},
      {"Truncated", changed.substr(0, changed.size() / 2)},
      {"Empty", ""},
      {"OtherJson", "[1]"},
  };
  for (const auto &c : cases) {
    SCOPED_TRACE(c.name);
    const device::Answer answer = send(MessageId::kDeleteSd, c.text);
    EXPECT_NE(answer.status, 0u);
    EXPECT_EQ(answer.response, "");
  }
  EXPECT_EQ(send(MessageId::kDeleteSd, changed).status, kBadRequest);
}

TEST_F(Port, ParametersOfOtherShapesAreTurnedAway) {
  const std::string frame = device::build_frame(1, "{}");
  const struct {
    const char *name;
    uint32_t command;
    uint32_t capacity;
    uint16_t types;
    TEEC_Result result;
  } cases[] = {
      {"TwoInputs", 0, 64, 0x55, TEEC_ERROR_BAD_PARAMETERS},
      {"ThirdParameter", 0, 64, 0x165, TEEC_ERROR_BAD_PARAMETERS},
      {"Nothing", 0, 64, 0x00, TEEC_ERROR_BAD_PARAMETERS},
      {"NoRoomForTheHeader", 0, 7, 0x65, TEEC_ERROR_SHORT_BUFFER},
      {"NoSuchCommand", 3, 64, 0x65, TEEC_ERROR_GENERIC},
  };
  for (const auto &c : cases) {
    SCOPED_TRACE(c.name);
    const device::Reply reply = agent_->invoke({.command_id = c.command,
                                                .input = device::Buffer(frame),
                                                .capacity = c.capacity,
                                                .types = c.types});
    EXPECT_EQ(reply.result, c.result);
    EXPECT_EQ(reply.output.bytes(), std::string(c.capacity, static_cast<char>(device::kUntouched)));
  }
}

}  // namespace
