// SPDX-License-Identifier: BSD-2-Clause
#include <gmock/gmock.h>
#include <tee_test.h>

#include <bit>
#include <vector>

#include "device/device_client.h"
#include "device/inspect.h"
#include "device/raw_session.h"
#include "program.h"

namespace device {
namespace {

using namespace std::string_literals;
using testing::EndsWith;
using testing::HasSubstr;

struct AnswerCase {
  const char *name;
  std::string buffer;
  size_t size;
  std::optional<Answer> answer;
};

TEST(Answer, IsTakenApartOnlyWhenItsLengthsHold) {
  const std::string full = "\0\0\0\0\2\0\0\0{}\3\0\0\0img"s;
  const std::string cut = "\2\x10\xAD\xDE\2\0\0\0{}"s;
  const std::string unwritten = "\x0E\0\xAD\xDE\0\0\0\0\xA5\xA5\xA5\xA5"s;
  const AnswerCase cases[] = {
      {"Response", full, 10, Answer{0, "{}", std::nullopt, 0}},
      {"ResponseAndImage", full, 17, Answer{0, "{}", "img", 0}},
      {"StatusAlone", "\6\0\xAD\xDE\0\0\0\0\xA5"s, 8, Answer{0xDEAD0006, "", std::nullopt, 0}},
      {"ImageDidNotFit", cut, 17, Answer{0xDEAD1002, "{}", std::nullopt, 17}},
      {"ImageNotWritten", unwritten, 1000, Answer{0xDEAD000E, "", std::nullopt, 0}},
      {"NoHeader", full, 7, {}},
      {"ResponseOneShort", full, 9, {}},
      {"ImageOneShort", full, 16, {}},
      {"ByteAfterImage", full + "\xA5", 18, {}},
      {"EmptyImage", "\0\0\0\0\2\0\0\0{}\0\0\0\0"s, 14, {}},
      {"LongerThanTheBuffer", full, 18, {}},
  };
  for (const AnswerCase &c : cases) {
    SCOPED_TRACE(c.name);
    if (!c.answer) {
      EXPECT_THROW(parse_answer(c.buffer, c.size), Error);
      continue;
    }
    const Answer answer = parse_answer(c.buffer, c.size);
    EXPECT_EQ(answer.status, c.answer->status);
    EXPECT_EQ(answer.response, c.answer->response);
    EXPECT_EQ(answer.image, c.answer->image);
    EXPECT_EQ(answer.needed_capacity, c.answer->needed_capacity);
  }
}

// ---- What is written by hand

TEST(SessionLine, IsReadWholeOrNotAtAll) {
  EXPECT_EQ(parse_session_line("invoke 0x10 in out 8"), (Invocation{16, "in", "out", 8, 0x65}));
  EXPECT_EQ(parse_session_line(" invoke\t4294967295  - - 0 0xfFFF\r"),
            (Invocation{UINT32_MAX, "-", "-", 0, 0xFFFF}));
  EXPECT_EQ(parse_session_line("reopen\r"), std::nullopt);
  for (const char *bad :
       {"invoke 0 in out", "invoke 0 in out 8 0x65 more", "reopen now", "Reopen",
        "invoke 0x in out 8", "invoke -1 in out 8", "invoke 4294967296 in out 8",
        "invoke 0 in out 8k", "invoke 0 in out 8 0x10000", "invoke 0 in out 0x"}) {
    EXPECT_THROW(parse_session_line(bad), tools::UsageError) << bad;
  }
}

// ---- What the agent answers, told by a double of it

TEE_Result g_result;
std::string g_answer;

TEE_Result answer_as_told(void *, uint32_t, uint32_t, TEE_Param params[4]) {
  if (g_answer.empty()) return g_result;
  g_answer.copy(static_cast<char *>(params[1].memref.buffer), params[1].memref.size);
  params[1].memref.size = static_cast<uint32_t>(g_answer.size());
  return g_result;
}

TEST(Client, BelievesOnlyAnswersThatAgree) {
  tee::test::Device memory;
  memory.register_ta(
      {.uuid = std::bit_cast<TEE_UUID>(kAgentUuid)},
      {[] { return TEE_SUCCESS; }, [] {},
       [](uint32_t, TEE_Param *, void **) { return TEE_SUCCESS; }, [](void *) {}, answer_as_told});
  Device device(memory.name());
  Session agent(device, kAgentUuid);
  g_result = 0xDEAD000A;
  g_answer = "\x0A\0\xAD\xDE\4\0\0\0text"s;
  EXPECT_EQ(query(agent, "ta").text, "text");
  g_answer.clear();
  EXPECT_THROW(query(agent, "ta"), Error);
  g_result = TEE_SUCCESS;  // but nothing was written
  EXPECT_THROW(query(agent, "ta"), Error);
  g_answer = std::string(4096, 'x');  // more than there is room for
  EXPECT_THROW(device_id(agent), Error);
}

// ---- The program, with the images of its build

class DeviceProgram : public Program {
 protected:
  DeviceProgram() : Program(OTRP_DEVICE_PROGRAM " --state state") {}
};

/// The trace of the agent may stand before it.
bool ends_in_one_line_of_the_program(const std::string &text) {
  const size_t line = text.find("otrp-device: ");
  return line != std::string::npos && text.find('\n', line) == text.size() - 1;
}

TEST_F(DeviceProgram, SessionKeepsItsContract) {
  const std::string framed = "\0\0\0\0\1\0\0\0a\1\0\0\0b\1\0\0\0"s;
  struct {
    std::string invocation, input;
    const char *answer;
    std::string written;  // at the front of the output buffer
    size_t capacity;
  } const cases[] = {
      {"0 - out0 64", "", "0xffff0006 64", "", 64},
      {"0 in1 out1 0", "\0\0\0\0\1"s, "0xffff0006 0", "", 0},
      {"0 in2 out2 7", "\0\0\0\0\1"s, "0xffff0010 7", "", 7},
      {"0 in3 out3 9", "\0\0\0\0\0\0\0\0"s, "0xffff0006 9", "\6\0\xFF\xFF\0\0\0\0"s, 9},
      {"0 in4 out4 64 0x65", framed, "0x00000000 8", "\6\0\xAD\xDE\0\0\0\0"s, 64},
      {"1 in5 out5 64 101", "\0\0\0\0\0\0\0\0"s, "0x00000000 64", "", 64},
      {"0 in6 out6 64 0x55", framed, "0xffff0006 64", "", 64},
  };
  std::string lines, answers;
  for (size_t i = 0; i < std::size(cases); ++i) {
    write("in" + std::to_string(i), cases[i].input);
    lines += "invoke " + cases[i].invocation + "\n";
    answers += cases[i].answer + "\n"s;
  }
  const Outcome outcome = run("session", lines + "\nreopen\r\ninvoke 2 - /dev/null 64");
  EXPECT_EQ(outcome.exit_code, 0) << outcome.err;
  EXPECT_EQ(outcome.out, answers + "0x00000000 0\n0x00000000 32\n");
  for (size_t i = 0; i < std::size(cases); ++i) {
    std::string output(cases[i].capacity, '\xA5');
    output.replace(0, cases[i].written.size(), cases[i].written);
    EXPECT_EQ(read("out" + std::to_string(i)), output) << i;
  }
}

TEST_F(DeviceProgram, TraceOfAnInvocationPrecedesItsAnswer) {
  const std::string log =
      run("session 2>&1", "invoke 0 - /dev/null 8 0x55\ninvoke 3 - /dev/null 8\n").out;
  EXPECT_LT(log.find("bad param types: 0x55"), log.find("0xffff0006 8\n")) << log;
  EXPECT_THAT(log, EndsWith("\n0xffff0000 8\n"));
}

TEST_F(DeviceProgram, BadLineEndsTheSession) {
  for (const char *line :
       {"hello", "invoke 2 /nowhere/in /dev/null 8", "invoke 2 - /nowhere/o 8"}) {
    const Outcome outcome = run("session", "reopen\n"s + line + "\nreopen\n");
    EXPECT_EQ(outcome.exit_code, 2) << line;
    EXPECT_EQ(outcome.out, "0x00000000 0\n") << line;
    EXPECT_TRUE(ends_in_one_line_of_the_program(outcome.err)) << outcome.err;
    EXPECT_THAT(outcome.err, HasSubstr("line 2"));
  }
}

TEST_F(DeviceProgram, WrongUsageIsOneLine) {
  for (const char *arguments :
       {"", "nonsense", "info extra", "send", "send no-message in", "send create-sd nowhere",
        "send create-sd in --capacity 4294967296", "query", "query '\xFF'",
        "invoke 0 - -  --types 65536", "objects", "objects get", "objects get '\\x1'",
        "objects get '\\n'", "objects get '\\xg0'", "objects put a nowhere", "objects put -a in",
        "--what info"}) {
    const Outcome outcome = run(arguments);
    EXPECT_EQ(outcome.exit_code, 2) << arguments;
    EXPECT_EQ(outcome.out, "") << arguments;
    EXPECT_TRUE(ends_in_one_line_of_the_program(outcome.err)) << arguments << ": " << outcome.err;
  }
}

TEST_F(DeviceProgram, FailedMessageLeavesNoFile) {
  const Outcome sent = run("--stats send get-device-state - -o response --image-out image", "{}");
  EXPECT_EQ(sent.exit_code, 1);
  EXPECT_EQ(sent.out, "");
  EXPECT_THAT(sent.err, HasSubstr("get-device-state: 0xdead"));
  EXPECT_THAT(sent.err, HasSubstr("\nstats: heap_size 2097152\n"));
  EXPECT_FALSE(std::filesystem::exists(path("response")));
  EXPECT_FALSE(std::filesystem::exists(path("image")));
  const Outcome asked = run("query 00112233445566778899aabbccddeeff");
  EXPECT_EQ(asked.exit_code, 1);
  EXPECT_EQ(asked.out, "{\"status\":\"-1\",\"msg\":\"ta_info not found in otrp\"}\n");
}

TEST_F(DeviceProgram, MakesNoDeviceUnnoticed) {
  const Outcome refused = run("--existing info");
  EXPECT_EQ(refused.exit_code, 2);
  EXPECT_THAT(refused.err, HasSubstr("otrp-device: there is no device in state"));
  EXPECT_FALSE(std::filesystem::exists(path("state")));
  EXPECT_EQ(run("info").err, "note: made a new device in " + path("state") + "\n");
  EXPECT_EQ(run("--existing info").err, "");
}

TEST_F(DeviceProgram, LogOfTheAgentIsShownWithFailuresOrWhenItIsWanted) {
  for (const auto &[command, is_shown] : {std::pair("device-id", false),
                                          {"device-id --trace", true},
                                          {"query unknown", true},
                                          {"invoke 2 - /dev/null --capacity 64", true}}) {
    std::filesystem::remove_all(path("state"));  // the first start has something to log
    EXPECT_EQ(run(command).err.find("ERR [") != std::string::npos, is_shown) << command;
  }
}

TEST_F(DeviceProgram, ObjectsOfAnyNameAreStoredListedAndRemoved) {
  const std::string data = "\0raw\xFF"s;
  EXPECT_EQ(run("objects put -- '-\\x00\\x5c' -", data).exit_code, 0);
  EXPECT_EQ(run("objects put plain -", "").exit_code, 0);
  EXPECT_EQ(run("objects list").out, "-\\x00\\x5c\t5\nplain\t0\n");
  EXPECT_EQ(run("objects get -- '-\\x00\\x5c'").out, data);
  EXPECT_EQ(run("objects rm -- '-\\x00\\x5c'").exit_code, 0);
  const Outcome again = run("objects rm -- '-\\x00\\x5c'");
  EXPECT_EQ(again.exit_code, 1);
  EXPECT_TRUE(ends_in_one_line_of_the_program(again.err)) << again.err;
  EXPECT_THAT(again.err, HasSubstr("0xffff0008 (TEE_ERROR_ITEM_NOT_FOUND)"));
}

}  // namespace
}  // namespace device
