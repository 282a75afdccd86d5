// SPDX-License-Identifier: BSD-2-Clause
/// Who takes part in an exchange: this TSM, and the device it talks to.
#ifndef TSM_PROTOCOL_PARTIES_H
#define TSM_PROTOCOL_PARTIES_H

#include <optional>
#include <string>
#include <string_view>

#include "tsm/protocol/crypto.h"
#include "tsm/protocol/json.h"

namespace tsm {

struct Identity {
  std::string tsmid;
  RsaKey key;
  Json key_chain;            // what admits `key` to devices
  std::optional<RsaKey> ca;  // with its private half, where this TSM may act for the CA
};

/// A new TSM key, admitted by `ca`, which must have its private half.
Identity make_identity(std::string_view tsmid, const RsaKey &ca);
/// The same of a key that there is.
Identity admit(std::string_view tsmid, const RsaKey &key, const RsaKey &ca);

struct DeviceInfo {
  std::string device_id;
  RsaKey tee_key;  // the public half
};

/// Reads {"device_id": text, "tee_public_key": base64url of the encoded key}; throws
/// tools::UsageError for anything else, and for a key that no device has.
DeviceInfo parse_device_info(std::string_view text);
Json device_info_json(const DeviceInfo &device);

}  // namespace tsm

#endif
