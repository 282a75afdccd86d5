// SPDX-License-Identifier: BSD-2-Clause
/// otrp-device: drives a device from the normal world.
#include <CLI/CLI.hpp>
#include <exception>
#include <span>
#include <string>
#include <vector>

#include "common/command_line.h"
#include "common/error_line.h"
#include "common/process.h"
#include "device/commands.h"
#include "device/device_client.h"
#include "device/inspect.h"

namespace {

using device::Arguments;
using device::kProgram;

/// A positional word, which is required unless it stands in brackets, or an option, whose name
/// begins with a hyphen.
struct Parameter {
  const char *name;
  const char *type;
  std::string Arguments::*value;
  std::string help;
  std::vector<std::string> Arguments::*values = nullptr;  // instead, of an option given repeatedly
};

struct Command {
  const char *name;
  void (*run)(const Arguments &);
  const char *help;
  std::vector<Parameter> parameters;
  std::string notes;
  std::string example;  // what follows the state directory
};

const Parameter kCapacity = {"--capacity", "BYTES", &Arguments::capacity,
                             "Size of the output buffer (default: 4 MiB; 0: no buffer)"};
const Parameter kObjectId = {"ID", "", &Arguments::object_id, "ID of the object"};

const Command kCommands[] = {
    {"info",
     device::print_info,
     "Print what a TSM operator needs to know of the device, as JSON",
     {},
     "",
     "info > device.json"},
    {"send",
     device::send_request,
     "Send a signed request and print the response",
     {{"MESSAGE", "", &Arguments::message,
       "May be left out: the request names it. One of: " + tools::message_commands()},
      {"[REQUEST]", "", &Arguments::request_file, "File with the request"},
      {"-o", "FILE", &Arguments::response_file, "File for the response"},
      {"--image-out", "FILE", &Arguments::image_file, "File for the TA image in the answer"},
      kCapacity},
     "The response may say \"fail\": that is for the TSM to read, and a success here. When only "
     "the\n"
     "TA image does not fit, the device has done what was asked, and the response is printed.\n",
     "send request.json -o response.json --image-out ta.bin"},
    {"query",
     device::query_ta,
     "Ask whether a TA is recorded on the device",
     {{"TAID", "", &Arguments::taid, "ID of the TA"}},
     "Prints the answer; exit 1 when the TA is not recorded.\n",
     "query 00112233445566778899aabbccddeeff"},
    {"device-id", device::print_device_id, "Print the device ID", {}, "", "device-id"},
    {"invoke",
     device::invoke_once,
     "Invoke one command of the agent as it is",
     {{"COMMAND_ID", "", &Arguments::command_id, "Number of the command"},
      {"INPUT", "", &Arguments::input_file, "File with the input; -: no input buffer"},
      {"OUTPUT", "", &Arguments::output_file, "File for the output buffer"},
      kCapacity,
      {"--types", "WORD", &Arguments::types,
       "Parameter types, lowest nibble first: 0 none, 5 input, 6 output, 7 both (default: 0x65)"}},
     "OUTPUT receives the whole output buffer, which is full of 0xA5 before the call, whatever "
     "the\n"
     "result. Prints \"0xRESULT SIZE\": the result, and the size as the agent left it.\n",
     "invoke 2 - id.bin --capacity 64"},
    {"session",
     device::obey_session,
     "Invoke many commands in one session, read from standard input",
     {},
     "Lines, whose fields are separated by blanks or tabs:\n"
     "  invoke COMMAND_ID INPUT OUTPUT CAPACITY [TYPES]   see invoke; answered by 0xRESULT SIZE\n"
     "  reopen                     a new session and instance; answered by 0xRESULT 0\n"
     "Empty lines are passed over. A line that cannot be obeyed ends the program with exit 2, a\n"
     "session that cannot be opened with exit 1.\n",
     "session < lines.txt"},
    {"serve",
     device::serve,
     "Answer over HTTP, until SIGTERM or SIGINT",
     {{"--listen", "ADDRESS:PORT", &Arguments::listen,
       "Where to listen (default: 127.0.0.1:8080; port 0: any that is free)"},
      {"--allow-host", "NAME", nullptr,
       "Serve requests to this host, too; repeatable (always: localhost and the address itself)",
       &Arguments::allowed_hosts},
      {"--tls-cert", "PEM", &Arguments::tls_cert, "Serve https, with this certificate and chain"},
      {"--tls-key", "PEM", &Arguments::tls_key, "Key of the certificate"},
      {"--max-body", "BYTES", &Arguments::max_body,
       "Longest request that is read (default: 8 MiB)"},
      {"--max-unfinished", "BYTES", &Arguments::max_unfinished,
       "Longest that requests not yet answered are together (default: 16 MiB)"},
      {"--max-header", "BYTES", &Arguments::max_header,
       "Longest head of a request (default: 16 KiB)"},
      {"--max-headers", "COUNT", &Arguments::max_headers, "Most headers (default: 100)"},
      {"--max-connections", "COUNT", &Arguments::max_connections,
       "Most connections; a newer one takes the place of a slow one (default: 1000)"},
      {"--max-per-address", "COUNT", &Arguments::max_per_address,
       "Most connections from one address (default: 250)"},
      {"--request-time", "SECONDS", &Arguments::request_time,
       "Longest that sending a request may take (default: 30)"},
      {"--answer-time", "SECONDS", &Arguments::answer_time,
       "Longest that taking an answer may take (default: 30)"},
      {"--idle-time", "SECONDS", &Arguments::idle_time,
       "How long a connection is kept for the next request (default: 60)"},
      {"--log", "FORMAT", &Arguments::log, "text or json: a line for each exchange"}},
     "Prints its URL when it listens. A request of type application/otrp+json gets the signed\n"
     "response, and in the header OTrP-Status what it says; where there is a TA image, the header\n"
     "OTrP-TA-Image names its path:\n"
     "  POST /otrp    POST /otrp/MESSAGE    GET /images/NUMBER\n"
     "  GET /info     GET /query/TAID       GET /healthz\n"
     "Whoever reaches the address can use the device.\n",
     "serve --listen 127.0.0.1:8080"},
    {"connect",
     device::connect,
     "Call the TSM and do what it asks, until it asks no more",
     {{"URL", "", &Arguments::url, "Where the TSM is"},
      {"--image-dir", "DIR", &Arguments::image_directory,
       "Folder for the TA images, as TAID.img (default: they are dropped)"},
      {"--every", "SECONDS", &Arguments::every, "Call again, for ever, and go on after failures"},
      {"--ca-file", "PEM", &Arguments::ca_file,
       "The only roots to trust for https (default: the system's)"},
      {"--max-messages", "COUNT", &Arguments::max_messages,
       "Most messages of a session (default: 64)"},
      {"--max-body", "BYTES", &Arguments::max_reply,
       "Longest request that is taken (default: 8 MiB)"},
      {"--connect-time", "SECONDS", &Arguments::connect_time,
       "Longest that connecting may take (default: 10)"},
      {"--answer-time", "SECONDS", &Arguments::reply_time,
       "Longest that an answer may take, from the connection on (default: 60)"},
      {"--retries", "COUNT", &Arguments::retries,
       "How often a call without an answer is begun anew (default: 4)"},
      {"--first-pause", "MILLISECONDS", &Arguments::first_pause,
       "Before the first of these, then twice as long each, up to a minute (default: 1000)"},
      {"--log", "FORMAT", &Arguments::call_log, "text or json: a line for each message"}},
     "The address that is called ends in the device's ID: it is added, unless URL ends in it.\n"
     "Each message is a line on standard error. SIGTERM and SIGINT end between two messages.\n",
     "connect https://tsm.example/tam --image-dir images --every 3600"},
};

const Command kObjectCommands[] = {
    {"list", device::list_objects, "Print ID<TAB>SIZE lines in ID order", {}, "", "objects list"},
    {"get",
     device::get_object,
     "Print the raw data stream of an object",
     {kObjectId},
     "",
     "objects get SD_LIST_ID | xxd"},
    {"put",
     device::put_object,
     "Create or replace an object",
     {kObjectId, {"FILE", "", &Arguments::object_file, "File with the raw data stream"}},
     "",
     "objects put SD_LIST_ID list.bin"},
    {"rm",
     device::remove_object,
     "Remove an object",
     {kObjectId},
     "After -- an ID may begin with a hyphen.\n",
     "objects rm -- -odd-id"},
};

std::string footer(const std::string &notes, const std::string &example) {
  const char *device = device::inspection() != nullptr ? "--state ./device " : "";
  return notes + "Example:\n  otrp-device " + device + example + "\n";
}

void add_parameter(CLI::App *command, const Parameter &parameter, Arguments &arguments) {
  std::string name = parameter.name;
  const bool may_be_left_out = name.starts_with('[');
  if (may_be_left_out) name = name.substr(1, name.size() - 2);
  CLI::Option *option = parameter.values == nullptr
                            ? command->add_option(name, arguments.*parameter.value, parameter.help)
                            : command->add_option(name, arguments.*parameter.values, parameter.help)
                                  ->allow_extra_args(false);
  option->type_name(parameter.type);
  if (!may_be_left_out && !name.starts_with('-')) option->required();
}

/// `chosen` becomes the command that the command line names.
void add_commands(CLI::App *app, std::span<const Command> commands, Arguments &arguments,
                  const Command *&chosen) {
  for (const Command &row : commands) {
    CLI::App *command = app->add_subcommand(row.name, row.help);
    command->footer(footer(row.notes, row.example));
    for (const Parameter &parameter : row.parameters) add_parameter(command, parameter, arguments);
    command->final_callback([&chosen, &row] { chosen = &row; });
  }
  app->require_subcommand(1);
}

/// What only a TEE for developers lets one see.
void add_inspection(CLI::App *app, Arguments &arguments, const Command *&chosen) {
  app->add_flag("--existing", arguments.must_exist, "Make no device where there is none");
  app->add_flag("--trace", arguments.trace,
                "Show all that the agent logs; else a failed command does, and invoke and session");
  app->add_flag("--stats", arguments.stats, "Print the agent's heap figures to standard error");
  CLI::App *objects = app->add_subcommand("objects", "Look at the agent's stored objects");
  objects->footer(footer("IDs show bytes outside printable ASCII, and the backslash, as \\xNN.\n",
                         "objects list"));
  add_commands(objects, kObjectCommands, arguments, chosen);
}

/// The host TEE has devices in directories; any other is a device of its own.
void add_device(CLI::App *app, Arguments &arguments) {
  if (device::inspection() != nullptr) {
    app->add_option("--state", arguments.state_directory, "State directory of the device")
        ->required()
        ->type_name("DIR")
        ->envname("OTRP_STATE");
  } else {
    app->add_option("--context", arguments.state_directory,
                    "Name of the TEE for its Client API (default: NULL)")
        ->type_name("NAME");
  }
}

void run(std::span<char *> words) {
  Arguments arguments;
  const Command *chosen = nullptr;
  CLI::App app("Drives an OTrP device from the normal world", kProgram);
  app.fallthrough();
  app.footer(
      footer("Standard output carries only the result; \"-\" names standard input or output.\n"
             "Exit: 0 success, 1 the device answered with a failure, 2 wrong usage.\n",
             "info > device.json"));
  app.set_version_flag("--version", std::string(kProgram) + " " + OTRP_VERSION);
  add_device(&app, arguments);
  add_commands(&app, kCommands, arguments, chosen);
  if (device::inspection() != nullptr) add_inspection(&app, arguments, chosen);
  if (tools::parse_command_line(app, words)) chosen->run(arguments);
}

int report_failure() {
  try {
    throw;
  } catch (const tools::UsageError &error) {
    tools::print_error_line(kProgram, error.what());
    return tools::kExitUsage;
  } catch (const std::exception &error) {
    tools::print_error_line(kProgram, error.what());
    return tools::kExitRefused;
  }
}

}  // namespace

int main(int argc, char **argv) {
  tools::prepare_process();
  try {
    run({argv, static_cast<size_t>(argc)});
  } catch (...) {
    return report_failure();
  }
  return 0;
}
