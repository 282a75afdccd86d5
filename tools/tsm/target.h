// SPDX-License-Identifier: BSD-2-Clause
/// The device that a command line names: how it is reached, and whose key it must have.
#ifndef TSM_TARGET_H
#define TSM_TARGET_H

#include <memory>
#include <optional>
#include <string>

#include "tsm/channel.h"
#include "tsm/commands.h"
#include "tsm/home.h"

namespace tsm {

/// Functions throw tools::UsageError, and those with a channel ChannelError.
struct Target {
  std::string state_dir = {};  // a way to it: at most one of these
  std::string url = {};
  std::string ca_file = {};               // for https
  bool must_exist = false;                // in the directory
  std::optional<DeviceInfo> device = {};  // who it must be, where that is known already
};

DeviceInfo read_device_file(const std::string &file);

/// The one device that `arguments` name.
Target target_of(const Arguments &arguments);

std::unique_ptr<Channel> open_channel(const Target &target);

/// Who the device is. A state directory is this machine's own and says so itself; whoever answers
/// at a URL may be anyone, so its key must be known before.
DeviceInfo identify(const Target &target, const Home &home, Channel *channel);

}  // namespace tsm

#endif
