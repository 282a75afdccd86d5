// SPDX-License-Identifier: BSD-2-Clause
// A key service that answers wrongly: every answer gets a code, and none a signature.
#include <gtest/gtest.h>

#include <cstring>

#include "support/scene.h"

namespace otrp_test {
namespace {

constexpr uint32_t kGetTeeKey = 2;

/// What the false key service answers: a length that it reports, and bytes.
struct FalseAnswer {
  std::string bytes;
  uint32_t reported_len = 0;
};
FalseAnswer the_key;
FalseAnswer the_device_id;

TEE_Result invoke(void *, uint32_t command, uint32_t, TEE_Param params[4]) {
  const FalseAnswer &answer = command == kGetTeeKey ? the_key : the_device_id;
  TEE_Param *buffer = command == kGetTeeKey ? &params[0] : &params[1];
  std::memcpy(buffer->memref.buffer, answer.bytes.data(),
              std::min<size_t>(answer.bytes.size(), buffer->memref.size));
  buffer[1].value.a = answer.reported_len;
  return TEE_SUCCESS;
}

const tee_ta_entry_points kFalseKeyService = {
    [] { return TEE_SUCCESS; }, [] {}, [](uint32_t, TEE_Param[4], void **) { return TEE_SUCCESS; },
    [](void *) {}, invoke};

class KeyService : public testing::Test {
 protected:
  KeyService() { device.host().register_ta({.uuid = kCorvelUuid}, kFalseKeyService); }
  void SetUp() override {
    scene.get_device_state();
    the_device_id = {"an ID", 5};
    ASSERT_TRUE(device.open());
  }
  void TearDown() override { device.expect_clean(); }

  Reply ask(const FalseAnswer &key) {
    the_key = key;
    return device.send(1, scene.request(MessageId::kGetDeviceState, {}));
  }

  const tee::test::TraceSink log;
  Scene scene;
  AgentDevice device{scene.device.snapshot()};
};

const std::string kExponent("\1\0\1", 3);

TEST_F(KeyService, AnyAnswerButAKeyIsRefused) {
  const std::string n(256, '\xC5');
  const std::string even_n = n.substr(1) + '\0';
  const std::string no_d = box_record(0x11, n) + box_record(0x12, kExponent);
  const std::string whole = no_d + box_record(0x13, n);
  const auto len = static_cast<uint32_t>(whole.size());
  const struct {
    const char *name;
    std::string box;
    uint32_t reported_len;
  } cases[] = {
      {"NoPrivateExponent", no_d, len - 260},
      {"EmptyPrivateExponent", no_d + box_record(0x13, ""), len - 256},
      {"TypeTwice", whole + box_record(0x13, n), len + 260},
      {"ModulusTooLong", box_record(0x11, n + "n") + whole.substr(260), len + 1},
      {"ModulusIsEven", box_record(0x11, even_n) + whole.substr(260), len},
      {"Nothing", "", 0},
      {"CutShort", whole, len - 1},
      {"LengthBeyondTheBuffer", whole, 8193},
      {"LargestLength", whole, 0xFFFFFFFF},
  };
  for (const auto &c : cases) {
    SCOPED_TRACE(c.name);
    const Reply reply = ask({c.box, c.reported_len});
    EXPECT_EQ(reply.result, TEEC_SUCCESS);
    EXPECT_NE(reply.status, 0u);
    EXPECT_TRUE(reply.response.empty());
    device.expect_clean();
  }
}

// The platform signs with what it is given: no TSM takes the response for the device's.
TEST_F(KeyService, AKeyThatDoesNotMatchSignsForNoOne) {
  const std::string n = scene.tsm().key.encoded().substr(4, 256);
  const std::string box = box_record(0x11, n) + box_record(0x12, kExponent) +
                          box_record(0x13, std::string(256, '\x51'));
  const Reply reply = ask({box, static_cast<uint32_t>(box.size())});
  ASSERT_EQ(reply.status, 0u);
  EXPECT_THROW(tsm::open_response(reply.response, {scene.info.tee_key, scene.tsm().key}),
               tsm::NotVerified);
}

TEST_F(KeyService, ADeviceIdIsBelievedOnlyWithinItsBuffer) {
  for (const uint32_t len : {0u, 5u, 63u, 64u, 0xFFFFFFFF}) {
    SCOPED_TRACE(len);
    the_device_id = {"an ID", len};
    const Answer got = device.invoke(2, "", 63);
    EXPECT_EQ(got.result, len < 64 ? TEEC_SUCCESS : TEE_ERROR_EXCESS_DATA);
    EXPECT_EQ(got.size, len < 64 ? len : 63);
    device.expect_clean();
  }
}

}  // namespace
}  // namespace otrp_test
