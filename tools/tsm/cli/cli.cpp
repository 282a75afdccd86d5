// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/cli/cli.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <string>
#include <variant>
#include <vector>

#include "common/command_line.h"
#include "common/error_line.h"
#include "common/process.h"
#include "tsm/cli/commands.h"
#include "tsm/cli/explain.h"
#include "tsm/cli/inspect.h"
#include "tsm/protocol/response.h"

namespace tsm {
namespace {

constexpr char kProgram[] = "otrp-tsm";
constexpr size_t kMaxNameLen = 56;  // with its prefix it is a storage object ID of 64 bytes
constexpr unsigned kMaxJobs = 256;
constexpr size_t kTaidLen = 32;  // what the device's register of images takes

std::string check_name(const std::string &name) {
  const bool has_control = std::ranges::any_of(
      name, [](char c) { return static_cast<unsigned char>(c) < ' ' || c == '\x7F'; });
  if (!name.empty() && name.size() <= kMaxNameLen && !has_control) return "";
  return "expected 1 to " + std::to_string(kMaxNameLen) + " bytes without control characters";
}

/// The device takes some values from a JSON text as they stand there.
std::string check_plain(const std::string &value) {
  const bool is_plain = !value.empty() && std::ranges::all_of(value, [](char c) {
    return c >= ' ' && c <= '~' && c != '"' && c != '\\';
  });
  return is_plain ? "" : "expected printable ASCII characters, no \" or \\";
}

/// A TA of another ID would be recorded by the device, which then could not register its image.
std::string check_taid(const std::string &taid) {
  return taid.size() == kTaidLen ? "" : "expected 32 characters, such as a UUID without its dashes";
}

using CheckFunction = std::string (*)(const std::string &);

CLI::Validator validator(CheckFunction check) {
  return CLI::Validator([check](std::string &value) { return check(value); }, "");
}

/// What an operator gives with a message.
enum MessageOption : unsigned {
  kSd = 1u << 0,
  kSp = 1u << 1,
  kSpCert = 1u << 2,
  kDid = 1u << 3,
  kRenewAik = 1u << 4,
  kTa = 1u << 5,
  kImage = 1u << 6,  // with its version
  kDeleteTa = 1u << 7,
};

struct MessageHelp {
  MessageId id;
  unsigned options;
  const char *description;
  const char *example;
};

constexpr MessageHelp kMessageHelps[] = {
    {MessageId::kGetDeviceState, 0,
     "Ask for the device state, and make this TSM known to the device", ""},
    {MessageId::kCreateSd, kSd | kSp | kSpCert | kDid,
     "Create a security domain for a service provider", "--sd wallet --sp bank --sp-cert bank.pem"},
    {MessageId::kUpdateSd, kSd | kSp | kSpCert | kRenewAik,
     "Renew the AIK and certificate of a security domain's service provider",
     "--sd wallet --sp bank --renew-aik --sp-cert bank.pem"},
    {MessageId::kDeleteSd, kSd | kDeleteTa,
     "Delete a security domain, and its SP's records with the SP's last one",
     "--sd wallet --delete-ta true"},
    {MessageId::kInstallTa, kSd | kSp | kTa | kImage, "Install a trusted application",
     "--sd wallet --sp bank --ta 8d82573a926d4754935332dc29997f74 --ta-version 1.0 "
     "--image app.img"},
    {MessageId::kUpdateTa, kSd | kSp | kTa | kImage,
     "Replace the image and version of a trusted application",
     "--sd wallet --sp bank --ta 8d82573a926d4754935332dc29997f74 --ta-version 1.1 "
     "--image app.img"},
    {MessageId::kDeleteTa, kSd | kTa, "Delete a trusted application",
     "--sd wallet --ta 8d82573a926d4754935332dc29997f74"},
    {MessageId::kGetTaInfo, kSp | kTa, "Ask what is recorded about a trusted application",
     "--sp bank --ta 8d82573a926d4754935332dc29997f74"},
};

CLI::Option *require_name(CLI::App *command, const char *names, std::string *value,
                          const char *help) {
  return command->add_option(names, *value, help)->required()->check(validator(check_name));
}

void add_message_options(CLI::App *command, const MessageHelp &help, Arguments *arguments) {
  RequestOptions &request = arguments->request;
  const bool is_raw = help.id == MessageId::kGetTaInfo;
  if (help.options & kSd) require_name(command, "--sd", &request.sdname, "Security domain");
  if (help.options & kSp) {
    CLI::Option *sp = require_name(command, "--sp", &request.spid, "Service provider's ID");
    if (is_raw) sp->check(validator(check_plain));
  }
  if (help.options & kTa) {
    CLI::Option *ta = require_name(command, "--ta,--taid", &request.taid, "TA's ID");
    if (is_raw) ta->check(validator(check_plain));
    if (help.options & kImage) ta->check(validator(check_taid));
  }
  if (help.options & kSpCert) {
    command->add_option("--sp-cert", arguments->spcert,
                        "SP's certificate: a file, or the text itself, as it is or behind text:");
  }
  if (help.options & kDid) {
    command->add_option("--did", request.did, "Device ID to claim (default: the device's)");
  }
  if (help.options & kRenewAik) {
    command->add_flag("--renew-aik", request.renew_aik, "Make a new AIK; needs --sp-cert");
  }
  if (help.options & kImage) {
    require_name(command, "--ta-version,--version", &request.ta_version, "TA's version");
    command->add_option("--image", arguments->image_file, "TA image made by `image pack`")
        ->required();
  }
  if (help.options & kDeleteTa) {
    command
        ->add_option("--delete-ta", request.deleteta,
                     "true: delete the records of its TAs too; false: keep them")
        ->required()
        ->check(CLI::IsMember({"true", "false"}));
  }
  if (is_raw) return;
  command->add_option("--rid", request.rid, "Request ID (default: random)")
      ->check(validator(check_plain));
  command->add_option("--tid", request.tid, "Transaction ID (default: random)")
      ->check(validator(check_plain));
}

/// A positional word, which is required unless it stands in brackets, or an option, whose name
/// begins with a hyphen.
struct Parameter {
  const char *names;
  std::variant<std::string Arguments::*, std::vector<std::string> Arguments::*, bool Arguments::*,
               unsigned Arguments::*, std::string ServeArguments::*,
               std::vector<std::string> ServeArguments::*>
      value;
  const char *help;
  bool is_required = false;
};

struct Command {
  const char *name;
  int (*run)(const Arguments &);  // NULL where one of `commands` has to follow
  const char *help;
  std::vector<Parameter> parameters;
  const char *example;
  std::span<const Command> commands = {};
  const char *message_example = nullptr;  // what its messages' examples begin with, if it has any
};

const Parameter kDevice = {"--device FILE", &Arguments::device_file,
                           "Device file: what `otrp-device info` prints"};
const Parameter kOn = {
    "--on NAME", &Arguments::on,
    "Device of the inventory: a name, a pattern such as 'd*', or all; repeatable"};
const Parameter kJobs = {"-j,--jobs N", &Arguments::num_jobs,
                         "How many devices at once (default: 1)"};
const Parameter kState = {"--state DIR", &Arguments::state_dir,
                          "State directory of a device on this machine"};
const Parameter kUrl = {"--url URL", &Arguments::url,
                        "Where a device is served: http://... or https://..."};
const Parameter kCaFile = {"--ca-file PEM", &Arguments::tls_ca_file,
                           "PEM file of the only CAs to trust for https (default: the system's)"};
const Parameter kExisting = {"--existing", &Arguments::must_exist,
                             "Make no device where there is none"};
const Parameter kDsi = {"--dsi FILE", &Arguments::dsi_file,
                        "Device state document (default: the one kept in the home)"};
const Parameter kDsiOut = {"--dsi-out FILE", &Arguments::dsi_out_file,
                           "Write the device state document here"};
const Parameter kKnownDevice = {
    "--device FILE", &Arguments::device_file,
    "Device file that says who the device is (default: what this TSM knows of it)"};
const Parameter kTrace = {"--trace", &Arguments::trace,
                          "Show all that the agent logs (else what it logs of a failure)"};
const Parameter kPlan = {"PLAN", &Arguments::plan_file, "File that says what a device should hold"};
const Parameter kStore = {
    "--store URI", &Arguments::store,
    "Database of the fleet: sqlite:FILE or postgresql://... (default: sqlite:HOME/fleet.db)"};
const Parameter kGroup = {"--group NAME", &Arguments::group, "Group of devices (default: default)"};
const Parameter kJson = {"--json", &Arguments::json, "Print JSON"};

const Command kImageCommands[] = {
    {"pack",
     run_image_pack,
     "Put a TA image header before any file",
     {{"FILE", &Arguments::input_file, "The file to wrap"},
      {"-o,--output FILE", &Arguments::output_file, "The image", true}},
     "image pack app.ta -o app.img"},
    {"show",
     run_image_show,
     "Show the header of a TA image",
     {{"IMAGE", &Arguments::input_file, "The image"}, kJson},
     "image show app.img"},
};

const Command kDeviceCommands[] = {
    {"add",
     run_device_add,
     "Give devices names, by which --on calls them",
     {{"[NAME]", &Arguments::names, "Name of the device"},
      kState,
      kUrl,
      {kDevice.names, kDevice.value,
       "Device file: what `otrp-device info` prints; alone, or for the device at --url"},
      kCaFile,
      kExisting,
      {"--list FILE", &Arguments::list_file,
       "File with a line for each device: NAME --state DIR, ..."},
      kJobs},
     "device add kitchen --url https://10.0.0.7 --device kitchen.json"},
    {"list",
     run_device_list,
     "Show names, TEE keys, and how devices are reached",
     {{"[NAME]", &Arguments::names, "Names and patterns (default: all)"}, kJson},
     "device list"},
    {"rm",
     run_device_remove,
     "Forget devices: their names, keys and kept states",
     {{"NAME", &Arguments::names, "Names and patterns"}},
     "device rm kitchen"},
};

const Command kCommands[] = {
    {"init",
     run_init,
     "Make this TSM: its key, admitted by the CA-TSM",
     {{"--tsmid ID", &Arguments::tsmid, "This TSM's ID (default: a random one)"},
      {"--ca PEM", &Arguments::ca_file,
       "PEM file of the CA-TSM's private key (default: the development key)"}},
     "init --tsmid tsm1"},
    {"request",
     run_request,
     "Write a signed request",
     {kDevice,
      kOn,
      kDsi,
      {"-o,--output FILE", &Arguments::output_file, "Where to write it (default: -)"}},
     "request get-device-state --device device.json > request.json",
     {},
     "request --device device.json "},
    {"response",
     run_response,
     "Verify, decrypt and show a response, and keep the device state",
     {{"RESPONSE", &Arguments::response_file, "The device's response"},
      kDevice,
      kOn,
      {"--request FILE", &Arguments::request_file,
       "The request that it answers (default: one of those that wait for an answer)"},
      {"--accept-old", &Arguments::accept_old,
       "Take a response that was not asked for, or that brings an older state"},
      kDsi,
      kDsiOut,
      kJson},
     "response response.json --device device.json --dsi-out dsi.json"},
    {"device", nullptr, "Keep an inventory of devices", {}, "device list", kDeviceCommands},
    {"image", nullptr, "Pack and show TA images", {}, "image show app.img", kImageCommands},
    {"manage",
     run_manage,
     "Request, send and read the response",
     {kOn,
      {kState.names, kState.value,
       "State directory of a device on this machine (default: $OTRP_STATE)"},
      kUrl,
      kKnownDevice,
      kCaFile,
      kExisting,
      kJobs,
      kTrace,
      kDsiOut,
      {"--image-out FILE", &Arguments::image_out_file,
       "Write the TA image that the device hands back here"},
      kJson},
     "manage --state ./device get-device-state",
     {},
     "manage --state ./device "},
    {"plan",
     run_plan,
     "Say which messages would bring devices to a plan; change nothing",
     {kPlan, kOn, kState, kUrl, kKnownDevice, kCaFile, kExisting, kJobs, kTrace, kJson},
     "plan plan.json --on kitchen"},
    {"apply",
     run_apply,
     "Bring devices to a plan: what they should hold",
     {kPlan, kOn, kState, kUrl, kKnownDevice, kCaFile, kExisting, kJobs, kTrace, kJson},
     "apply plan.json --on all -j 4"},
    {"show",
     run_show,
     "Show the last known state of devices as a tree",
     {kDevice,
      kOn,
      {"--dsi FILE", &Arguments::dsi_file, "Show this device state document"},
      {"--summary", &Arguments::summary, "Count the devices that hold the same"},
      kJson},
     "show --device device.json"},
    {"inspect",
     run_inspect,
     "Say what messages are, check by check, with the keys there are",
     {{"FILE", &Arguments::input_files, "A message, a frame, or an exchange of docs/examples"},
      {"--key FILE", &Arguments::key_files,
       "PEM file of a key; tsm=, ca=, tee= or aik= before it says whose"},
      kDevice,
      kOn,
      {"--dsi FILE", &Arguments::dsi_file, "Device state document that requests were made for"},
      kJson},
     "inspect request.json --device device.json"},
    {"explain",
     run_explain,
     "Say what result codes mean, and what to do next",
     {{"CODE", &Arguments::codes,
       "0xdead0001, 3735879681, OTRP_DSI_MISMATCH, dsi_mismatch; or all"},
      kJson},
     "explain 0xdead0001"},
    {"enrol",
     run_enrol,
     "Let devices call this TSM's servers",
     {{"FILE", &Arguments::input_files, "A device file, or a file with one in each line"},
      kGroup,
      kStore},
     "enrol device.json"},
    {"unenrol",
     run_unenrol,
     "Let devices call no more, and forget them",
     {{"ID", &Arguments::names, "The ID of a device, as it was enrolled"}, kStore},
     "unenrol 71cce7"},
    {"assign",
     run_assign,
     "Say what the devices of a group should hold",
     {{"PLAN", &Arguments::input_file, "The plan"}, kGroup, kStore},
     "assign plan.json --group shop"},
    {"serve",
     run_serve,
     "Answer devices that call, until SIGTERM or SIGINT",
     {{"--listen ADDRESS:PORT", &ServeArguments::listen,
       "Where to listen (default: 127.0.0.1:8090; port 0: any that is free)"},
      {"--admin ADDRESS:PORT", &ServeArguments::admin,
       "Where to show the fleet, on a page, and /metrics (default: nowhere)"},
      {"--plan FILE", &ServeArguments::plan,
       "Plan of the devices of no other group, as if assigned now"},
      kStore,
      {"--allow-host HOST", &ServeArguments::allowed_hosts,
       "Serve requests to this host, too; repeatable (always: localhost and the address itself)"},
      {"--tls-cert FILE", &ServeArguments::tls_cert,
       "Serve https, with this certificate and chain"},
      {"--tls-key FILE", &ServeArguments::tls_key, "Key of the certificate"},
      {"--deadline SECONDS", &ServeArguments::deadline,
       "When an answer comes too late (default: 600)"},
      {"--max-body BYTES", &ServeArguments::max_body, "The longest answer (default: 8 MiB)"},
      {"--max-connections N", &ServeArguments::max_connections, "Most connections (default: 1000)"},
      {"--max-per-address N", &ServeArguments::max_per_address,
       "Most connections from one address, a proxy's, say (default: 250)"},
      {"--workers N", &ServeArguments::workers,
       "Devices that are answered at once (default: the number of processors)"},
      {"--log FORMAT", &ServeArguments::log,
       "A line for each request, text or json (default: text)"}},
     "serve --plan plan.json"},
};

CLI::App *add_command(CLI::App *parent, const std::string &name, const std::string &description,
                      const std::string &example) {
  CLI::App *command = parent->add_subcommand(name, description);
  command->fallthrough();
  command->footer("Example: " + std::string(kProgram) + " " + example);
  return command;
}

CLI::Option *add_value(CLI::App *app, const std::string &names, bool &value) {
  return app->add_flag(names, value);
}
CLI::Option *add_value(CLI::App *app, const std::string &names, unsigned &value) {
  return app->add_option(names, value)->check(CLI::Range(1u, kMaxJobs));
}
CLI::Option *add_value(CLI::App *app, const std::string &names, std::string &value) {
  return app->add_option(names, value);
}
/// An option takes one value each time, so that what follows it is not taken for another.
CLI::Option *add_value(CLI::App *app, const std::string &names, std::vector<std::string> &values) {
  CLI::Option *option = app->add_option(names, values);
  return names.starts_with('-') ? option->allow_extra_args(false) : option;
}

template <class Value>
Value &member_of(Arguments *arguments, Value Arguments::*member) {
  return arguments->*member;
}
template <class Value>
Value &member_of(Arguments *arguments, Value ServeArguments::*member) {
  return arguments->serve.*member;
}

void add_parameter(CLI::App *app, const Parameter &parameter, Arguments *arguments) {
  std::string names = parameter.names;
  const size_t blank = names.find(' ');
  const std::string kind = blank == std::string::npos ? "" : names.substr(blank + 1);
  names.resize(std::min(blank, names.size()));
  const bool may_be_left_out = names.starts_with('[') || names.starts_with('-');
  if (names.starts_with('[')) names = names.substr(1, names.size() - 2);
  const auto add = [&](auto value) { return add_value(app, names, member_of(arguments, value)); };
  CLI::Option *option = std::visit(add, parameter.value);
  option->description(parameter.help)->type_name(kind);
  option->required(parameter.is_required || !may_be_left_out);
}

void add_messages(CLI::App *parent, const std::string &example_start, Arguments *arguments) {
  parent->require_subcommand(1);
  for (const MessageHelp &help : kMessageHelps) {
    const std::string name(message_of(help.id).command);
    std::string example = example_start + name;
    if (*help.example != '\0') example += " " + std::string(help.example);
    CLI::App *message = add_command(parent, name, help.description, example);
    add_message_options(message, help, arguments);
    message->callback([arguments, id = help.id] { arguments->message = id; });
  }
}

/// `chosen` becomes the command that the command line names.
void add_commands(CLI::App *app, std::span<const Command> commands, Arguments *arguments,
                  const Command **chosen) {
  app->require_subcommand(1);
  for (const Command &row : commands) {
    CLI::App *command = add_command(app, row.name, row.help, row.example);
    for (const Parameter &parameter : row.parameters) add_parameter(command, parameter, arguments);
    if (row.message_example != nullptr) add_messages(command, row.message_example, arguments);
    if (!row.commands.empty()) add_commands(command, row.commands, arguments, chosen);
    if (row.run != nullptr) command->final_callback([chosen, &row] { *chosen = &row; });
  }
}

int parse_and_run(std::span<char *> words) {
  CLI::App app("A Trusted Service Manager: makes requests for OTrP devices, reads their responses.",
               kProgram);
  app.footer(
      "Example: otrp-tsm init && otrp-tsm manage --state ./device get-device-state\n\n"
      "Exit codes: 0 done, 1 the device refused, 2 wrong input, 3 a response that does not "
      "verify.");
  Arguments arguments;
  app.set_version_flag("--version", std::string(kProgram) + " " + OTRP_VERSION);
  app.add_option("--home", arguments.home, "This TSM's home directory")
      ->type_name("DIR")
      ->capture_default_str()
      ->envname("OTRP_HOME");
  const Command *chosen = nullptr;
  add_commands(&app, kCommands, &arguments, &chosen);
  return tools::parse_command_line(app, words) ? chosen->run(arguments) : 0;
}

}  // namespace

int run_command_line(std::span<char *> words) {
  tools::prepare_process();
  try {
    return parse_and_run(words);
  } catch (const NotVerified &error) {
    tools::print_error_line(kProgram, error.what());
    return kExitNotVerified;
  } catch (const std::exception &error) {
    tools::print_error_line(kProgram, error.what());
    return tools::kExitUsage;
  }
}

}  // namespace tsm
