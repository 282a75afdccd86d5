// SPDX-License-Identifier: BSD-2-Clause
/// The device that the targets attack, and the TSM that manages it, as fuzz/device.json keeps them.
///
/// The corpora hold signed and encrypted messages, which only this device understands: fuzz_seeds
/// makes the file and the corpora together. Its keys are of 512 bits, the least that carries the
/// protocol, so that the arithmetic leaves the time to the agent.
#ifndef FUZZ_STORED_DEVICE_H
#define FUZZ_STORED_DEVICE_H

#include <map>
#include <string>

#include "tsm/parties.h"

namespace fuzz {

using Objects = std::map<std::string, std::string>;  // ID to raw data stream

constexpr int kKeyBits = 512;

struct StoredDevice {
  tsm::Identity tsm;
  std::string dsi_text;  // the device's state document
  Objects agent;
  Objects key_service;

  tsm::Json dsi() const;
  std::string dsihash() const;
  std::string device_id() const;
  tsm::RsaKey tee_key() const;
};

/// The TEE key, with its private half, as the key service stores it.
tsm::RsaKey tee_key_of(const Objects &key_service);

/// The development CA.
const tsm::RsaKey &dev_ca();

/// The TSM `tsmid` with this key, admitted by the development CA.
tsm::Identity admitted(const std::string &tsmid, const tsm::RsaKey &key);

const StoredDevice &stored_device();

void write_stored_device(const StoredDevice &device, const std::string &path);

}  // namespace fuzz

#endif
