// SPDX-License-Identifier: BSD-2-Clause
/// The devices that a command line names: how each is reached, and whose key it must have.
#ifndef TSM_CLI_TARGET_H
#define TSM_CLI_TARGET_H

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "tsm/cli/channel.h"
#include "tsm/cli/commands.h"
#include "tsm/home/home.h"

namespace tsm {

/// Functions throw tools::UsageError, and those with a channel ChannelError.
struct Target {
  std::string name = {};       // in the inventory, if it has one
  std::string state_dir = {};  // a way to it: at most one of these
  std::string url = {};
  std::string ca_file = {};               // for https
  bool must_exist = false;                // in the directory
  std::optional<DeviceInfo> device = {};  // who it must be, where that is known already
};

/// A device's file: what `otrp-device info` prints.
DeviceInfo read_device_file(const std::string &file);

/// The device that --state, --url and --device name.
Target named_target(const Arguments &arguments);

/// A device of the inventory.
Target known_target(const InventoryEntry &entry, const Home &home);

/// The devices that `arguments` name by --on, or else the one of named_target(), which $OTRP_STATE
/// may name, too.
std::vector<Target> targets_of(const Arguments &arguments, const Home &home);

/// Whether they are several by their name, however many there are.
bool names_several(const Arguments &arguments);

/// The one device that --device or --on name; nothing when neither is given.
std::optional<DeviceInfo> find_named_device(const Arguments &arguments, const Home &home);
/// The same, where one must be named.
DeviceInfo named_device(const Arguments &arguments, const Home &home);

std::unique_ptr<Channel> open_channel(const Target &target);

/// Who the device is. A state directory is this machine's own and says so itself; whoever answers
/// at a URL may be anyone, so its key must be known before.
DeviceInfo identify(const Target &target, const Home &home, Channel *channel);

}  // namespace tsm

#endif
