// SPDX-License-Identifier: BSD-2-Clause
/// The TSM's home directory: its identity, and what it knows of each device.
///
///     tsm.json           tsmid and the key chain that admits this TSM's key
///     tsm-key.pem        its private key
///     ca-tsm.pem         the CA-TSM private key it was made with; needed only for TA images
///     inventory.json     the names of devices: see inventory.h
///     devices/KEY/       one per device, named by its key's fingerprint: see device_record.h
///     admin-token        what changes on the page of `serve` are allowed by
///     lock               held while an identity, or the token, is made
///
/// Functions throw tools::UsageError. Files with private keys are made 0600, directories 0700.
/// What cannot be read is an error, never taken for absent.
#ifndef TSM_HOME_HOME_H
#define TSM_HOME_HOME_H

#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tsm/home/device_record.h"
#include "tsm/home/inventory.h"
#include "tsm/protocol/parties.h"

namespace tsm {

struct KnownDevice {
  DeviceInfo device;
  std::string folder;
};

class Home {
 public:
  explicit Home(std::string directory) : directory_(std::move(directory)) {}

  /// Makes a new identity, admitted by the CA in `ca_pem`; never replaces one. Of several at once
  /// one succeeds. A key that was left by one which did not come to its end is taken over.
  Identity create(std::string_view tsmid, std::string_view ca_pem) const;

  Identity load_identity() const;

  /// Made when it is first asked for.
  std::string admin_token() const;

  DeviceRecord open_record(const DeviceInfo &device) const {
    return DeviceRecord(folder_of(device), device);
  }
  std::string folder_of(const DeviceInfo &device) const;

  Inventory inventory() const;
  void change_inventory(const std::function<void(Inventory *)> &change) const;

  /// Removes all that is kept of a device.
  void forget(const DeviceInfo &device) const;

  /// The device whose key has this fingerprint, if it has a record.
  std::optional<DeviceInfo> find_device(const std::string &fingerprint) const;

  /// Those with a record, by their IDs.
  std::vector<KnownDevice> known_devices() const;

 private:
  std::string path(std::string_view name) const { return directory_ + "/" + std::string(name); }
  void require_identity() const;

  std::string directory_;
};

}  // namespace tsm

#endif
