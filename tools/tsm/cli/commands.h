// SPDX-License-Identifier: BSD-2-Clause
/// What each command of otrp-tsm does. Functions return an exit code, and throw tools::UsageError
/// for wrong input and NotVerified for a response that is not to be believed.
#ifndef TSM_CLI_COMMANDS_H
#define TSM_CLI_COMMANDS_H

#include <string>
#include <vector>

#include "tsm/protocol/messages.h"
#include "tsm/protocol/request.h"

namespace tsm {

constexpr int kExitNotVerified = 3;

/// How devices that call are served. Numbers are texts; empty: the default.
struct ServeArguments {
  std::string listen = "127.0.0.1:8090";
  std::string admin;  // likewise; empty: none
  std::string plan;
  std::string tls_cert;
  std::string tls_key;
  std::vector<std::string> allowed_hosts;
  std::string deadline;
  std::string workers;
  std::string max_body;
  std::string max_connections;
  std::string max_per_address;
  std::string log = "text";
};

/// The command line, read. Files are named by path, "-" for a standard stream.
struct Arguments {
  std::string home = "./tsm";
  std::string tsmid;
  std::string ca_file;
  std::string device_file;
  std::string dsi_file;
  std::string dsi_out_file;
  std::string response_file;
  std::string request_file;
  bool accept_old = false;
  std::string input_file;
  std::string output_file = "-";
  std::string image_file;
  std::string image_out_file;
  std::string plan_file;
  std::string spcert;  // a file, or the certificate itself
  std::string state_dir;
  bool must_exist = false;  // the device in `state_dir`
  std::string url;
  std::string tls_ca_file;
  std::vector<std::string> codes;        // to explain
  std::vector<std::string> input_files;  // to inspect
  std::vector<std::string> key_files;
  bool json = false;
  bool trace = false;           // show all that the device logs
  bool summary = false;         // instead of each device
  std::vector<std::string> on;  // names of the inventory, and patterns
  std::vector<std::string> names;
  std::string list_file;
  unsigned num_jobs = 1;  // at once
  MessageId message = MessageId::kGetDeviceState;
  RequestOptions request;
  std::string store;  // of a fleet; empty: in the home
  std::string group;
  ServeArguments serve;
};

int run_init(const Arguments &arguments);
int run_request(const Arguments &arguments);
int run_response(const Arguments &arguments);
int run_image_pack(const Arguments &arguments);
int run_image_show(const Arguments &arguments);
int run_manage(const Arguments &arguments);
int run_show(const Arguments &arguments);
int run_plan(const Arguments &arguments);
int run_apply(const Arguments &arguments);
int run_device_add(const Arguments &arguments);
int run_device_list(const Arguments &arguments);
int run_device_remove(const Arguments &arguments);
int run_enrol(const Arguments &arguments);
int run_unenrol(const Arguments &arguments);
int run_assign(const Arguments &arguments);
int run_serve(const Arguments &arguments);

}  // namespace tsm

#endif
