// SPDX-License-Identifier: BSD-2-Clause
// Keys, images and contents are overwritten before their memory is given back.
#include <gtest/gtest.h>

#include "support/scene.h"

namespace otrp_test {
namespace {

std::string aik_of(const AgentDevice &device, const std::string &spid) {
  return Json::parse(*device.record("SP_INFO_" + spid)).at("aik");
}

TEST(Wiping, NoSecretIsLeftInMemoryThatIsGivenBack) {
  tee::test::reuse_generated_keys(1);  // so that it is known what new keys will be
  const tee::test::TraceSink log;
  Scene scene;
  scene.furnish();
  const std::string aik = aik_of(scene.device, "sp1");
  const std::string d = box_records(tools::base64_decode(aik).value()).at(0x13);
  ASSERT_NE(scene.device.snapshot().key_service.at("IDENTITY").find(d), std::string::npos);
  const std::string image = make_image(100);
  const std::pair<const char *, std::string> secrets[] = {
      {"private exponent", d.substr(0, 16)},    {"its end", d.substr(240)},
      {"key box as text", aik.substr(400, 32)}, {"image", image.substr(60, 32)},
      {"content", "\"sdname\":\"sd"},
  };
  const Snapshot snapshot = scene.device.snapshot();
  for (int i = 1; i <= 8; ++i) {
    const auto id = static_cast<MessageId>(i);
    SCOPED_TRACE(tsm::message_of(id).command);
    Scene device(scene, snapshot);
    size_t num_blocks = 0;
    device.device.host().watch_freed([&](std::string_view bytes) {
      ++num_blocks;
      for (const auto &[name, secret] : secrets) {
        EXPECT_EQ(bytes.find(secret), bytes.npos) << name << " in " << bytes.size() << " bytes";
      }
    });
    ASSERT_TRUE(device.device.open());
    EXPECT_TRUE(device.get_device_state().passed());
    EXPECT_TRUE(device.run(id, usual(id)).passed());
    EXPECT_GT(num_blocks, 100u);
    device.device.close();
  }
  tee::test::reuse_generated_keys(8);
}

}  // namespace
}  // namespace otrp_test
