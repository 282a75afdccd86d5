// SPDX-License-Identifier: BSD-2-Clause
// What an operator does with devices that call: enrol them, say what they should hold, serve them.
#include <algorithm>
#include <charconv>
#include <cstdio>
#include <thread>

#include "common/error_line.h"
#include "common/files.h"
#include "http/server.h"
#include "tsm/cli/commands.h"
#include "tsm/home/home.h"
#include "tsm/server/admin.h"
#include "tsm/server/historian.h"
#include "tsm/server/service.h"
#include "tsm/store/store.h"

namespace tsm {
namespace {

using tools::UsageError;

constexpr char kServerName[] = "otrp-tsm";
constexpr size_t kNumAtOnce = 1000;  // devices in a transaction: servers wait meanwhile
constexpr uint32_t kMaxBodyLen = 1u << 30;
constexpr uint32_t kMaxConnections = 100'000;
constexpr uint32_t kMaxSeconds = 30 * 86'400;
constexpr uint32_t kMaxWorkers = 256;
constexpr std::chrono::seconds kTimeToAnswer{600};

/// What stands there is kept unless the command line says otherwise.
template <class Value>
void set_number(const char *name, const std::string &text, uint32_t max, Value *value) {
  if (text.empty()) return;
  uint32_t number = 0;
  const char *end = text.data() + text.size();
  const auto [last, failure] = std::from_chars(text.data(), end, number);
  if (failure != std::errc() || last != end || number == 0 || number > max) {
    throw UsageError(std::string("bad ") + name + " \"" + text + "\": expected 1 to " +
                     std::to_string(max));
  }
  *value = Value(number);
}

std::string store_uri(const Arguments &arguments) {
  return arguments.store.empty() ? "sqlite:" + arguments.home + "/fleet.db" : arguments.store;
}

std::string group_of(const Arguments &arguments) {
  const std::string &group = arguments.group;
  if (group.empty()) return kDefaultGroup;
  if (is_device_id(group)) return group;
  throw UsageError(
      "bad group: expected 1 to 256 bytes of UTF-8 text, no control character, \" or \\");
}

// ---- Devices

EnrolledDevice enrolled_device(std::string_view text) {
  const DeviceInfo device = parse_device_info(text);
  if (!is_device_id(device.device_id)) {
    throw UsageError(
        "a device of this ID cannot call: expected 1 to 256 bytes of UTF-8 text, no "
        "control character, \" or \\");
  }
  return {device.device_id, base64url_encode(device.tee_key.encoded())};
}

/// A device file, or a file with one in each line.
std::vector<EnrolledDevice> read_devices(const std::string &file) {
  const std::string text = tools::read_file(file);
  size_t line = 0;
  try {
    if (json_problem(text).empty()) return {enrolled_device(text)};
    std::vector<EnrolledDevice> devices;
    for (size_t at = 0; at < text.size();) {
      ++line;
      const size_t end = std::min(text.find('\n', at), text.size());
      const std::string_view one = std::string_view(text).substr(at, end - at);
      if (one.find_first_not_of(" \t\r") != one.npos) devices.push_back(enrolled_device(one));
      at = end + 1;
    }
    return devices;
  } catch (const UsageError &error) {
    throw UsageError(file + (line == 0 ? "" : ":" + std::to_string(line)) + ": " + error.what());
  }
}

void enrol_all(const std::vector<EnrolledDevice> &devices, const std::string &group, Store *store) {
  for (size_t at = 0; at < devices.size(); at += kNumAtOnce) {
    const size_t end = std::min(at + kNumAtOnce, devices.size());
    try {
      store->enrol({devices.begin() + static_cast<ptrdiff_t>(at),
                    devices.begin() + static_cast<ptrdiff_t>(end)},
                   group);
    } catch (const UsageError &error) {
      if (at == 0) throw;
      throw UsageError(std::string(error.what()) + "; the first " + std::to_string(at) +
                       " devices are enrolled");
    }
  }
}

// ---- Plans

StoredPlan plan_for(const Identity &tsm, const std::string &file) {
  const Plan plan = read_plan(file);
  const bool has_apps = std::ranges::any_of(
      plan.domains, [](const PlannedDomain &domain) { return !domain.apps.empty(); });
  if (has_apps && !tsm.ca) {
    throw UsageError(file +
                     ": has apps, whose images need the CA-TSM key's signature: expected its "
                     "private key in the home directory");
  }
  return stored_plan(plan);
}

// ---- The server

http::ServerOptions server_options(const ServeArguments &arguments) {
  http::ServerOptions options;
  options.name = std::string(kServerName) + "/" + OTRP_VERSION;
  options.num_workers = std::clamp(std::thread::hardware_concurrency(), 2u, kMaxWorkers);
  set_number("--workers", arguments.workers, kMaxWorkers, &options.num_workers);
  set_number("--max-body", arguments.max_body, kMaxBodyLen, &options.limits.max_body_len);
  // One of the longest should always find room.
  options.max_unfinished_len = std::max(options.max_unfinished_len, options.limits.max_body_len);
  set_number("--max-connections", arguments.max_connections, kMaxConnections,
             &options.max_connections);
  set_number("--max-per-address", arguments.max_per_address, kMaxConnections,
             &options.max_connections_per_address);
  return options;
}

std::function<void(const http::LogEntry &)> log_of(const ServeArguments &arguments,
                                                   Service *service) {
  if (arguments.log != "text" && arguments.log != "json") {
    throw UsageError("bad --log \"" + arguments.log + "\": expected text or json");
  }
  return [service, is_json = arguments.log == "json"](const http::LogEntry &entry) {
    service->note(entry);
    if (is_json) {
      fprintf(stderr, "%s\n", http::log_json(entry).c_str());
    } else {
      tools::print_error_line(kServerName, http::log_text(entry));
    }
  };
}

http::ListenOptions listen_options(const ServeArguments &arguments) {
  if (arguments.tls_cert.empty() != arguments.tls_key.empty()) {
    throw UsageError("--tls-cert and --tls-key go together: expected both or neither");
  }
  return {.tls_cert = arguments.tls_cert,
          .tls_key = arguments.tls_key,
          .allowed_hosts = arguments.allowed_hosts};
}

}  // namespace

int run_enrol(const Arguments &arguments) {
  const std::string group = group_of(arguments);
  std::vector<EnrolledDevice> devices;
  for (const std::string &file : arguments.input_files) {
    std::ranges::copy(read_devices(file), std::back_inserter(devices));
  }
  Store store(store_uri(arguments));
  enrol_all(devices, group, &store);
  tools::write_file("-",
                    "enrolled: " + std::to_string(devices.size()) + " in group " + group + "\n");
  return 0;
}

int run_unenrol(const Arguments &arguments) {
  Store(store_uri(arguments)).remove(arguments.names);
  tools::write_file("-", "removed: " + std::to_string(arguments.names.size()) + "\n");
  return 0;
}

int run_assign(const Arguments &arguments) {
  const std::string group = group_of(arguments);
  const Identity tsm = Home(arguments.home).load_identity();
  const StoredPlan plan = plan_for(tsm, arguments.input_file);
  Store(store_uri(arguments)).assign(plan, group);
  tools::write_file("-", "group " + group + ": plan " + plan.digest + "\n");
  return 0;
}

int run_serve(const Arguments &arguments) {
  const ServeArguments &serve = arguments.serve;
  const http::Endpoint endpoint = http::parse_endpoint(serve.listen);
  std::optional<http::Endpoint> admin_endpoint;
  if (!serve.admin.empty()) admin_endpoint = http::parse_endpoint(serve.admin);
  http::ListenOptions listen = listen_options(serve);
  http::ServerOptions options = server_options(serve);
  std::chrono::seconds time_to_answer = kTimeToAnswer;
  set_number("--deadline", serve.deadline, kMaxSeconds, &time_to_answer);
  const Home home(arguments.home);
  const Identity tsm = home.load_identity();
  std::optional<StoredPlan> plan;
  if (!serve.plan.empty()) plan = plan_for(tsm, serve.plan);

  Store store(store_uri(arguments));
  Service service(tsm, &store, time_to_answer, !admin_endpoint);
  options.log = log_of(serve, &service);
  std::optional<Admin> admin;
  if (admin_endpoint) admin.emplace(&service, &store, home.admin_token());
  http::Server server(std::move(options));
  std::string urls = server.listen(endpoint, service.handler(), listen) + "\n";
  if (admin) {
    listen.allows_own_pages = true;
    urls += server.listen(*admin_endpoint, admin->handler(), std::move(listen)) + "\n";
  }
  if (plan) store.assign(*plan, kDefaultGroup);
  const Historian historian(&store);
  tools::write_file("-", urls);
  server.run();
  return 0;
}

}  // namespace tsm
