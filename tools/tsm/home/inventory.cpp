// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/home/inventory.h"

#include <fnmatch.h>

#include <algorithm>

#include "common/files.h"
#include "common/near_miss.h"

namespace tsm {
namespace {

using tools::UsageError;

constexpr size_t kMaxNameLen = 64;
constexpr std::string_view kAll = "all";

bool is_name_character(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '.' ||
         c == '_' || c == '-';
}

bool is_name(std::string_view name) {
  return !name.empty() && name.size() <= kMaxNameLen && name != kAll && name.front() != '-' &&
         name.front() != '.' && std::ranges::all_of(name, is_name_character);
}

/// It is the name of a folder, too.
bool is_fingerprint(std::string_view key) {
  return !key.empty() && std::ranges::all_of(key, [](char c) {
    return (c >= '0' && c <= '9') || (c >= 'a' && c <= 'f');
  });
}

std::string text_of(const Json &object, std::string_view name) {
  const std::string *text = find_string(object, name);
  return text == nullptr ? "" : *text;
}

InventoryEntry parse_entry(const std::string &name, const Json &value) {
  const auto claimed = value.is_object() ? value.find("claimed") : value.end();
  return {.name = name,
          .key = text_of(value, "key"),
          .state_dir = text_of(value, "state"),
          .url = text_of(value, "url"),
          .ca_file = text_of(value, "ca_file"),
          .is_claimed = value.is_object() && claimed != value.end() && *claimed == true};
}

using Entries = std::map<std::string, InventoryEntry>;

std::vector<InventoryEntry> values_of(const Entries &entries) {
  std::vector<InventoryEntry> values;
  for (const auto &[name, entry] : entries) values.push_back(entry);
  return values;
}

std::vector<std::string> names_of(const Entries &entries) {
  std::vector<std::string> names;
  for (const auto &[name, entry] : entries) names.push_back(name);
  return names;
}

}  // namespace

Json entry_json(const InventoryEntry &entry) {
  Json value = {{"key", entry.key}};
  if (!entry.state_dir.empty()) value["state"] = entry.state_dir;
  if (!entry.url.empty()) value["url"] = entry.url;
  if (!entry.ca_file.empty()) value["ca_file"] = entry.ca_file;
  if (entry.is_claimed) value["claimed"] = true;
  return value;
}

void check_device_name(const std::string &name) {
  if (is_name(name)) return;
  throw UsageError("bad device name \"" + name + "\": expected 1 to " +
                   std::to_string(kMaxNameLen) +
                   " letters, digits, \".\", \"_\" and \"-\", the first a letter or a digit, and "
                   "not \"all\"");
}

bool is_pattern(const std::string &pattern) {
  return pattern == kAll || pattern.find_first_of("*?[") != std::string::npos;
}

Inventory::Inventory(const std::string &file) : file_(file) {
  if (!tools::file_exists(file)) return;
  const std::optional<Json> value = parse_json(tools::read_file(file));
  const Json *devices = value ? find_object(*value, "devices") : nullptr;
  bool is_good = devices != nullptr;
  if (is_good) {
    for (const auto &[name, members] : devices->items()) {
      entries_[name] = parse_entry(name, members);
      is_good = is_good && is_name(name) && is_fingerprint(entries_[name].key);
    }
  }
  if (is_good) return;
  throw UsageError("the inventory " + file +
                   " is damaged: remove it, and add the devices anew with `otrp-tsm device add`");
}

const InventoryEntry *Inventory::find(const std::string &name) const {
  const auto found = entries_.find(name);
  return found == entries_.end() ? nullptr : &found->second;
}

const InventoryEntry *Inventory::find_by_key(const std::string &key) const {
  for (const auto &[name, entry] : entries_) {
    if (entry.key == key) return &entry;
  }
  return nullptr;
}

std::vector<InventoryEntry> Inventory::entries() const {
  return values_of(entries_);
}

std::vector<InventoryEntry> Inventory::select(const std::vector<std::string> &patterns) const {
  Entries selected;
  for (const std::string &pattern : patterns) {
    bool is_met = false;
    for (const auto &[name, entry] : entries_) {
      const bool fits = pattern == kAll || fnmatch(pattern.c_str(), name.c_str(), 0) == 0;
      if (fits) selected[name] = entry;
      is_met = is_met || fits;
    }
    if (is_met) continue;
    throw UsageError("no device is called \"" + pattern + "\"" +
                     (is_pattern(pattern) ? " or alike" : "") + ": " +
                     tools::suggestion(pattern, names_of(entries_),
                                       "expected a name that `otrp-tsm device list` shows"));
  }
  return values_of(selected);
}

void Inventory::add(const InventoryEntry &entry) {
  check_device_name(entry.name);
  const InventoryEntry *known = find(entry.name);
  if (known != nullptr && known->key != entry.key) {
    throw UsageError(entry.name + " is another device, with the TEE key " + known->key +
                     ": expected another name than that, or `otrp-tsm device rm " + entry.name +
                     "` before");
  }
  const InventoryEntry *same = find_by_key(entry.key);
  if (same != nullptr && same->name != entry.name) {
    throw UsageError("the device with the TEE key " + entry.key + " is called " + same->name +
                     " already: expected that name, or `otrp-tsm device rm " + same->name +
                     "` before");
  }
  entries_[entry.name] = entry;
}

void Inventory::save() const {
  Json devices = Json::object();
  for (const auto &[name, entry] : entries_) devices[name] = entry_json(entry);
  tools::write_file(file_, Json{{"devices", devices}}.dump(1) + "\n");
}

void change_inventory(const std::string &file, const std::function<void(Inventory *)> &change) {
  const tools::FileLock lock(file + ".lock");
  Inventory inventory(file);
  change(&inventory);
  inventory.save();
}

}  // namespace tsm
