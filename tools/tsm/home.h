// SPDX-License-Identifier: BSD-2-Clause
/// The TSM's home directory: its identity, and what it knows of each device.
///
///     tsm.json           tsmid and the key chain that admits this TSM's key
///     tsm-key.pem        its private key
///     ca-tsm.pem         the CA-TSM private key it was made with; needed only for TA images
///     devices/KEY/       one per device, named by its key's fingerprint:
///       device.json        the device file
///       dsi.json           the last verified state document, as the device made it
///
/// Functions throw tools::UsageError. Files with private keys are made 0600, directories 0700.
#ifndef TSM_HOME_H
#define TSM_HOME_H

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tsm/parties.h"

namespace tsm {

struct KnownDevice {
  DeviceInfo device;
  std::optional<std::string> dsi_text;
};

class Home {
 public:
  explicit Home(std::string directory) : directory_(std::move(directory)) {}

  /// Makes a new identity, admitted by the CA in `ca_pem`; never replaces one.
  Identity create(std::string_view tsmid, std::string_view ca_pem) const;

  Identity load_identity() const;

  /// Nothing when the device has not reported its state yet.
  std::optional<std::string> load_dsi(const DeviceInfo &device) const;
  void keep_dsi(const DeviceInfo &device, std::string_view dsi_text) const;

  std::vector<KnownDevice> known_devices() const;

 private:
  std::string path(std::string_view name) const { return directory_ + "/" + std::string(name); }
  std::string device_path(const DeviceInfo &device) const;

  std::string directory_;
};

}  // namespace tsm

#endif
