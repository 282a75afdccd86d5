// SPDX-License-Identifier: BSD-2-Clause
/// The names by which an operator calls his devices, and how each is reached. A file:
///
///     {"devices": {"kitchen": {"key": "0123456789abcdef", "url": "https://..."}, ...}}
///
/// "key" is the fingerprint of the device's TEE key, by which the home finds its record: device
/// file, last state, requests that wait. "state" is a directory on this machine, "ca_file" the CAs
/// to trust for a "url"; a device without either is only known. "claimed" is true where the key is
/// known from the device's own word alone.
///
/// Functions throw tools::UsageError.
#ifndef TSM_HOME_INVENTORY_H
#define TSM_HOME_INVENTORY_H

#include <functional>
#include <map>
#include <string>
#include <vector>

#include "tsm/protocol/json.h"

namespace tsm {

struct InventoryEntry {
  std::string name;
  std::string key;
  std::string state_dir = {};  // at most one of these; absolute
  std::string url = {};
  std::string ca_file = {};
  bool is_claimed = false;
};

/// Its members in the file.
Json entry_json(const InventoryEntry &entry);

/// A name stands in command lines and at the beginning of lines: letters, digits, ".", "_" and "-".
void check_device_name(const std::string &name);

/// Whether `pattern` can stand for several devices: "all", or one with "*", "?" or "[".
bool is_pattern(const std::string &pattern);

class Inventory {
 public:
  /// What the file says; without a file there are no devices.
  explicit Inventory(const std::string &file);

  /// By name; NULL when there is none.
  const InventoryEntry *find(const std::string &name) const;
  const InventoryEntry *find_by_key(const std::string &key) const;

  /// All, by name.
  std::vector<InventoryEntry> entries() const;

  /// Those that the names and patterns mean, by name and each once. One that means none is an
  /// error.
  std::vector<InventoryEntry> select(const std::vector<std::string> &patterns) const;

  /// A device that is there under this name gets the new way to it. Another device by this name, or
  /// this one by another name, is an error.
  void add(const InventoryEntry &entry);

  void remove(const std::string &name) { entries_.erase(name); }

  void save() const;

 private:
  std::string file_;
  std::map<std::string, InventoryEntry> entries_;
};

/// Changes the inventory in `file`, one process at a time; saves what `change` leaves.
void change_inventory(const std::string &file, const std::function<void(Inventory *)> &change);

}  // namespace tsm

#endif
