// SPDX-License-Identifier: BSD-2-Clause
// The command interface from outside, over the Client API alone: parameters, framing, buffers.
#include "port/any_scene.h"

namespace otrp_test {
namespace {

constexpr TEEC_Result kBad = TEEC_ERROR_BAD_PARAMETERS;
constexpr uint32_t kUnwritten = 0xA5A5A5A5;

std::string header(uint32_t status) {
  return word(status) + word(0);
}

std::string untouched(size_t len) {
  return std::string(len, static_cast<char>(device::kUntouched));
}

std::string block(const std::string &text) {
  return word(static_cast<uint32_t>(text.size())) + text;
}

class CommandInterface : public testing::Test {
 protected:
  AnyScene scene;
  ClientDevice &device = scene.device;
};

TEST_F(CommandInterface, WhatIsNoRequestIsAnsweredInTheStatusWordAtMost) {
  const std::string blocks = word(0) + block("b") + block("b");
  const std::string good = frame(1, "{}");
  const struct {
    const char *name;
    std::optional<std::string> input;
    TEEC_Result result;
    uint32_t status;
    uint32_t command = 0;
    uint16_t types = device::kMessageTypes;
    size_t capacity = 64;
  } cases[] = {
      {"FourBytes", word(0), kBad, kUnwritten},
      {"FiveBytes", word(0) + "x", kBad, kBad},
      {"EmptyFirstBlock", word(0) + word(0) + block("b") + word(1), kBad, kBad},
      {"EmptySecondBlock", word(0) + block("b") + word(0) + word(1), kBad, kBad},
      {"FirstBlockOneByteTooLong", word(0) + word(2) + "b", kBad, kBad},
      {"BlockLengthOfAllOnes", word(0) + word(~0u) + "b", kBad, kBad},
      {"NoMessageId", blocks + "\1", kBad, kBad},
      {"MessageZero", blocks + word(0) + block("{}"), TEEC_SUCCESS, kBadRequest},
      {"UnknownMessage", blocks + word(9) + block("{}"), TEEC_SUCCESS, kBadRequest},
      {"UnknownMessageWithoutText", blocks + word(9), TEEC_SUCCESS, kBadRequest},
      {"NoTextLength", blocks + word(1), TEEC_SUCCESS, kBadRequest},
      {"EmptyText", blocks + word(1) + word(0), TEEC_SUCCESS, kBadRequest},
      {"TextOneByteShort", blocks + word(1) + word(3) + "{}", TEEC_SUCCESS, kBadRequest},
      {"TextLengthOfAllOnes", blocks + word(1) + word(~0u) + "{}", TEEC_SUCCESS, kBadRequest},
      {"TextIsNoJson", blocks + word(1) + block("}}}}"), TEEC_SUCCESS, kNoMemory},
      {"TextHasNoRequest", good, TEEC_SUCCESS, kBadRequest},
      {"RoomForTheHeader", good, TEEC_SUCCESS, kBadRequest, 0, 0x65, 8},
      {"NoRoomForTheHeader", good, TEEC_ERROR_SHORT_BUFFER, kUnwritten, 0, 0x65, 7},
      {"NoInput", std::nullopt, kBad, kUnwritten},
      {"NoOutput", good, kBad, kUnwritten, 0, 0x65, 0},
      {"NoOutputForTheDeviceId", std::nullopt, kBad, kUnwritten, 2, 0x65, 0},
      {"ShortQuery", "seven b", kBad, kUnwritten, 1},
      {"EmptyQuery", word(0) + word(0) + "{}", TEEC_SUCCESS, kUnwritten, 1},
      {"QueryOneByteShort", word(0) + word(3) + "{}", TEEC_SUCCESS, kUnwritten, 1},
      {"QueryLengthOfAllOnes", word(0) + word(~0u) + "{}", TEEC_SUCCESS, kUnwritten, 1},
      {"UnknownCommand", good, TEEC_ERROR_GENERIC, kUnwritten, 3},
      {"TwoInputs", good, kBad, kUnwritten, 2, 0x55},
      {"TwoOutputs", good, kBad, kUnwritten, 2, 0x66},
      {"InputBehindOutput", good, kBad, kUnwritten, 2, 0x56},
      {"ThirdParameter", good, kBad, kUnwritten, 2, 0x165},
      {"FourthParameter", good, kBad, kUnwritten, 2, 0x1065},
      {"Nothing", good, kBad, kUnwritten, 2, 0x00},
  };
  for (const auto &c : cases) {
    SCOPED_TRACE(c.name);
    const Answer answer = device.invoke(c.command, c.input, c.capacity, c.types);
    EXPECT_TRUE(gave(c.result, answer));
    const std::string written = c.status != kUnwritten ? header(c.status) : "";
    EXPECT_EQ(answer.buffer, written + untouched(c.capacity - written.size()));
    const bool is_answered = c.command == 0 && c.result == TEEC_SUCCESS;
    EXPECT_EQ(answer.size, is_answered ? 8 : c.capacity);
  }
}

TEST_F(CommandInterface, TheDeviceIdIsTheOneThatTheTsmKnows) {
  const Answer answer = device.invoke(2, std::nullopt, 256);
  EXPECT_TRUE(gave(TEEC_SUCCESS, answer));
  EXPECT_EQ(answer.buffer.substr(0, answer.size), scene.info.device_id);
}

TEST_F(CommandInterface, CapacityMustExceedTheResponseByOne) {
  const std::string text = scene.request(MessageId::kGetDeviceState, {});
  // The payload, too, goes through the output buffer; a signed response is longer than it.
  const Reply whole = device.send(1, text);
  ASSERT_TRUE(gave(TEEC_SUCCESS, whole));
  const size_t response_len = whole.response.size();
  const Reply exact = device.send(1, text, 8 + response_len);
  EXPECT_TRUE(gave(kResponseFailed, exact));
  EXPECT_EQ(exact.answer.size, 8u);
  EXPECT_TRUE(gave(TEEC_SUCCESS, device.send(1, text, 8 + response_len + 1)));
  EXPECT_EQ(device.send(1, text, 100).answer.buffer, header(kNoMemory) + untouched(92));
}

TEST_F(CommandInterface, NoByteOfThePayloadStaysInTheOutputBuffer) {
  const std::string marker = "MARKER-OF-THE-PAYLOAD";
  const Edits edits = {.tbs = patch({{"rid", nullptr}, {"note", marker}})};
  const Outcome outcome = scene.run(MessageId::kGetDeviceState, {}, edits);
  EXPECT_TRUE(gave(kBadRequest, outcome.reply));
  EXPECT_EQ(outcome.reply.answer.buffer.find(marker), std::string::npos);
}

TEST_F(CommandInterface, StatusQueryAnswersForRecordedAndUnknownTas) {
  const std::string ta = taid(tsm::random_id());
  ASSERT_TRUE(scene.get_device_state().passed());
  ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
  ASSERT_TRUE(scene.install_ta("sp1", "sd1", ta).passed());
  const std::string found = R"({"status":"0","msg":"ta_info found in otrp"})";
  const std::string missing = R"({"status":"-1","msg":"ta_info not found in otrp"})";
  const struct {
    std::string query;
    uint32_t status;
    std::string text;
  } cases[] = {
      {R"({"taid":")" + ta + R"(","x":1})", 0, found}, {R"({"taid":"other"})", kNotFound, missing},
      {R"({"taid":5})", kNotFound, missing},           {"{}", kNotFound, missing},
      {"bare", TEEC_ERROR_OUT_OF_MEMORY, missing},
  };
  for (const auto &c : cases) {
    SCOPED_TRACE(c.query);
    const Answer answer = device.invoke(1, word(7) + block(c.query), 57);
    EXPECT_TRUE(gave(c.status, answer));
    EXPECT_EQ(answer.buffer.substr(0, answer.size), word(c.status) + block(c.text));
    const Answer short_answer = device.invoke(1, word(7) + block(c.query), 56);
    EXPECT_TRUE(gave(TEEC_ERROR_SHORT_BUFFER, short_answer));
    EXPECT_EQ(short_answer.size, 57u);
    EXPECT_EQ(short_answer.buffer, untouched(56));
  }
  ASSERT_TRUE(scene.delete_ta("sd1", ta).passed());
  ASSERT_TRUE(scene.delete_sd("sd1", "true").passed());
}

}  // namespace
}  // namespace otrp_test
