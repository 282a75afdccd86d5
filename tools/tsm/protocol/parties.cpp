// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/protocol/parties.h"

#include "common/error_line.h"
#include "tsm/protocol/trust.h"

namespace tsm {
namespace {

/// With another key, anyone could read what is encrypted for it, or sign with it.
bool is_device_key(const RsaKey &key) {
  constexpr size_t kMinModulusBits = 2048;
  constexpr size_t kMaxModulusBits = 4096;
  const size_t num_bits = key.modulus_bits();
  return num_bits >= kMinModulusBits && num_bits <= kMaxModulusBits && key.has_sound_exponent();
}

}  // namespace

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
  if (!is_device_key(*key)) {
    throw tools::UsageError(
        "bad \"tee_public_key\" in the device file: expected a modulus of 2048 to 4096 bits, and "
        "an odd exponent from 3 on");
  }
  return {*device_id, *key};
}

Json device_info_json(const DeviceInfo &device) {
  return {{"device_id", device.device_id},
          {"tee_public_key", base64url_encode(device.tee_key.encoded())}};
}

}  // namespace tsm
