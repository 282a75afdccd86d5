// SPDX-License-Identifier: BSD-2-Clause
// The exchanges in docs/examples: the device must still answer the requests as it did then.
#include "e2e/examples.h"

#include <gtest/gtest.h>

#include "common/files.h"

namespace otrp_test {
namespace {

const std::string kExamples = OTRP_EXAMPLES_DIR;

std::map<std::string, std::string> as_objects(const Json &json) {
  std::map<std::string, std::string> objects;
  for (const auto &[id, data] : json.items()) {
    objects[id] = tools::base64_decode(data.get<std::string>()).value();
  }
  return objects;
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
