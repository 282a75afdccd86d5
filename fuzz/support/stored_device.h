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

#include "tsm/protocol/parties.h"

namespace fuzz {

using Objects = std::map<std::string, std::string>;  // ID to raw data stream

/// Objects as one input:
///
///     ID length (1) | ID | data length (2, little-endian) | data | more objects
///
/// Read up to the first one that is cut short.
Objects parse_objects(std::string_view bytes);
std::string serialize_objects(const Objects &objects);

constexpr int kKeyBits = 512;

/// The TEE key as the key service stores it: as a box of records, and with its private half.
std::string tee_key_box_of(const Objects &key_service);
tsm::RsaKey tee_key_of(const Objects &key_service);

struct StoredDevice {
  tsm::Identity tsm;
  std::string dsi_text;  // the device's state document
  Objects agent;
  Objects key_service;

  tsm::Json dsi() const { return tsm::parse_json(dsi_text).value(); }
  std::string device_id() const;
  tsm::RsaKey tee_key() const { return tee_key_of(key_service); }
};

/// The TSM "tsm1" with this key, admitted by the development CA.
tsm::Identity admitted(const tsm::RsaKey &key);

const StoredDevice &stored_device();

void write_stored_device(const StoredDevice &device, const std::string &path);

}  // namespace fuzz

#endif
