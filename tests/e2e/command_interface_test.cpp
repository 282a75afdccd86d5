// SPDX-License-Identifier: BSD-2-Clause
// The command interface from outside: parameter types, framing, buffers.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/scene.h"

namespace otrp_test {
namespace {

using testing::EndsWith;

constexpr TEEC_Result kUnknownOrMalformed = 0xDEAD0006;
constexpr TEEC_Result kProvisional = 0xDEAD000E;

std::string header(uint32_t status) {
  return word(status) + word(0);
}

struct FrameCase {
  const char *name;
  std::string input;
  TEEC_Result result;
  uint32_t status;
};

std::ostream &operator<<(std::ostream &out, const FrameCase &c) {
  return out << c.name;
}

const std::string kBlock = word(1) + "b";

const FrameCase kFrames[] = {
    {"FourBytesAreNoFrame", word(0), TEEC_ERROR_BAD_PARAMETERS, 0xA5A5A5A5},
    {"FiveBytes", word(0) + "x", TEEC_ERROR_BAD_PARAMETERS, TEEC_ERROR_BAD_PARAMETERS},
    {"EmptyFirstBlock", word(0) + word(0) + kBlock + word(1) + word(2) + "{}",
     TEEC_ERROR_BAD_PARAMETERS, TEEC_ERROR_BAD_PARAMETERS},
    {"EmptySecondBlock", word(0) + kBlock + word(0) + word(1) + word(2) + "{}",
     TEEC_ERROR_BAD_PARAMETERS, TEEC_ERROR_BAD_PARAMETERS},
    {"FirstBlockOneByteTooLong", word(0) + word(2) + "b", TEEC_ERROR_BAD_PARAMETERS,
     TEEC_ERROR_BAD_PARAMETERS},
    {"BlockLengthOfAllOnes", word(0) + word(0xFFFFFFFF) + "b", TEEC_ERROR_BAD_PARAMETERS,
     TEEC_ERROR_BAD_PARAMETERS},
    {"BlockLengthWithSignBit", word(0) + kBlock + word(0x80000000) + "b", TEEC_ERROR_BAD_PARAMETERS,
     TEEC_ERROR_BAD_PARAMETERS},
    {"NoMessageId", word(0) + kBlock + kBlock + "\1\0", TEEC_ERROR_BAD_PARAMETERS,
     TEEC_ERROR_BAD_PARAMETERS},
    {"UnknownMessage", word(0) + kBlock + kBlock + word(9) + word(2) + "{}", TEEC_SUCCESS,
     kUnknownOrMalformed},
    {"UnknownMessageWithoutText", word(0) + kBlock + kBlock + word(9), TEEC_SUCCESS,
     kUnknownOrMalformed},
    {"MessageZero", word(0) + kBlock + kBlock + word(0) + word(2) + "{}", TEEC_SUCCESS,
     kUnknownOrMalformed},
    {"NoTextLength", word(0) + kBlock + kBlock + word(1), TEEC_SUCCESS, kUnknownOrMalformed},
    {"EmptyText", word(0) + kBlock + kBlock + word(1) + word(0), TEEC_SUCCESS, kUnknownOrMalformed},
    {"TextOneByteShort", word(0) + kBlock + kBlock + word(1) + word(3) + "{}", TEEC_SUCCESS,
     kUnknownOrMalformed},
    {"TextLengthOfTheLargestInt", word(0) + kBlock + kBlock + word(1) + word(0x7FFFFFFF) + "{}",
     TEEC_SUCCESS, kUnknownOrMalformed},
    {"TextLengthWithSignBit", word(0) + kBlock + kBlock + word(1) + word(0x80000000) + "{}",
     TEEC_SUCCESS, kUnknownOrMalformed},
    {"TextLengthOfAllOnes", word(0) + kBlock + kBlock + word(1) + word(0xFFFFFFFF) + "{}",
     TEEC_SUCCESS, kUnknownOrMalformed},
    {"TextIsNoJson", word(0) + kBlock + kBlock + word(1) + word(4) + "}}}}", TEEC_SUCCESS,
     0xDEAD1002},
    {"TextHasNoRequest", word(0) + kBlock + kBlock + word(1) + word(2) + "{}", TEEC_SUCCESS,
     kUnknownOrMalformed},
};

class Framing : public testing::TestWithParam<FrameCase> {};

TEST_P(Framing, IsAnsweredInTheStatusWordAndNothingElseIsWritten) {
  AgentDevice device;
  ASSERT_TRUE(device.open());
  const size_t capacity = 64;
  const Answer answer = device.invoke(0, GetParam().input, capacity);
  EXPECT_EQ(answer.result, GetParam().result);
  const bool header_written = GetParam().status != 0xA5A5A5A5;
  const std::string untouched(capacity - (header_written ? 8 : 0), '\xA5');
  EXPECT_EQ(answer.buffer, (header_written ? header(GetParam().status) : "") + untouched);
  EXPECT_EQ(answer.size, answer.result == TEEC_SUCCESS ? 8 : capacity);
  device.expect_clean();
}

INSTANTIATE_TEST_SUITE_P(All, Framing, testing::ValuesIn(kFrames),
                         [](const auto &row) { return std::string(row.param.name); });

TEST(CommandInterface, BuffersThatAreMissingOrTooSmallAreRefused) {
  AgentDevice device;
  ASSERT_TRUE(device.open());
  const std::string input = frame(1, "{}");
  EXPECT_EQ(device.invoke(0, std::nullopt, 64).result, TEEC_ERROR_BAD_PARAMETERS);
  EXPECT_EQ(device.invoke(0, input, 0).result, TEEC_ERROR_BAD_PARAMETERS);
  EXPECT_EQ(device.invoke(0, input, 7).result, TEEC_ERROR_SHORT_BUFFER);
  EXPECT_EQ(device.invoke(0, input, 8).buffer, header(kUnknownOrMalformed));
  EXPECT_EQ(device.invoke(2, std::nullopt, 0).result, TEEC_ERROR_BAD_PARAMETERS);
  device.expect_clean();
}

TEST(CommandInterface, WrongParameterTypesReachNoHandler) {
  AgentDevice device;
  ASSERT_TRUE(device.open());
  tee::test::TraceSink log;
  for (const uint32_t types : {0x55u, 0x66u, 0x56u, 0x165u, 0x1065u, 0x00u, 0x67u}) {
    log.clear();
    const Answer answer = device.invoke(2, "x", 64, types);
    EXPECT_EQ(answer.result, TEEC_ERROR_BAD_PARAMETERS) << types;
    EXPECT_EQ(answer.buffer, std::string(64, '\xA5')) << types;
    ASSERT_EQ(log.lines().size(), 1u) << types;
    EXPECT_THAT(log.lines()[0].message, testing::StartsWith("otrp: bad param types: 0x"));
  }
}

TEST(CommandInterface, UnknownCommandsTouchNothingAndLogNothing) {
  AgentDevice device;
  ASSERT_TRUE(device.open());
  tee::test::TraceSink log;
  const Answer answer = device.invoke(3, "x", 64);
  EXPECT_EQ(answer.result, TEEC_ERROR_GENERIC);
  EXPECT_EQ(answer.buffer, std::string(64, '\xA5'));
  EXPECT_TRUE(log.lines().empty());
}

TEST(CommandInterface, DeviceIdIsTheKeyServices) {
  Scene scene;
  const Answer answer = scene.device.invoke(2, std::nullopt, 64);
  ASSERT_EQ(answer.result, TEEC_SUCCESS);
  EXPECT_EQ(answer.buffer.substr(0, answer.size), scene.info.device_id);
  EXPECT_EQ(answer.buffer.substr(answer.size), std::string(64 - answer.size, '\xA5'));
  scene.device.expect_clean();
}

TEST(CommandInterface, CapacityMustExceedTheResponseByOne) {
  Scene scene;
  const std::string text = scene.request(MessageId::kGetDeviceState, {});
  // The payload, too, goes through the output buffer; a signed response is longer than it.
  const size_t response_len = scene.device.send(1, text).response.size();
  ASSERT_GT(response_len, 0u);
  const Reply exact = scene.device.send(1, text, 8 + response_len);
  EXPECT_EQ(exact.status, kProvisional);
  EXPECT_EQ(exact.answer.size, 8u);
  EXPECT_EQ(scene.device.send(1, text, 8 + response_len + 1).status, 0u);
  const Reply tiny = scene.device.send(1, text, 100);
  EXPECT_EQ(tiny.status, 0xDEAD1002u);
  EXPECT_EQ(tiny.answer.buffer, header(0xDEAD1002) + std::string(92, '\xA5'));
  scene.device.expect_clean();
}

TEST(CommandInterface, NoByteOfThePayloadStaysInTheOutputBuffer) {
  Scene scene;
  tee::test::TraceSink log;
  const std::string marker = "MARKER-OF-THE-PAYLOAD";
  Edits no_rid;
  no_rid.tbs = [&](Json &tbs) {
    tbs.begin()->erase("rid");
    (*tbs.begin())["note"] = marker;
  };
  const std::string refused = scene.request(MessageId::kGetDeviceState, {}, no_rid);
  const Reply reply = scene.device.send(1, refused);
  EXPECT_EQ(reply.status, kUnknownOrMalformed);
  EXPECT_EQ(reply.answer.buffer.find(marker), std::string::npos);
}

TEST(StatusQuery, AnswersForRecordedAndUnknownTas) {
  Scene scene;
  scene.get_device_state();
  ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
  ASSERT_TRUE(scene.install_ta("sp1", "sd1", taid("ta1")).passed());
  const std::string found = R"({"status":"0","msg":"ta_info found in otrp"})";
  const std::string missing = R"({"status":"-1","msg":"ta_info not found in otrp"})";
  const struct {
    std::string query;
    uint32_t status;
    std::string text;
  } cases[] = {
      {R"({"taid":")" + taid("ta1") + R"(","x":1})", 0, found},
      {R"({"taid":"other"})", 0xDEAD000A, missing},
      {R"({"taid":5})", 0xDEAD000A, missing},
      {"{}", 0xDEAD000A, missing},
      {"bare", TEEC_ERROR_OUT_OF_MEMORY, missing},
  };
  for (const auto &c : cases) {
    const std::string input = word(7) + word(static_cast<uint32_t>(c.query.size())) + c.query;
    const Answer answer = scene.device.invoke(1, input, 57);
    EXPECT_EQ(answer.result, c.status) << c.query;
    EXPECT_EQ(answer.buffer.substr(0, answer.size),
              word(c.status) + word(static_cast<uint32_t>(c.text.size())) + c.text);
    const Answer short_answer = scene.device.invoke(1, input, 56);
    EXPECT_EQ(short_answer.result, TEEC_ERROR_SHORT_BUFFER);
    EXPECT_EQ(short_answer.size, 57u);
    EXPECT_EQ(short_answer.buffer, std::string(56, '\xA5'));
  }
  for (const std::string &input :
       {word(0) + word(0), word(0) + word(3) + "{}", word(0) + word(0xFFFFFFFF) + "{}"}) {
    const Answer answer = scene.device.invoke(1, input, 64);
    EXPECT_EQ(answer.result, TEEC_SUCCESS);
    EXPECT_EQ(answer.buffer, std::string(64, '\xA5'));
  }
  EXPECT_EQ(scene.device.invoke(1, "seven b", 64).result, TEEC_ERROR_BAD_PARAMETERS);
  scene.device.expect_clean();
}

}  // namespace
}  // namespace otrp_test
