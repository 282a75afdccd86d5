// SPDX-License-Identifier: BSD-2-Clause
/// otrp-fleet: many devices at once, to try a TSM with.
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdio>
#include <exception>
#include <span>
#include <string>
#include <thread>
#include <vector>

#include "common/command_line.h"
#include "common/error_line.h"
#include "common/files.h"
#include "common/process.h"
#include "fleet/run.h"
#include "fleet/serve.h"
#include "http/server.h"

namespace {

constexpr char kProgram[] = "otrp-fleet";
constexpr size_t kMaxDevices = 99'999;  // that have names of one length

struct Arguments {
  std::string root;
  size_t count = 0;
  size_t num_threads = 0;
  std::string name;
  std::vector<std::string> faults;
  bool as_json = false;
  std::string listen = "127.0.0.1:8080";
  fleet::RunOptions run;
};

// ---- The line that says how far it is

/// One line that is overwritten on a terminal, else one every ten seconds.
class ProgressLine {
 public:
  ~ProgressLine() {
    if (is_terminal_ && is_shown_) fputc('\n', stderr);
  }

  void show(const std::string &text) {
    using std::chrono::steady_clock;
    const auto now = steady_clock::now();
    if (!is_terminal_ && now - shown_ < std::chrono::seconds(10)) return;
    shown_ = now;
    is_shown_ = true;
    fprintf(stderr, is_terminal_ ? "\r%s\033[K" : "%s\n", text.c_str());
  }

 private:
  bool is_terminal_ = isatty(STDERR_FILENO) == 1;
  bool is_shown_ = false;
  std::chrono::steady_clock::time_point shown_ = std::chrono::steady_clock::now();
};

// ---- Commands

void make(const Arguments &arguments) {
  ProgressLine line;
  fleet::make_fleet(arguments.root, arguments.count, arguments.num_threads, [&](size_t done) {
    line.show("made " + std::to_string(done) + " of " + std::to_string(arguments.count));
  });
}

void reset(const Arguments &arguments) {
  ProgressLine line;
  fleet::reset_fleet(arguments.root, arguments.num_threads,
                     [&](size_t done) { line.show("reset " + std::to_string(done)); });
}

void run(const Arguments &arguments) {
  static broker::Stop stop;
  stop.obey_signals();
  fleet::RunOptions options = arguments.run;
  options.call.faults = fleet::parse_faults(arguments.faults);
  fleet::Figures figures;
  {
    ProgressLine line;
    figures =
        fleet::run_fleet(arguments.root, options, stop, [&](const fleet::RunProgress &progress) {
          line.show(std::to_string(progress.num_done) + " devices, " +
                    std::to_string(progress.num_arrived) + " arrived, " +
                    std::to_string(progress.num_exchanges) + " exchanges");
        });
  }
  tools::write_file("-", arguments.as_json ? fleet::json_of(figures) : fleet::table_of(figures));
  if (figures.num_arrived == figures.num_devices) return;
  throw std::runtime_error(std::to_string(figures.num_devices - figures.num_arrived) + " of " +
                           std::to_string(figures.num_devices) + " devices did not arrive");
}

void call(const Arguments &arguments) {
  static broker::Stop stop;
  stop.obey_signals();
  const std::vector<fleet::Member> members = fleet::members_of(arguments.root);
  const auto member = std::ranges::find(members, arguments.name, &fleet::Member::name);
  if (member == members.end()) {
    throw tools::UsageError("no device is called \"" + arguments.name + "\": expected one of " +
                            arguments.root + "/devices.jsonl");
  }
  fleet::Random random;
  fleet::Figures figures;
  const broker::Outcome outcome =
      fleet::call_tsm(*member, arguments.run.call, stop, random, figures);
  if (!outcome.reason.empty()) throw std::runtime_error(outcome.reason);
}

void objects(const Arguments &arguments) {
  fleet::list_objects(arguments.root,
                      [](const std::string &lines) { tools::write_file("-", lines); });
}

void serve(const Arguments &arguments) {
  http::ServerOptions options;
  options.name = std::string(kProgram) + "/" + OTRP_VERSION;
  options.num_workers = arguments.num_threads;
  options.log = [](const http::LogEntry &entry) {
    tools::print_error_line(kProgram, http::log_text(entry));
  };
  const http::Endpoint endpoint = http::parse_endpoint(arguments.listen);
  fleet::FleetService service(arguments.root);
  http::Server server(options);
  tools::write_file("-", server.listen(endpoint, service) + "\n");
  server.run();
}

// ---- The command line

CLI::App *add_command(CLI::App &app, const char *name, const char *help, Arguments &arguments,
                      void (*run)(const Arguments &), void (**chosen)(const Arguments &)) {
  CLI::App *command = app.add_subcommand(name, help);
  command->add_option("--root", arguments.root, "Folder of the fleet")
      ->type_name("DIR")
      ->required();
  command->final_callback([=] { *chosen = run; });
  return command;
}

void add_threads(CLI::App *command, size_t &num_threads, const std::string &help) {
  command->add_option("--parallel", num_threads, help)
      ->type_name("COUNT")
      ->check(CLI::Range(size_t{1}, size_t{10'000}));
}

void add_tsm(CLI::App *command, fleet::CallOptions &options) {
  command
      ->add_option("--tsm", options.tsms,
                   "Where the TSM is; a device adds its ID. Several, repeated: requests go to them "
                   "in turn")
      ->type_name("URL")
      ->allow_extra_args(false)
      ->required();
  command->add_option("--ca-file", options.ca_file, "The only roots to trust for https")
      ->type_name("PEM");
}

void add_run(CLI::App *command, Arguments &arguments) {
  fleet::RunOptions &run = arguments.run;
  add_tsm(command, run.call);
  add_threads(command, run.num_threads, "Devices that call at once (default: 16)");
  command->add_option("--rate", run.rate, "Calls that begin in a second (default: all that can)")
      ->type_name("COUNT")
      ->check(CLI::Range(0.001, 1e6));
  command->add_option("--max-calls", run.max_calls, "Of a device, until it arrives (default: 1)")
      ->type_name("COUNT")
      ->check(CLI::Range(1u, 1'000'000u));
  command
      ->add_option("--retries", run.call.policy.max_retries,
                   "How often a call without an answer is begun anew (default: 4)")
      ->type_name("COUNT")
      ->check(CLI::Range(0u, 1'000u));
  command
      ->add_option_function<unsigned>(
          "--first-pause",
          [&run](unsigned pause) {
            run.call.policy.first_pause = std::chrono::milliseconds(pause);
          },
          "Before the first of these, then twice as long each (default: 1000)")
      ->type_name("MILLISECONDS");
  command
      ->add_option("--fault", arguments.faults,
                   "lost-requests=PERCENT, lost-answers=PERCENT, kill-device=PERCENT (of calls) or "
                   "kill-server=COUNT; repeatable")
      ->type_name("NAME=VALUE")
      ->allow_extra_args(false);
  command
      ->add_option("--server", run.servers,
                   "Run the TSM with the shell, for kill-server to kill; one for each --tsm")
      ->type_name("COMMAND")
      ->allow_extra_args(false);
  command->add_option("--seed", run.seed, "Of the faults (default: 1)")->type_name("NUMBER");
  command->add_flag("--json", arguments.as_json, "Print the figures as JSON");
  command->footer(
      "Each device calls until the TSM asks no more. Exit: 0 when all of them got there, else 1.\n"
      "Example:\n  otrp-fleet run --root fleet --tsm http://127.0.0.1:8080/tam --parallel 32\n");
}

void obey(std::span<char *> words) {
  Arguments arguments;
  arguments.num_threads = std::max(1u, std::thread::hardware_concurrency());
  void (*chosen)(const Arguments &) = nullptr;
  CLI::App app("Many OTrP devices at once, to try a TSM with", kProgram);
  app.set_version_flag("--version", std::string(kProgram) + " " + OTRP_VERSION);
  app.require_subcommand(1);

  CLI::App *command =
      add_command(app, "make", "Make devices, those that are missing", arguments, make, &chosen);
  command->add_option("COUNT", arguments.count, "How many there are to be")
      ->check(CLI::Range(size_t{1}, kMaxDevices))
      ->required();
  add_threads(command, arguments.num_threads, "Devices at once (default: one a processor)");
  command->footer(
      "DIR/devices.jsonl lists their device files, for the TSM.\n"
      "Example:\n  otrp-fleet make 1000 --root fleet\n");

  command = add_command(app, "reset", "Make all devices again what they were when they were made",
                        arguments, reset, &chosen);
  add_threads(command, arguments.num_threads, "Devices at once (default: one a processor)");

  add_run(add_command(app, "run", "All devices call a TSM, and the time is taken", arguments, run,
                      &chosen),
          arguments);

  command = add_command(app, "call", "One device calls a TSM", arguments, call, &chosen);
  command->add_option("NAME", arguments.name, "The device")->required();
  add_tsm(command, arguments.run.call);

  command = add_command(app, "objects", "Print what the agent of each device has stored", arguments,
                        objects, &chosen);
  command->footer(
      "Lines of NAME<TAB>OBJECT<TAB>CONTENT, the content in base64.\n"
      "Example:\n  otrp-fleet objects --root fleet | cut -f2 | sort | uniq -c\n");

  command = add_command(app, "serve", "Answer over HTTP for all devices, until SIGTERM or SIGINT",
                        arguments, serve, &chosen);
  command
      ->add_option("--listen", arguments.listen,
                   "Where to listen (default: 127.0.0.1:8080; port 0: any that is free)")
      ->type_name("ADDRESS:PORT");
  add_threads(command, arguments.num_threads, "Requests at once (default: one a processor)");
  command->footer(
      "Below /devices/NAME is what `otrp-device serve` answers for that device.\n"
      "Example:\n  otrp-fleet serve --root fleet\n");

  if (tools::parse_command_line(app, words)) chosen(arguments);
}

}  // namespace

int main(int argc, char **argv) {
  tools::prepare_process();
  try {
    obey({argv, static_cast<size_t>(argc)});
    return 0;
  } catch (const tools::UsageError &error) {
    tools::print_error_line(kProgram, error.what());
    return tools::kExitUsage;
  } catch (const std::exception &error) {
    tools::print_error_line(kProgram, error.what());
    return tools::kExitRefused;
  }
}
