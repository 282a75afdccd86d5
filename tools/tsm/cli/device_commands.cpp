// SPDX-License-Identifier: BSD-2-Clause
#include <algorithm>

#include "common/error_line.h"
#include "common/files.h"
#include "tsm/cli/commands.h"
#include "tsm/cli/enrol.h"
#include "tsm/cli/jobs.h"
#include "tsm/protocol/dsi.h"

namespace tsm {
namespace {

using tools::UsageError;

/// Those of a list; --url, with the name in the place of {name}, is the way to devices without one.
std::vector<Target> listed_targets(const Arguments &arguments) {
  constexpr std::string_view kName = "{name}";
  if (!arguments.names.empty() || !arguments.state_dir.empty() || !arguments.device_file.empty()) {
    throw UsageError("--list says which devices there are: expected no NAME, --state and --device");
  }
  const size_t place = arguments.url.find(kName);
  if (!arguments.url.empty() && place == std::string::npos) {
    throw UsageError("one --url for all of a list: expected {name} in it, for their names");
  }
  const std::string text = tools::read_file(arguments.list_file);
  std::vector<Target> targets = parse_device_list(text, arguments.list_file);
  for (Target &target : targets) {
    if (arguments.url.empty() || !target.url.empty() || !target.state_dir.empty()) continue;
    target.url = std::string(arguments.url).replace(place, kName.size(), target.name);
    target.ca_file = arguments.tls_ca_file;
  }
  return targets;
}

/// The device of the command line, or those of a list.
std::vector<Target> new_targets(const Arguments &arguments) {
  if (!arguments.list_file.empty()) return listed_targets(arguments);
  if (arguments.names.size() != 1) throw UsageError("expected the NAME of one device, or --list");
  Target target = named_target(arguments);
  target.name = arguments.names.front();
  return {target};
}

void tell_claim(const InventoryEntry &entry) {
  if (!entry.is_claimed) return;
  tools::print_error_line("note", "the TEE key of " + entry.name + ", " + entry.key +
                                      ", is what the device at " + entry.url +
                                      " says itself, which proves nothing: compare it with its "
                                      "maker's, or add it with --device");
}

/// The name comes first: a key whose device could not be named is not to be known.
Outcome add_device(const Target &target, const Home &home) {
  const Enrolled enrolled = enrol(target, home);
  home.change_inventory([&](Inventory *inventory) { inventory->add(enrolled.entry); });
  home.open_record(enrolled.device).keep_device();
  tell_claim(enrolled.entry);
  return {.report = enrolled.entry.name + "  device " + printable(enrolled.device.device_id) +
                    "  TEE key " + enrolled.entry.key + "\n"};
}

std::vector<InventoryEntry> chosen_entries(const Inventory &inventory,
                                           const std::vector<std::string> &names) {
  return names.empty() ? inventory.entries() : inventory.select(names);
}

std::string way_of(const InventoryEntry &entry) {
  if (!entry.url.empty()) return entry.url;
  return entry.state_dir.empty() ? "-" : entry.state_dir;
}

Json list_json(const std::vector<InventoryEntry> &entries) {
  Json list = Json::array();
  for (const InventoryEntry &entry : entries) {
    Json value = {{"name", entry.name}};
    value.update(entry_json(entry));
    list.push_back(value);
  }
  return list;
}

}  // namespace

int run_device_add(const Arguments &arguments) {
  const Home home(arguments.home);
  (void)home.load_identity();
  const std::vector<Target> targets = new_targets(arguments);
  const auto add = [&](size_t i) { return add_device(targets[i], home); };
  if (arguments.list_file.empty()) {
    return print_outcome(outcome_of([&] { return add(0); }), false);
  }
  Jobs jobs = {.names = {}, .work = add, .num_at_once = arguments.num_jobs};
  for (const Target &target : targets) jobs.names.push_back(target.name);
  const std::vector<Outcome> outcomes = run_jobs(jobs);
  tools::write_file("-", summary_of(jobs.names, outcomes, "added") + "\n");
  return exit_code_of(outcomes);
}

int run_device_list(const Arguments &arguments) {
  const std::vector<InventoryEntry> entries =
      chosen_entries(Home(arguments.home).inventory(), arguments.names);
  if (arguments.json) {
    tools::write_file("-", list_json(entries).dump(2) + "\n");
    return 0;
  }
  if (entries.empty()) {
    tools::print_error_line("note", "the inventory is empty: `otrp-tsm device add` fills it");
  }
  size_t width = 0;
  for (const InventoryEntry &entry : entries) width = std::max(width, entry.name.size());
  std::string lines;
  for (const InventoryEntry &entry : entries) {
    lines += entry.name + std::string(width - entry.name.size() + 2, ' ') + entry.key + "  " +
             printable(way_of(entry)) + (entry.is_claimed ? "  (the key is its own word)" : "") +
             "\n";
  }
  tools::write_file("-", lines);
  return 0;
}

int run_device_remove(const Arguments &arguments) {
  const Home home(arguments.home);
  for (const InventoryEntry &entry : home.inventory().select(arguments.names)) {
    const std::optional<DeviceInfo> device = home.find_device(entry.key);
    if (device) home.forget(*device);
    home.change_inventory([&](Inventory *inventory) { inventory->remove(entry.name); });
    tools::write_file("-", "forgot " + entry.name + "\n");
  }
  return 0;
}

}  // namespace tsm
