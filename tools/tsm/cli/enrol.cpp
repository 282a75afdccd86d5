// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/cli/enrol.h"

#include <filesystem>
#include <sstream>

namespace tsm {
namespace {

using tools::UsageError;

/// A device may be named from another folder next time.
std::string absolute(const std::string &path) {
  return path.empty() ? "" : std::filesystem::absolute(path).lexically_normal().string();
}

void set_option(const std::string &option, const std::string &value, Target *target) {
  if (option == "--state") {
    target->state_dir = value;
  } else if (option == "--url") {
    target->url = value;
  } else if (option == "--ca-file") {
    target->ca_file = value;
  } else if (option == "--device") {
    target->device = read_device_file(value);
  } else {
    throw UsageError("\"" + option + "\" is not expected here");
  }
}

/// A device file with more members.
Target parse_object(const std::string &line) {
  const std::optional<Json> object = parse_json(line);
  const auto text = [&](const char *name) {
    const std::string *member = object ? find_string(*object, name) : nullptr;
    return member == nullptr ? "" : *member;
  };
  return {.name = text("name"),
          .state_dir = text("state"),
          .url = text("url"),
          .ca_file = text("ca_file"),
          .device = parse_device_info(line)};
}

/// Nothing for a line without words.
std::optional<Target> parse_line(const std::string &line) {
  if (line.starts_with("{")) return parse_object(line);
  std::istringstream words(line);
  Target target;
  if (!(words >> target.name) || target.name.front() == '#') return std::nullopt;
  for (std::string option, value; words >> option;) {
    if (!(words >> value)) throw UsageError(option + " has no value");
    set_option(option, value, &target);
  }
  return target;
}

void check_way(const Target &target) {
  if (!target.state_dir.empty() && !target.url.empty()) {
    throw UsageError("--state and --url are two ways to one device: expected one of them");
  }
  if (target.state_dir.empty() && target.url.empty() && !target.device) {
    throw UsageError("no device is named: expected --state DIR, --url URL or --device FILE");
  }
}

struct Found {
  DeviceInfo device;
  bool is_claimed = false;
};

/// Whoever answers at a URL may be anyone: what he says is believed of a device that is known, and
/// else marked as what he says.
Found find_device(const Target &target, const Home &home) {
  if (target.device && target.state_dir.empty()) return {*target.device};
  const std::unique_ptr<Channel> channel = open_channel(target);
  if (target.url.empty()) return {identify(target, home, channel.get())};
  const DeviceInfo claimed = channel->info();
  const std::string key = claimed.tee_key.fingerprint();
  const std::optional<DeviceInfo> known = home.find_device(key);
  if (!known || known->tee_key.encoded() != claimed.tee_key.encoded()) return {claimed, true};
  const Inventory inventory = home.inventory();
  const InventoryEntry *named = inventory.find_by_key(key);
  return {*known, named != nullptr && named->is_claimed};
}

}  // namespace

std::vector<Target> parse_device_list(const std::string &text, const std::string &file) {
  std::vector<Target> targets;
  std::istringstream lines(text);
  size_t number = 0;
  for (std::string line; std::getline(lines, line);) {
    ++number;
    try {
      const std::optional<Target> target = parse_line(line);
      if (!target) continue;
      check_device_name(target->name);
      check_way(*target);
      targets.push_back(*target);
    } catch (const UsageError &error) {
      throw UsageError(file + ", line " + std::to_string(number) + ": " + error.what() +
                       "; expected \"NAME --state DIR\", \"NAME --url URL\" or \"NAME --device "
                       "FILE\", or a device file in one line with a \"name\"");
    }
  }
  return targets;
}

Enrolled enrol(const Target &target, const Home &home) {
  check_device_name(target.name);
  check_way(target);
  const Found found = find_device(target, home);
  return {{.name = target.name,
           .key = found.device.tee_key.fingerprint(),
           .state_dir = absolute(target.state_dir),
           .url = target.url,
           .ca_file = absolute(target.ca_file),
           .is_claimed = found.is_claimed},
          found.device};
}

}  // namespace tsm
