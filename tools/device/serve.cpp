// SPDX-License-Identifier: BSD-2-Clause
#include "device/serve.h"

#include <cstdio>

#include "common/error_line.h"
#include "common/files.h"
#include "device/commands.h"
#include "device/http_service.h"
#include "device/raw_session.h"
#include "device/state_directory.h"
#include "http/server.h"

namespace device {
namespace {

constexpr uint32_t kMaxServedLen = 1u << 30;  // what a request and its answer can have at once
constexpr uint32_t kMaxHeaderLen = 1u << 20;
constexpr uint32_t kMaxConnections = 100'000;
constexpr uint32_t kMaxTimeLimit = 86'400;

/// What stands there is kept unless the command line says otherwise.
template <class Value>
void set_number(const char *name, const std::string &text, uint32_t max, Value &value) {
  if (text.empty()) return;
  const uint32_t number = parse_number(name, text, max);
  if (number == 0) throw tools::UsageError(std::string(name) + " is 0: expected at least 1");
  value = Value(number);
}

http::ServerOptions server_options(const ServeArguments &arguments) {
  http::ServerOptions options;
  options.name = std::string(kProgram) + "/" + OTRP_VERSION;
  set_number("--max-body", arguments.max_body, kMaxServedLen, options.limits.max_body_len);
  set_number("--max-header", arguments.max_header, kMaxHeaderLen, options.limits.max_header_len);
  set_number("--max-headers", arguments.max_headers, kMaxHeaderLen, options.limits.max_headers);
  // One of the longest should always find room.
  options.max_unfinished_len = std::max(options.max_unfinished_len, options.limits.max_body_len);
  set_number("--max-unfinished", arguments.max_unfinished, kMaxServedLen,
             options.max_unfinished_len);
  set_number("--max-connections", arguments.max_connections, kMaxConnections,
             options.max_connections);
  set_number("--max-per-address", arguments.max_per_address, kMaxConnections,
             options.max_connections_per_address);
  set_number("--request-time", arguments.request_time, kMaxTimeLimit, options.request_time);
  set_number("--answer-time", arguments.answer_time, kMaxTimeLimit, options.answer_time);
  set_number("--idle-time", arguments.idle_time, kMaxTimeLimit, options.idle_time);
  if (arguments.log == "json") {
    options.log = [](const http::LogEntry &entry) {
      fprintf(stderr, "%s\n", http::log_json(entry).c_str());
    };
  } else if (arguments.log == "text") {
    options.log = [](const http::LogEntry &entry) {
      tools::print_error_line(kProgram, http::log_text(entry));
    };
  } else {
    throw tools::UsageError("bad --log \"" + arguments.log + "\": expected text or json");
  }
  return options;
}

http::ListenOptions listen_options(const ServeArguments &arguments) {
  if (arguments.tls_cert.empty() != arguments.tls_key.empty()) {
    throw tools::UsageError("--tls-cert and --tls-key go together: expected both or neither");
  }
  return {.tls_cert = arguments.tls_cert,
          .tls_key = arguments.tls_key,
          .allowed_hosts = arguments.allowed_hosts};
}

}  // namespace

void serve_device(const ServeArguments &arguments) {
  const http::Endpoint endpoint = http::parse_endpoint(arguments.listen);
  http::ListenOptions options = listen_options(arguments);
  http::check_tls(options);
  http::Server server(server_options(arguments));
  StateDevice device(arguments.state_directory, arguments.must_exist);
  HttpService service(device, arguments.state_directory, arguments.trace);
  tools::write_file("-", server.listen(endpoint, service.handler(), std::move(options)) + "\n");
  server.run();
}

}  // namespace device
