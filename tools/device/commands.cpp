// SPDX-License-Identifier: BSD-2-Clause
#include "device/commands.h"

#include <cstdio>
#include <iostream>
#include <optional>

#include "common/files.h"
#include "device/agent_log.h"
#include "device/device_client.h"
#include "device/envelope.h"
#include "device/info_json.h"
#include "device/inspect.h"
#include "device/object_id.h"
#include "device/raw_session.h"
#include "device/state_directory.h"

namespace device {
namespace {

void print(std::string_view text) {
  tools::write_file("-", text);
}

void print_note(std::string_view text) {
  tools::print_error_line(kProgram, text);
}

/// Prints the agent's heap figures, if wanted, before the instance that they belong to is gone:
/// declare it after the session.
class StatsAtEnd {
 public:
  StatsAtEnd(const Arguments &arguments, Device &device)
      : wanted_(arguments.stats), device_(device) {}
  StatsAtEnd(const StatsAtEnd &) = delete;
  StatsAtEnd &operator=(const StatsAtEnd &) = delete;
  ~StatsAtEnd() {
    try {
      if (wanted_) print_figures();
    } catch (const std::exception &failure) {
      print_note(failure.what());
    }
  }

 private:
  void print_figures() {
    const std::vector<Figure> figures = inspection()->heap_figures(device_);
    if (figures.empty()) print_note("no figures: the agent is not running");
    for (const Figure &figure : figures) {
      fprintf(stderr, "stats: %s %u\n", figure.name, figure.value);
    }
  }

  bool wanted_;
  Device &device_;
};

struct OpenDevice : StateDevice {
  explicit OpenDevice(const Arguments &arguments)
      : StateDevice(arguments.state_directory, arguments.must_exist) {}
};

/// A device with a session to the agent.
struct OpenAgent {
  explicit OpenAgent(const Arguments &arguments)
      : device(arguments), session(device, kAgentUuid), stats(arguments, device) {}

  OpenDevice device;
  Session session;
  StatsAtEnd stats;
};

/// What the words of the command line mean: the message is named only where there are two.
struct Sent {
  const Message *message;  // NULL: the request says it
  std::string request_file;
};

Sent sent_by(const Arguments &arguments) {
  const Message *message = find_message(arguments.message);
  if (arguments.request_file.empty()) {
    if (message != nullptr) {
      throw tools::UsageError("no REQUEST: expected a file, or -, after " + arguments.message);
    }
    return {nullptr, arguments.message};
  }
  if (message == nullptr) {
    throw tools::UsageError("unknown message \"" + arguments.message + "\": expected one of " +
                            tools::message_commands());
  }
  return {message, arguments.request_file};
}

uint32_t capacity_of(const Arguments &arguments) {
  if (arguments.capacity.empty()) return kDefaultCapacity;
  return parse_number("--capacity", arguments.capacity);
}

/// Where the TA image goes, if it is wanted.
std::optional<tools::OutputFile> open_image_file(const Arguments &arguments) {
  if (arguments.image_file.empty()) return std::nullopt;
  return tools::OutputFile(arguments.image_file);
}

}  // namespace

void print_info(const Arguments &arguments) {
  const AgentLog log(arguments.trace);
  OpenDevice device(arguments);
  const StatsAtEnd stats(arguments, device);
  print(info_json(read_info(device)));
}

void send_request(const Arguments &arguments) {
  const Sent sent = sent_by(arguments);
  const uint32_t capacity = capacity_of(arguments);
  const std::string request = tools::read_file(sent.request_file);
  const Message &message = message_in(request, sent.message);

  tools::OutputFile response_file(arguments.response_file);
  std::optional<tools::OutputFile> image_file = open_image_file(arguments);
  AgentLog log(arguments.trace);
  OpenAgent agent(arguments);
  const Answer answer = send(agent.session, message, request, capacity);
  if (verdict_of_response(answer.response) != "pass") log.show();
  if (!answer.response.empty()) {
    tools::keep_or_print(answer.response, [&] { response_file.write(answer.response); });
  }
  if (image_file && answer.image) image_file->write(*answer.image);
  if (image_file && !answer.image) {
    print_note("the answer holds no TA image, " + arguments.image_file + " is not written");
  }
  require_success(message, answer);
}

void query_ta(const Arguments &arguments) {
  (void)build_query(arguments.taid);  // throws for what no device is opened for
  const AgentLog log(arguments.trace);
  OpenAgent agent(arguments);
  const QueryAnswer answer = query(agent.session, arguments.taid);
  print(answer.text + "\n");
  if (answer.result != TEEC_SUCCESS) throw Error("query", answer.result, answer.origin);
}

void print_device_id(const Arguments &arguments) {
  const AgentLog log(arguments.trace);
  OpenAgent agent(arguments);
  print(device_id(agent.session) + "\n");
}

void list_objects(const Arguments &arguments) {
  OpenDevice device(arguments);
  std::string lines;
  for (const StoredObject &object : inspection()->list_objects(device)) {
    lines += show_object_id(object.id) + "\t" + std::to_string(object.size) + "\n";
  }
  print(lines);
}

void get_object(const Arguments &arguments) {
  const std::string id = parse_object_id(arguments.object_id);
  OpenDevice device(arguments);
  print(inspection()->get_object(device, id));
}

void put_object(const Arguments &arguments) {
  const std::string id = parse_object_id(arguments.object_id);
  const std::string data = tools::read_file(arguments.object_file);
  OpenDevice device(arguments);
  inspection()->put_object(device, id, data);
}

void remove_object(const Arguments &arguments) {
  const std::string id = parse_object_id(arguments.object_id);
  OpenDevice device(arguments);
  inspection()->remove_object(device, id);
}

void invoke_once(const Arguments &arguments) {
  Invocation invocation = {.command_id = parse_number("COMMAND_ID", arguments.command_id),
                           .input = arguments.input_file,
                           .output = arguments.output_file,
                           .capacity = capacity_of(arguments)};
  if (!arguments.types.empty()) invocation.types = parse_types(arguments.types);

  OpenAgent agent(arguments);
  const Reply reply = run_invocation(agent.session, invocation);
  print(reply_line(reply.result, reply.size));
  if (reply.result != TEEC_SUCCESS) throw Error("invoke", reply.result, reply.origin);
}

void obey_session(const Arguments &arguments) {
  OpenDevice device(arguments);
  std::optional<Session> agent;
  const StatsAtEnd stats(arguments, device);
  run_session(device, std::cin, agent);
}

void serve(const Arguments &arguments) {
  serve_device(arguments);
}

void connect(const Arguments &arguments) {
  connect_device(arguments, arguments);
}

}  // namespace device
