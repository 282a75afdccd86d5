// SPDX-License-Identifier: BSD-2-Clause
#include <gmock/gmock.h>
#include <sys/wait.h>
#include <tee_test.h>

#include <bit>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <nlohmann/json.hpp>
#include <vector>

#include "common/files.h"
#include "device/device_client.h"
#include "device/inspect.h"
#include "device/object_id.h"
#include "device/raw_session.h"

namespace device {
namespace {

using namespace std::string_literals;
using testing::EndsWith;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::StartsWith;

// ---- What the frames look like

TEST(Frame, HoldsEachFieldInItsPlace) {
  const std::string frame = build_frame(5, "{}");
  const size_t second_block = 4 + 4 + 11;
  ASSERT_GT(frame.size(), second_block);
  const size_t second_len = static_cast<uint8_t>(frame[second_block]);
  EXPECT_EQ(frame.substr(0, second_block), "\0\0\0\0\x0B\0\0\0otrp-device"s);
  EXPECT_NE(second_len, 0u);
  EXPECT_EQ(frame.substr(second_block + 4 + second_len), "\5\0\0\0\2\0\0\0{}"s);
  EXPECT_EQ(build_query("a\"b"), "\0\0\0\0\x0F\0\0\0{\"taid\":\"a\\\"b\"}"s);
  EXPECT_THROW(build_query("\xFF"), tools::UsageError);
}

struct AnswerCase {
  const char *name;
  std::string buffer;
  size_t size;
  bool is_understood;
  Answer answer;
};

TEST(Answer, IsTakenApartOnlyWhenItsLengthsHold) {
  const std::string full = "\0\0\0\0\2\0\0\0{}\3\0\0\0img"s;
  const std::string cut = "\2\x10\xAD\xDE\2\0\0\0{}"s;
  const AnswerCase cases[] = {
      {"Response", full, 10, true, {0, "{}", std::nullopt, 0}},
      {"ResponseAndImage", full, 17, true, {0, "{}", "img", 0}},
      {"StatusAlone", "\6\0\xAD\xDE\0\0\0\0\xA5"s, 8, true, {0xDEAD0006, "", std::nullopt, 0}},
      {"ImageDidNotFit", cut, 17, true, {0xDEAD1002, "{}", std::nullopt, 17}},
      {"RoomForAnImageThatWasNotWritten",
       "\x0E\0\xAD\xDE\0\0\0\0\xA5\xA5\xA5\xA5"s,
       1000,
       true,
       {0xDEAD000E, "", std::nullopt, 0}},
      {"NoHeader", full, 7, false, {}},
      {"Nothing", "", 0, false, {}},
      {"ResponseOneShort", full, 9, false, {}},
      {"ImageOneShort", full, 16, false, {}},
      {"ByteAfterImage", full + "\xA5", 18, false, {}},
      {"HalfAnImageLength", full, 12, false, {}},
      {"EmptyImage", "\0\0\0\0\2\0\0\0{}\0\0\0\0"s, 14, false, {}},
      {"LongerThanTheBuffer", full, 18, false, {}},
      {"HugeResponse", "\0\0\0\0\xFF\xFF\xFF\xFF{}"s, 10, false, {}},
  };
  for (const AnswerCase &c : cases) {
    SCOPED_TRACE(c.name);
    if (!c.is_understood) {
      EXPECT_THROW(parse_answer(c.buffer, c.size), Error);
      continue;
    }
    const Answer answer = parse_answer(c.buffer, c.size);
    EXPECT_EQ(answer.status, c.answer.status);
    EXPECT_EQ(answer.response, c.answer.response);
    EXPECT_EQ(answer.image, c.answer.image);
    EXPECT_EQ(answer.needed_capacity, c.answer.needed_capacity);
  }
}

// ---- What is written by hand

TEST(ObjectId, TakesTheFormThatItShows) {
  for (const std::string &id : {"SD_LIST_ID"s, "a b"s, "-\\x"s, "\0\n\x7F\xFF"s, ""s}) {
    EXPECT_EQ(parse_object_id(show_object_id(id)), id);
  }
  EXPECT_EQ(show_object_id("a\\\0\xFE"s), "a\\x5c\\x00\\xfe");
  EXPECT_EQ(parse_object_id("\\x5C\\xfEz"), "\\\xFEz");
  for (const char *bad : {"\\", "\\x", "\\x1", "\\n", "\\xg0", "a\\x 1", "\\X41"}) {
    EXPECT_THROW(parse_object_id(bad), tools::UsageError) << bad;
  }
}

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

// ---- What reaches the agent, seen by a double of it

struct AgentDouble {
  TEE_Result result = TEE_SUCCESS;
  std::string answer;
  TEE_Param seen[2];
  std::string input;
};
AgentDouble g_agent;

TEE_Result invoke_double(void *, uint32_t, uint32_t, TEE_Param params[4]) {
  const auto &in = params[0].memref;
  g_agent.seen[0] = params[0];
  g_agent.seen[1] = params[1];
  if (in.buffer != nullptr) g_agent.input.assign(static_cast<char *>(in.buffer), in.size);
  if (!g_agent.answer.empty()) {
    g_agent.answer.copy(static_cast<char *>(params[1].memref.buffer), params[1].memref.size);
    params[1].memref.size = static_cast<uint32_t>(g_agent.answer.size());
  }
  return g_agent.result;
}

struct DeviceWithDouble : tee::test::Device {
  DeviceWithDouble() {
    g_agent = {};
    register_ta(
        {.uuid = std::bit_cast<TEE_UUID>(kAgentUuid)},
        {[] { return TEE_SUCCESS; }, [] {},
         [](uint32_t, TEE_Param *, void **) { return TEE_SUCCESS; }, [](void *) {}, invoke_double});
  }
};

class Client : public testing::Test {
 protected:
  DeviceWithDouble memory_;
  Device device_{memory_.name()};
  Session agent_{device_, kAgentUuid};
};

TEST_F(Client, FailureLeavesTheWholeOutputToSee) {
  g_agent.result = TEE_ERROR_GENERIC;
  const Reply reply = agent_.invoke({.command_id = 3, .input = Buffer("in"), .capacity = 5});
  EXPECT_EQ(reply.result, TEEC_ERROR_GENERIC);
  EXPECT_EQ(reply.origin, Origin::kTrustedApp);
  EXPECT_EQ(reply.size, 5u);
  EXPECT_EQ(reply.output.bytes(), std::string(5, '\xA5'));
  EXPECT_EQ(g_agent.input, "in");
}

TEST_F(Client, AbsentAndEmptyBuffersDiffer) {
  agent_.invoke({});
  EXPECT_EQ(g_agent.seen[0].memref.buffer, nullptr);
  EXPECT_EQ(g_agent.seen[1].memref.buffer, nullptr);
  agent_.invoke({.command_id = 0, .input = Buffer("")});
  EXPECT_NE(g_agent.seen[0].memref.buffer, nullptr);
  EXPECT_EQ(g_agent.seen[0].memref.size, 0u);
}

TEST_F(Client, OtherTypesCarryTheSameBuffersOrNothing) {
  agent_.invoke({.command_id = 0, .input = Buffer("in"), .capacity = 5, .types = 0x57});
  EXPECT_EQ(g_agent.seen[0].memref.size, 2u);
  EXPECT_EQ(g_agent.seen[1].memref.size, 5u);
  g_agent.input.clear();
  const Reply reply =
      agent_.invoke({.command_id = 0, .input = Buffer("in"), .capacity = 5, .types = 0x33});
  EXPECT_EQ(g_agent.input, "");
  EXPECT_EQ(reply.size, 5u);
}

TEST_F(Client, SendTellsTheCommandsResultFromTheMessagesStatus) {
  const Message &message = *find_message("create-sd");
  g_agent.answer = "\6\0\xAD\xDE\0\0\0\0"s;
  const Answer answer = send(agent_, message, "{}", 64);
  EXPECT_EQ(g_agent.input, build_frame(5, "{}"));
  try {
    require_success(message, answer);
    ADD_FAILURE();
  } catch (const Error &error) {
    EXPECT_EQ(error.origin(), Origin::kStatusWord);
    EXPECT_THAT(error.what(), StartsWith("create-sd: 0xdead0006 (OTRP_BAD_REQUEST), status word"));
  }
  g_agent.result = TEE_ERROR_BAD_PARAMETERS;
  try {
    send(agent_, message, "{}", 64);
    ADD_FAILURE();
  } catch (const Error &error) {
    EXPECT_EQ(error.code(), TEEC_ERROR_BAD_PARAMETERS);
    EXPECT_EQ(error.origin(), Origin::kTrustedApp);
  }
}

TEST_F(Client, QueryHasAnAnswerOnlyWhenTheStatusWordAgrees) {
  g_agent.result = 0xDEAD000A;
  g_agent.answer = "\x0A\0\xAD\xDE\4\0\0\0text"s;
  const QueryAnswer answer = query(agent_, "ta");
  EXPECT_EQ(answer.result, 0xDEAD000A);
  EXPECT_EQ(answer.text, "text");
  g_agent.answer.clear();
  EXPECT_THROW(query(agent_, "ta"), Error);
  g_agent.result = TEE_SUCCESS;  // but nothing was written
  EXPECT_THROW(query(agent_, "ta"), Error);
}

TEST_F(Client, SizeBeyondTheBufferIsNotBelieved) {
  g_agent.answer = std::string(4096, 'x');
  EXPECT_THROW(device_id(agent_), Error);
}

// ---- The program, with the images of its build

struct Outcome {
  int exit_code;
  std::string out;
  std::string err;
};

class Program : public testing::Test {
 protected:
  Program() {
    std::string name = testing::TempDir() + "otrp-device-XXXXXX";
    directory_ = mkdtemp(name.data());
  }
  ~Program() override { std::filesystem::remove_all(directory_); }

  std::string path(const std::string &name) const { return directory_ + "/" + name; }

  /// `$T` in the arguments is the test's directory; standard error goes to `err`.
  Outcome run(const std::string &arguments, const std::string &input = "",
              const std::string &err = "2>$T/err") const {
    tools::write_file(path("in"), input);
    const std::string command = "T=" + directory_ + "; " OTRP_DEVICE_PROGRAM " --state $T/state " +
                                arguments + " <$T/in >$T/out " + err;
    const int status = system(command.c_str());
    return {WIFEXITED(status) ? WEXITSTATUS(status) : -1, tools::read_file(path("out")),
            std::filesystem::exists(path("err")) ? tools::read_file(path("err")) : ""};
  }

  std::string directory_;
};

/// The trace of the agent may stand before it.
bool ends_in_one_line_of_the_program(const std::string &text) {
  const size_t line = text.find("otrp-device: ");
  return line != std::string::npos && text.find('\n', line) == text.size() - 1;
}

struct InvokeCase {
  const char *name;
  int command;
  const char *input;  // NULL: no buffer
  size_t input_len;
  size_t capacity;
  const char *types;
  const char *answer;
  std::string written;  // at the front of the output buffer
};

TEST_F(Program, SessionKeepsItsContract) {
  const std::string bad_parameters = "\6\0\xFF\xFF\0\0\0\0"s;
  const std::string bad_request = "\6\0\xAD\xDE\0\0\0\0"s;
  const InvokeCase cases[] = {
      {"NoInput", 0, nullptr, 0, 64, "0x65", "0xffff0006 64", ""},
      {"FourBytes", 0, "\0\0\0\0", 4, 64, "0x65", "0xffff0006 64", ""},
      {"NoOutput", 0, "\0\0\0\0\1", 5, 0, "0x65", "0xffff0006 0", ""},
      {"NoRoomForTheHeader", 0, "\0\0\0\0\1", 5, 7, "0x65", "0xffff0010 7", ""},
      {"EmptyFirstBlock", 0, "\0\0\0\0\0\0\0\0", 8, 64, "0x65", "0xffff0006 64", bad_parameters},
      {"BlockTooLong", 0, "\0\0\0\0\xFF\xFF\xFF\xFF", 8, 9, "0x65", "0xffff0006 9", bad_parameters},
      {"UnknownMessage", 0, "\0\0\0\0\1\0\0\0a\1\0\0\0b\x09\0\0\0", 18, 64, "0x65", "0x00000000 8",
       bad_request},
      {"NoText", 0, "\0\0\0\0\1\0\0\0a\1\0\0\0b\1\0\0\0", 18, 64, "0x65", "0x00000000 8",
       bad_request},
      {"TextTooLong", 0, "\0\0\0\0\1\0\0\0a\1\0\0\0b\1\0\0\0\3\0\0\0{}", 24, 64, "0x65",
       "0x00000000 8", bad_request},
      {"ShortQuery", 1, "\0\0\0\0\0\0\0", 7, 64, "101", "0xffff0006 64", ""},
      {"EmptyQuery", 1, "\0\0\0\0\0\0\0\0", 8, 64, "101", "0x00000000 64", ""},
      {"TwoInputs", 0, "\0\0\0\0\1", 5, 64, "0x55", "0xffff0006 64", ""},
      {"Registered", 0, "\0\0\0\0\1", 5, 64, "0xed", "0xffff0006 64", ""},
      {"UnknownCommand", 3, nullptr, 0, 64, "0x65", "0xffff0000 64", ""},
  };
  std::string lines, answers;
  for (const InvokeCase &c : cases) {
    if (c.input) tools::write_file(path(c.name), {c.input, c.input_len});
    lines += "invoke " + std::to_string(c.command) + " " + (c.input ? path(c.name) : "-") + " " +
             path("out-"s + c.name) + " " + std::to_string(c.capacity) + " " + c.types + "\n";
    answers += c.answer + "\n"s;
  }
  const Outcome outcome = run("session", lines + "\nreopen\r\ninvoke 2 - /dev/null 64");
  EXPECT_EQ(outcome.exit_code, 0) << outcome.err;
  EXPECT_EQ(outcome.out, answers + "0x00000000 0\n0x00000000 32\n");
  for (const InvokeCase &c : cases) {
    SCOPED_TRACE(c.name);
    std::string output(c.capacity, '\xA5');
    output.replace(0, c.written.size(), c.written);
    EXPECT_EQ(tools::read_file(path("out-"s + c.name)), output);
  }
}

TEST_F(Program, TraceOfAnInvocationPrecedesItsAnswer) {
  const Outcome outcome =
      run("session", "invoke 0 - /dev/null 8 0x55\ninvoke 3 - /dev/null 8\n", "2>&1");
  const size_t answer = outcome.out.find("0xffff0006 8\n");
  ASSERT_NE(answer, std::string::npos) << outcome.out;
  EXPECT_LT(outcome.out.find("bad param types: 0x55"), answer);
  EXPECT_THAT(outcome.out, EndsWith("\n0xffff0000 8\n"));
}

TEST_F(Program, BadLineEndsTheSession) {
  for (const char *line :
       {"hello", "invoke 2 /nowhere/in /dev/null 8", "invoke 2 - /nowhere/o 8"}) {
    const Outcome outcome = run("session", "reopen\n"s + line + "\nreopen\n");
    EXPECT_EQ(outcome.exit_code, 2) << line;
    EXPECT_EQ(outcome.out, "0x00000000 0\n") << line;
    EXPECT_TRUE(ends_in_one_line_of_the_program(outcome.err)) << outcome.err;
    EXPECT_THAT(outcome.err, HasSubstr("line 2"));
  }
}

TEST_F(Program, WrongUsageIsOneLine) {
  for (const char *arguments :
       {"", "nonsense", "info extra", "send", "send no-message $T/in", "send create-sd $T/nowhere",
        "send create-sd $T/in --capacity 4294967296", "query", "query '\xFF'",
        "invoke 0 - -  --types 65536", "objects", "objects get", "objects get '\\x'",
        "objects put a $T/nowhere", "objects put -a $T/in", "--what info"}) {
    const Outcome outcome = run(arguments);
    EXPECT_EQ(outcome.exit_code, 2) << arguments;
    EXPECT_EQ(outcome.out, "") << arguments;
    EXPECT_TRUE(ends_in_one_line_of_the_program(outcome.err)) << arguments << ": " << outcome.err;
  }
}

TEST_F(Program, InfoNamesTheDeviceAndItsKey) {
  const Outcome info = run("info");
  ASSERT_EQ(info.exit_code, 0) << info.err;
  const nlohmann::json document = nlohmann::json::parse(info.out);
  EXPECT_EQ(document["device_id"].get<std::string>() + "\n", run("device-id").out);
  const std::string key = document["tee_public_key"];
  EXPECT_THAT(key, StartsWith("AAEAA"));  // 256 bytes of modulus
  EXPECT_THAT(key, EndsWith("DAAAAAQAB"));
}

TEST_F(Program, FailedMessageLeavesNoFile) {
  const Outcome sent =
      run("--stats send get-device-state - -o $T/response --image-out $T/image", "{}");
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

TEST_F(Program, ObjectsOfAnyNameAreStoredListedAndRemoved) {
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

TEST_F(Program, SaysThatAnotherProcessHasTheDevice) {
  const Device mine(path("state"));
  const Outcome outcome = run("device-id");
  EXPECT_EQ(outcome.exit_code, 1);
  EXPECT_THAT(outcome.err, HasSubstr("0xffff000d (TEE_ERROR_BUSY), result of the client API"));
}

}  // namespace
}  // namespace device
