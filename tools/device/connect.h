// SPDX-License-Identifier: BSD-2-Clause
/// `otrp-device connect`: a device calls its TSM, once or for ever.
#ifndef DEVICE_CONNECT_H
#define DEVICE_CONNECT_H

#include <string>

#include "device/serve.h"

namespace device {

/// Numbers as the command line gives them; empty ones are defaults.
struct ConnectArguments {
  std::string url;
  std::string image_directory;  // empty: TA images are dropped
  std::string ca_file;          // empty: the roots of the system
  std::string every;            // empty: once
  std::string max_messages;
  std::string max_reply;
  std::string connect_time;
  std::string reply_time;
  std::string retries;
  std::string first_pause;
  std::string call_log = "text";  // or "json"
};

/// Each message is a line on standard error. Returns when a call ended well or SIGTERM or SIGINT
/// came; throws what kept the only call from that, or tools::UsageError.
void connect_device(const DeviceArguments &device, const ConnectArguments &arguments);

}  // namespace device

#endif
