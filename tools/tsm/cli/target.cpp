// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/cli/target.h"

#include <algorithm>
#include <cstdlib>

#include "common/files.h"

namespace tsm {
namespace {

using tools::UsageError;

std::string environment(const char *name) {
  const char *value = std::getenv(name);
  return value == nullptr ? "" : value;
}

bool is_same_key(const RsaKey &one, const RsaKey &other) {
  return one.encoded() == other.encoded();
}

DeviceInfo recorded_device(const InventoryEntry &entry, const Home &home) {
  const std::optional<DeviceInfo> device = home.find_device(entry.key);
  if (device) return *device;
  throw UsageError("the record of " + entry.name + " is gone: expected `otrp-tsm device add " +
                   entry.name + "` again");
}

/// The device as the records have it, which `claimed` says to be.
DeviceInfo device_at(const std::string &url, const Home &home, const DeviceInfo &claimed) {
  const std::optional<DeviceInfo> known = home.find_device(claimed.tee_key.fingerprint());
  if (known && is_same_key(known->tee_key, claimed.tee_key)) return *known;
  throw UsageError("this TSM does not know the device at " + url + ", which says that its key is " +
                   claimed.tee_key.fingerprint() +
                   ": expected its device file, from whoever made it, in --device");
}

}  // namespace

DeviceInfo read_device_file(const std::string &file) {
  return parse_device_info(tools::read_file(file));
}

Target named_target(const Arguments &arguments) {
  Target target = {.state_dir = arguments.state_dir,
                   .url = arguments.url,
                   .ca_file = arguments.tls_ca_file,
                   .must_exist = arguments.must_exist};
  if (!target.url.empty() && !target.state_dir.empty()) {
    throw UsageError("--state and --url name two devices: expected one of them");
  }
  if (!arguments.device_file.empty()) target.device = read_device_file(arguments.device_file);
  return target;
}

Target known_target(const InventoryEntry &entry, const Home &home) {
  return {.name = entry.name,
          .state_dir = entry.state_dir,
          .url = entry.url,
          .ca_file = entry.ca_file,
          .must_exist = true,
          .device = recorded_device(entry, home)};
}

std::vector<Target> targets_of(const Arguments &arguments, const Home &home) {
  if (arguments.on.empty()) {
    Target target = named_target(arguments);
    if (target.url.empty() && target.state_dir.empty()) {
      target.state_dir = environment("OTRP_STATE");
    }
    return {target};
  }
  if (!arguments.state_dir.empty() || !arguments.url.empty() || !arguments.device_file.empty()) {
    throw UsageError(
        "--on names devices that the inventory knows: expected no --state, --url and "
        "--device beside it");
  }
  std::vector<Target> targets;
  for (const InventoryEntry &entry : home.inventory().select(arguments.on)) {
    targets.push_back(known_target(entry, home));
  }
  return targets;
}

bool names_several(const Arguments &arguments) {
  return arguments.on.size() > 1 || std::ranges::any_of(arguments.on, is_pattern);
}

std::optional<DeviceInfo> find_named_device(const Arguments &arguments, const Home &home) {
  if (!arguments.device_file.empty() && !arguments.on.empty()) {
    throw UsageError("--device and --on name two devices: expected one of them");
  }
  if (!arguments.device_file.empty()) return read_device_file(arguments.device_file);
  if (arguments.on.empty()) return std::nullopt;
  const std::vector<InventoryEntry> entries = home.inventory().select(arguments.on);
  if (entries.size() == 1) return recorded_device(entries.front(), home);
  throw UsageError("--on names " + std::to_string(entries.size()) + " devices: expected one");
}

DeviceInfo named_device(const Arguments &arguments, const Home &home) {
  std::optional<DeviceInfo> device = find_named_device(arguments, home);
  if (device) return *std::move(device);
  throw UsageError("no device is named: expected --device FILE or --on NAME");
}

std::unique_ptr<Channel> open_channel(const Target &target) {
  if (!target.url.empty()) return open_served_device(target.url, target.ca_file);
  if (!target.state_dir.empty()) return open_local_device(target.state_dir, target.must_exist);
  throw UsageError(target.name.empty()
                       ? "no device is named: expected --state DIR, --url URL or --on NAME"
                       : "no way to " + target.name + " is known: expected `otrp-tsm device add " +
                             target.name + "` with --state DIR or --url URL before");
}

DeviceInfo identify(const Target &target, const Home &home, Channel *channel) {
  if (!target.url.empty() && target.device) return *target.device;
  DeviceInfo claimed = channel->info();
  if (!target.url.empty()) return device_at(target.url, home, claimed);
  if (target.device && !is_same_key(target.device->tee_key, claimed.tee_key)) {
    throw UsageError("the device in " + target.state_dir + " has the key " +
                     claimed.tee_key.fingerprint() + ": expected " +
                     target.device->tee_key.fingerprint());
  }
  return claimed;
}

}  // namespace tsm
