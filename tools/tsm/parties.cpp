// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/parties.h"

#include "common/error_line.h"
#include "tsm/trust.h"

namespace tsm {

Identity make_identity(std::string_view tsmid, const RsaKey &ca) {
  return admit(tsmid, RsaKey::generate(), ca);
}

Identity admit(std::string_view tsmid, const RsaKey &key, const RsaKey &ca) {
  Json chain = key_chain(ca_tsm_hash(ca), {tsm_entry(ca, tsmid, key.encoded())});
  return {std::string(tsmid), key, std::move(chain), ca};
}

DeviceInfo parse_device_info(std::string_view text) {
  const std::optional<Json> info = parse_json(text);
  const std::string *device_id = info ? find_string(*info, "device_id") : nullptr;
  const std::string *key_text = info ? find_string(*info, "tee_public_key") : nullptr;
  const std::optional<Bytes> encoded = key_text ? base64url_decode(*key_text) : std::nullopt;
  const std::optional<RsaKey> key = encoded ? RsaKey::from_encoded(*encoded) : std::nullopt;
  if (device_id == nullptr || device_id->empty() || !key) {
    throw tools::UsageError(
        "not a device file: expected what `otrp-device info` prints, "
        "{\"device_id\": \"...\", \"tee_public_key\": \"...\"}");
  }
  return {*device_id, *key};
}

Json device_info_json(const DeviceInfo &device) {
  return {{"device_id", device.device_id},
          {"tee_public_key", base64url_encode(device.tee_key.encoded())}};
}

}  // namespace tsm
