// SPDX-License-Identifier: BSD-2-Clause
/// Devices that get a name in the inventory.
#ifndef TSM_CLI_ENROL_H
#define TSM_CLI_ENROL_H

#include <string>
#include <vector>

#include "tsm/cli/target.h"
#include "tsm/home/home.h"

namespace tsm {

/// Reads a list of devices: a line for each, "NAME --state DIR", "NAME --url URL [--device FILE]
/// [--ca-file PEM]" or "NAME --device FILE", or a device file that has a "name" and may have
/// "state", "url" and "ca_file" as well; empty lines and those that begin with # are passed over.
/// Throws tools::UsageError, which names `file` and the line.
std::vector<Target> parse_device_list(const std::string &text, const std::string &file);

struct Enrolled {
  InventoryEntry entry;
  DeviceInfo device;
};

/// Finds out who the device is, and changes nothing but a directory in which there is none yet.
/// Throws tools::UsageError or ChannelError.
Enrolled enrol(const Target &target, const Home &home);

}  // namespace tsm

#endif
