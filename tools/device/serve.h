// SPDX-License-Identifier: BSD-2-Clause
/// `otrp-device serve`: a device behind an HTTP server, until SIGTERM or SIGINT.
#ifndef DEVICE_SERVE_H
#define DEVICE_SERVE_H

#include <string>
#include <vector>

namespace device {

/// The device that the command line names.
struct DeviceArguments {
  std::string state_directory;  // or what else names it to the Client API
  bool must_exist = false;
  bool trace = false;  // show all that the agent logs
};

/// Numbers as the command line gives them; empty ones are the server's defaults.
struct ServeArguments : DeviceArguments {
  std::string listen = "127.0.0.1:8080";
  std::vector<std::string> allowed_hosts;
  std::string tls_cert;
  std::string tls_key;
  std::string max_body;
  std::string max_header;
  std::string max_headers;
  std::string max_unfinished;
  std::string max_connections;
  std::string max_per_address;
  std::string request_time;
  std::string answer_time;
  std::string idle_time;
  std::string log = "text";
};

/// When it listens, the URL is on standard output; each exchange is a line on standard error.
/// Throws tools::UsageError for what cannot be done so.
void serve_device(const ServeArguments &arguments);

}  // namespace device

#endif
