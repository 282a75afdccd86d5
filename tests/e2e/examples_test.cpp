// SPDX-License-Identifier: BSD-2-Clause
// The exchanges in docs/examples: the device must still answer the requests as it did then.
//
// With OTRP_WRITE_EXAMPLES set to a folder, the test writes them anew.
#include <gtest/gtest.h>

#include <filesystem>

#include "common/files.h"
#include "support/scene.h"
#include "tsm/dsi.h"

namespace otrp_test {
namespace {

const std::string kExamples = OTRP_EXAMPLES_DIR;

struct Step {
  MessageId id;
  tsm::RequestOptions options;
};

const std::string kTa = taid("pay");

tsm::RequestOptions bring_ta(const char *version, const std::string &image) {
  return {.spid = "bank", .sdname = "wallet", .taid = kTa, .ta_version = version, .image = image};
}

const Step kSteps[] = {
    {MessageId::kGetDeviceState, {}},
    {MessageId::kCreateSd, {.spid = "bank", .sdname = "wallet", .spcert = "certificate"}},
    {MessageId::kInstallTa, bring_ta("1.0", make_image(64))},
    {MessageId::kUpdateTa, bring_ta("1.1", make_image(64, 2))},
    {MessageId::kGetTaInfo, {.spid = "bank", .taid = kTa}},
    {MessageId::kUpdateSd,
     {.spid = "bank", .sdname = "wallet", .spcert = "new certificate", .renew_aik = true}},
    {MessageId::kDeleteTa, {.sdname = "wallet", .taid = kTa}},
    {MessageId::kDeleteSd, {.sdname = "wallet", .deleteta = "true"}},
};

std::string file_of(const std::string &folder, MessageId id) {
  return folder + "/" + std::string(tsm::message_of(id).command) + ".json";
}

Json as_json(const std::map<std::string, std::string> &objects) {
  Json json = Json::object();
  for (const auto &[id, data] : objects) json[id] = tools::base64_encode(data);
  return json;
}

std::map<std::string, std::string> as_objects(const Json &json) {
  std::map<std::string, std::string> objects;
  for (const auto &[id, data] : json.items()) {
    objects[id] = tools::base64_decode(data.get<std::string>()).value();
  }
  return objects;
}

void write_json(const std::string &file, const Json &json) {
  tools::write_file(file, json.dump(2) + "\n");
}

/// The TEE key of the key service's record: the device ID, then {type, length, value} three times.
Json tee_key_of(const std::string &identity) {
  Json key = {{"kty", "RSA"}};
  size_t at = 32;
  for (const char *name : {"n", "e", "d"}) {
    const size_t len = word_at(identity, at) >> 16;
    key[name] = tools::base64url_encode(identity.substr(at + 4, len));
    at += 4 + len;
  }
  return key;
}

void write_examples(const std::string &folder) {
  std::filesystem::create_directories(folder);
  Scene scene;
  const tsm::Identity &tsm = scene.tsm();
  write_json(folder + "/keys.json",
             {{"tsmid", tsm.tsmid},
              {"tsm_key", tsm.key.private_pem()},
              {"device_id", scene.info.device_id},
              {"tee_public_key", tools::base64url_encode(scene.info.tee_key.encoded())},
              {"tee_key", tee_key_of(scene.device.snapshot().key_service.at("IDENTITY"))},
              {"key_service", as_json(scene.device.snapshot().key_service)}});
  for (const Step &step : kSteps) {
    const Json before = as_json(scene.device.objects());
    const std::string request = scene.request(step.id, step.options);
    const std::string dsi = scene.dsi_text;
    const Outcome outcome = scene.send(step.id, request);
    ASSERT_TRUE(outcome.response);
    write_json(file_of(folder, step.id), {{"request", Json::parse(request)},
                                          {"response", Json::parse(outcome.reply.response)},
                                          {"device_state_before", dsi},
                                          {"objects_before", before}});
  }
}

/// Without what differs from one answer to the next: keys that were made for it, encrypted texts.
Json masked(Json json) {
  for (const auto &[name, value] : json.items()) {
    if (value.is_structured()) value = masked(value);
    for (const char *fresh : {"teespaik", "spaik", "encrypted_key", "iv", "ciphertext", "tag"}) {
      if (json.is_object() && name == fresh) value = "*";
    }
  }
  return json;
}

TEST(Examples, AreAnsweredAsTheyWereThen) {
  const char *folder = std::getenv("OTRP_WRITE_EXAMPLES");
  if (folder != nullptr) return write_examples(folder);

  const tee::test::TraceSink log;
  const Json keys = Json::parse(tools::read_file(kExamples + "/keys.json"));
  const tsm::RsaKey tsm_key = tsm::RsaKey::from_pem(keys["tsm_key"].get<std::string>()).value();
  const tsm::RsaKey tee_key =
      tsm::RsaKey::from_encoded(
          tools::base64url_decode(keys["tee_public_key"].get<std::string>()).value())
          .value();
  for (const Step &step : kSteps) {
    SCOPED_TRACE(std::string(tsm::message_of(step.id).command));
    const Json example = Json::parse(tools::read_file(file_of(kExamples, step.id)));
    AgentDevice device({as_objects(example["objects_before"]), as_objects(keys["key_service"])});
    ASSERT_TRUE(device.open());
    const Reply reply = device.send(static_cast<uint32_t>(step.id), example["request"].dump());
    ASSERT_EQ(reply.status, 0u);

    const Json dsi =
        tsm::parse_json(example["device_state_before"].get<std::string>()).value_or(nullptr);
    const tsm::ResponseKeys open_with = {tee_key, tsm_key, &dsi};
    const tsm::Response then = tsm::open_response(example["response"].dump(), open_with);
    const tsm::Response now = tsm::open_response(reply.response, open_with);
    EXPECT_EQ(masked(now.members), masked(then.members));
    EXPECT_EQ(masked(now.content), masked(then.content));
    EXPECT_EQ(now.header, then.header);
    EXPECT_EQ(reply.image.has_value(), !step.options.image.empty());
    EXPECT_EQ(reply.image.value_or(""), step.options.image);
    device.expect_clean();
  }
}

}  // namespace
}  // namespace otrp_test
