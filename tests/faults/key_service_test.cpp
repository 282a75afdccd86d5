// SPDX-License-Identifier: BSD-2-Clause
// A key service that answers wrongly: every answer gets a code, and none a signature.
#include <gtest/gtest.h>

#include <cstring>

#include "support/scene.h"
#include "tsm/crypto.h"

namespace otrp_test {
namespace {

constexpr uint32_t kGetTeeKey = 2;
constexpr uint32_t kGetDeviceId = 11;

/// What the false key service answers to both questions.
struct FalseAnswer {
  TEE_Result result = TEE_SUCCESS;
  std::string bytes;
  uint32_t reported_len = 0;
  std::string device_id = "an ID";
  uint32_t reported_id_len = 5;
};
FalseAnswer answer;

TEE_Result create() {
  return TEE_SUCCESS;
}
void destroy() {}
TEE_Result open_session(uint32_t, TEE_Param[4], void **) {
  return TEE_SUCCESS;
}
void close_session(void *) {}

TEE_Result give(TEE_Param *buffer, TEE_Param *len, const std::string &bytes, uint32_t reported) {
  const size_t num = std::min<size_t>(bytes.size(), buffer->memref.size);
  std::memcpy(buffer->memref.buffer, bytes.data(), num);
  len->value.a = reported;
  return answer.result;
}

TEE_Result invoke(void *, uint32_t command, uint32_t, TEE_Param params[4]) {
  if (command == kGetTeeKey) {
    return give(&params[0], &params[1], answer.bytes, answer.reported_len);
  }
  return give(&params[1], &params[2], answer.device_id, answer.reported_id_len);
}

std::string record(uint16_t type, const std::string &value) {
  return tsm::little_endian(type, 2) + tsm::little_endian(value.size(), 2) + value;
}

struct KeyCase {
  const char *name;
  std::string box;
  uint32_t reported_len;
};

TEST(KeyService, AnyAnswerButAKeyIsRefused) {
  Scene scene;
  const std::string request = scene.request(MessageId::kGetDeviceState, {});
  const Snapshot snapshot = scene.device.snapshot();
  const std::string n(256, '\xC5');
  const std::string e("\1\0\1", 3);
  const std::string whole = record(0x11, n) + record(0x12, e) + record(0x13, n);
  const auto len = [](const std::string &bytes) { return static_cast<uint32_t>(bytes.size()); };
  const std::string no_d = record(0x11, n) + record(0x12, e);
  const std::string long_n =
      record(0x11, std::string(257, 'n')) + record(0x12, e) + record(0x13, n);
  const std::string empty_d = record(0x11, n) + record(0x12, e) + record(0x13, "");
  const std::string twice = whole + record(0x13, n);
  const KeyCase cases[] = {
      {"NoPrivateExponent", no_d, len(no_d)},
      {"CutShort", whole, len(whole) - 1},
      {"Nothing", "", 0},
      {"LengthBeyondTheBuffer", whole, 8193},
      {"LargestLength", whole, 0xFFFFFFFF},
      {"LengthBeyondTheBox", whole, len(whole) + 2},
      {"ModulusTooLong", long_n, len(long_n)},
      {"EmptyExponent", empty_d, len(empty_d)},
      {"TypeTwice", twice, len(twice)},
      {"NoKeyAtAll", whole, len(whole)},  // an even modulus is none
  };
  for (const KeyCase &c : cases) {
    SCOPED_TRACE(c.name);
    const tee::test::TraceSink log;
    AgentDevice device(snapshot);
    device.host().register_ta({.uuid = kCorvelUuid},
                              {create, destroy, open_session, close_session, invoke});
    answer = {.bytes = c.box, .reported_len = c.reported_len};
    if (c.name == std::string("NoKeyAtAll")) answer.bytes[4 + 255] = '\0';
    ASSERT_TRUE(device.open());
    const Reply reply = device.send(1, request);
    EXPECT_EQ(reply.result, TEEC_SUCCESS);
    EXPECT_NE(reply.status, 0u);
    EXPECT_TRUE(reply.response.empty());
    device.expect_clean();
  }
}

// A wrong key makes a response that no TSM takes for the device's.
TEST(KeyService, AKeyThatDoesNotMatchSignsForNoOne) {
  const tee::test::TraceSink log;
  Scene scene;
  const std::string request = scene.request(MessageId::kGetDeviceState, {});
  const std::string n = tools::base64url_decode(
                            scene.tsm().key_chain["tsm_list"][0]["tsm_pub_key"].get<std::string>())
                            .value()
                            .substr(4, 256);
  const std::string e("\1\0\1", 3);
  AgentDevice device(scene.device.snapshot());
  device.host().register_ta({.uuid = kCorvelUuid},
                            {create, destroy, open_session, close_session, invoke});
  answer = {.bytes = record(0x11, n) + record(0x12, e) + record(0x13, std::string(256, '\x51'))};
  answer.reported_len = static_cast<uint32_t>(answer.bytes.size());
  ASSERT_TRUE(device.open());
  const Reply reply = device.send(1, request);
  device.expect_clean();
  if (reply.status != 0) return;
  EXPECT_THROW(tsm::open_response(reply.response, {scene.info.tee_key, scene.tsm().key}),
               tsm::NotVerified);
}

TEST(KeyService, ADeviceIdIsBelievedOnlyWithinItsBuffer) {
  const struct {
    std::string id;
    uint32_t reported;
    TEEC_Result result;
  } cases[] = {{"an ID", 5, TEEC_SUCCESS},
               {"", 0, TEEC_SUCCESS},
               {"x", 63, TEEC_SUCCESS},
               {"x", 64, TEE_ERROR_EXCESS_DATA},
               {"x", 0xFFFFFFFF, TEE_ERROR_EXCESS_DATA}};
  for (const auto &c : cases) {
    SCOPED_TRACE(c.reported);
    const tee::test::TraceSink log;
    AgentDevice device;
    device.host().register_ta({.uuid = kCorvelUuid},
                              {create, destroy, open_session, close_session, invoke});
    answer = {.device_id = c.id, .reported_id_len = c.reported};
    ASSERT_TRUE(device.open());
    const Answer got = device.invoke(2, "", 63);
    EXPECT_EQ(got.result, c.result);
    if (c.result == TEEC_SUCCESS) {
      EXPECT_EQ(got.size, c.reported);
    }
    device.expect_clean();
  }
}

}  // namespace
}  // namespace otrp_test
