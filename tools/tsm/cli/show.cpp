// SPDX-License-Identifier: BSD-2-Clause
#include <algorithm>
#include <cstdio>
#include <map>

#include "common/files.h"
#include "tsm/cli/commands.h"
#include "tsm/cli/jobs.h"
#include "tsm/cli/report.h"
#include "tsm/cli/target.h"
#include "tsm/home/home.h"
#include "tsm/protocol/dsi.h"

namespace tsm {
namespace {

struct Shown {
  std::string name;  // in the inventory; empty for a device that has none
  DeviceInfo device;
  std::optional<Json> dsi;
};

/// Those with a name come first, by their names.
std::vector<Shown> all_devices(const Home &home) {
  const Inventory inventory = home.inventory();
  std::vector<Shown> devices;
  for (const KnownDevice &known : home.known_devices()) {
    const InventoryEntry *entry = inventory.find_by_key(known.device.tee_key.fingerprint());
    devices.push_back({entry == nullptr ? "" : entry->name, known.device, read_dsi(known.folder)});
  }
  std::ranges::stable_sort(
      devices, {}, [](const Shown &shown) { return std::pair(shown.name.empty(), shown.name); });
  return devices;
}

std::vector<Shown> devices_of(const Arguments &arguments, const Home &home) {
  if (arguments.device_file.empty() && arguments.on.empty()) return all_devices(home);
  std::vector<Target> targets;
  if (arguments.on.empty()) {
    targets.push_back({.device = named_device(arguments, home)});
  } else {
    targets = targets_of(arguments, home);
  }
  std::vector<Shown> devices;
  for (const Target &target : targets) {
    devices.push_back({target.name, *target.device, read_dsi(home.folder_of(*target.device))});
  }
  return devices;
}

void show_each(const std::vector<Shown> &devices, bool as_json) {
  Json list = Json::array();
  std::string lines;
  for (const Shown &shown : devices) {
    const Json *dsi = shown.dsi ? &*shown.dsi : nullptr;
    if (as_json) {
      Json value = Json::object();
      if (!shown.name.empty()) value["name"] = shown.name;
      value.update(device_json(shown.device, dsi));
      list.push_back(value);
    } else {
      lines += (shown.name.empty() ? "" : shown.name + "  ") + device_lines(&shown.device, dsi);
    }
  }
  tools::write_file("-", as_json ? list.dump(2) + "\n" : lines);
}

// ---- Many devices on one screen

struct Group {
  std::string state;
  size_t num_devices = 0;
  std::vector<std::string> names;
};

/// Devices that hold the same, the largest group first.
std::vector<Group> group_by_state(const std::vector<Shown> &devices) {
  std::map<std::string, Group> by_state;
  for (const Shown &shown : devices) {
    const std::string state = shown.dsi ? dsi_line(*shown.dsi) : "state not known";
    Group &group = by_state[state];
    group.state = state;
    ++group.num_devices;
    group.names.push_back(shown.name.empty() ? shown.device.device_id : shown.name);
  }
  std::vector<Group> groups;
  for (auto &[state, group] : by_state) groups.push_back(std::move(group));
  std::ranges::stable_sort(groups, std::greater<>(), &Group::num_devices);
  return groups;
}

/// Cut between two characters of UTF-8.
std::string shortened(const std::string &text, size_t max_len) {
  if (text.size() <= max_len) return text;
  size_t len = max_len;
  while (len > 0 && (static_cast<unsigned char>(text[len]) & 0xC0) == 0x80) --len;
  return text.substr(0, len) + "...";
}

std::string group_line(const Group &group) {
  constexpr size_t kMaxStateLen = 60;
  char count[16];
  std::snprintf(count, sizeof(count), "%6zu  ", group.num_devices);
  return count + shortened(group.state, kMaxStateLen) + "  (" + some_names(group.names) + ")\n";
}

void show_summary(const std::vector<Shown> &devices, bool as_json) {
  constexpr size_t kMaxGroups = 18;
  const std::vector<Group> groups = group_by_state(devices);
  Json list = Json::array();
  std::string lines = std::to_string(devices.size()) + " devices\n";
  size_t num_left = devices.size();
  for (size_t i = 0; i < groups.size(); ++i) {
    list.push_back({{"devices", groups[i].num_devices},
                    {"state", groups[i].state},
                    {"names", groups[i].names}});
    if (i >= kMaxGroups) continue;
    lines += group_line(groups[i]);
    num_left -= groups[i].num_devices;
  }
  if (num_left != 0) lines += "and " + std::to_string(num_left) + " in other states\n";
  tools::write_file("-", as_json ? list.dump(2) + "\n" : lines);
}

}  // namespace

int run_show(const Arguments &arguments) {
  if (!arguments.dsi_file.empty()) {
    const Json dsi = parse_dsi(tools::read_file(arguments.dsi_file));
    tools::write_file("-", arguments.json ? dsi.dump(2) + "\n" : device_lines(nullptr, &dsi));
    return 0;
  }
  const std::vector<Shown> devices = devices_of(arguments, Home(arguments.home));
  if (devices.empty() && !arguments.json) {
    tools::write_file("-", "no devices known in " + arguments.home + ": run get-device-state\n");
  } else if (arguments.summary) {
    show_summary(devices, arguments.json);
  } else {
    show_each(devices, arguments.json);
  }
  return 0;
}

}  // namespace tsm
