// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/target.h"

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

/// The device as the records have it, which `claimed` says to be.
DeviceInfo recorded_device(const std::string &url, const Home &home, const DeviceInfo &claimed) {
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

Target target_of(const Arguments &arguments) {
  Target target = {.state_dir = arguments.state_dir,
                   .url = arguments.url,
                   .ca_file = arguments.tls_ca_file,
                   .must_exist = arguments.must_exist};
  if (!target.url.empty() && !target.state_dir.empty()) {
    throw UsageError("--state and --url name two devices: expected one of them");
  }
  if (target.url.empty() && target.state_dir.empty()) target.state_dir = environment("OTRP_STATE");
  if (target.url.empty() && target.state_dir.empty()) {
    throw UsageError("no device is named: expected --state DIR or --url URL");
  }
  if (!arguments.device_file.empty()) target.device = read_device_file(arguments.device_file);
  return target;
}

std::unique_ptr<Channel> open_channel(const Target &target) {
  return target.url.empty() ? open_local_device(target.state_dir, target.must_exist)
                            : open_served_device(target.url, target.ca_file);
}

DeviceInfo identify(const Target &target, const Home &home, Channel *channel) {
  if (!target.url.empty() && target.device) return *target.device;
  DeviceInfo claimed = channel->info();
  if (!target.url.empty()) return recorded_device(target.url, home, claimed);
  if (target.device && !is_same_key(target.device->tee_key, claimed.tee_key)) {
    throw UsageError("the device in " + target.state_dir + " has the key " +
                     claimed.tee_key.fingerprint() + ": expected " +
                     target.device->tee_key.fingerprint());
  }
  return claimed;
}

}  // namespace tsm
