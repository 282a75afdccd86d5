// SPDX-License-Identifier: BSD-2-Clause
/// The commands of otrp-device. Each opens the device, does its work and leaves only the result on
/// standard output; failures are thrown.
#ifndef DEVICE_COMMANDS_H
#define DEVICE_COMMANDS_H

#include <string>

#include "device/connect.h"
#include "device/serve.h"

namespace device {

constexpr const char *kProgram = "otrp-device";

/// What the command line says, as it stands there.
struct Arguments : ServeArguments, ConnectArguments {
  bool stats = false;
  std::string message;
  std::string request_file;
  std::string response_file = "-";
  std::string image_file;  // empty: the TA image is not wanted
  std::string capacity;
  std::string taid;
  std::string object_id;
  std::string object_file;
  std::string command_id;
  std::string input_file;
  std::string output_file;
  std::string types;
};

void print_info(const Arguments &arguments);
void send_request(const Arguments &arguments);
void query_ta(const Arguments &arguments);
void print_device_id(const Arguments &arguments);
void list_objects(const Arguments &arguments);
void get_object(const Arguments &arguments);
void put_object(const Arguments &arguments);
void remove_object(const Arguments &arguments);
void invoke_once(const Arguments &arguments);
void obey_session(const Arguments &arguments);
void serve(const Arguments &arguments);
void connect(const Arguments &arguments);

}  // namespace device

#endif
