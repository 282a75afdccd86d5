// SPDX-License-Identifier: BSD-2-Clause
#include "support/stored_device.h"

#include "common/files.h"
#include "tsm/dsi.h"
#include "tsm/trust.h"

namespace fuzz {
namespace {

using tsm::Json;

constexpr size_t kDeviceIdLen = 32;
const char kIdentityId[] = "IDENTITY";

Json json_of(const Objects &objects) {
  Json json = Json::object();
  for (const auto &[id, data] : objects) json[id] = tsm::base64url_encode(data);
  return json;
}

Objects objects_of(const Json &json) {
  Objects objects;
  for (const auto &[id, data] : json.items()) {
    objects[id] = tsm::base64url_decode(data.get<std::string>()).value();
  }
  return objects;
}

StoredDevice read_stored_device(const std::string &path) {
  const Json file = tsm::parse_json(tools::read_file(path)).value();
  const auto key = tsm::RsaKey::from_pem(file.at("tsm_key").get<std::string>()).value();
  return {admitted(file.at("tsmid").get<std::string>(), key), file.at("dsi").get<std::string>(),
          objects_of(file.at("agent")), objects_of(file.at("key_service"))};
}

}  // namespace

Json StoredDevice::dsi() const {
  return tsm::parse_json(dsi_text).value();
}

std::string StoredDevice::dsihash() const {
  return tsm::dsi_hash_of_text(dsi_text);
}

std::string StoredDevice::device_id() const {
  return key_service.at(kIdentityId).substr(0, kDeviceIdLen);
}

tsm::RsaKey StoredDevice::tee_key() const {
  return tee_key_of(key_service);
}

// Behind the device ID stand the modulus and the two exponents, each behind its type and length.
tsm::RsaKey tee_key_of(const Objects &key_service) {
  std::string_view left = std::string_view(key_service.at(kIdentityId)).substr(kDeviceIdLen);
  std::string_view numbers[3];
  for (std::string_view &number : numbers) {
    const size_t low = static_cast<uint8_t>(left.at(2));
    const size_t len = low | size_t{static_cast<uint8_t>(left.at(3))} << 8;
    number = left.substr(4, len);
    left.remove_prefix(4 + len);
  }
  return tsm::RsaKey::from_numbers(numbers[0], numbers[1], numbers[2]).value();
}

const tsm::RsaKey &dev_ca() {
  static const tsm::RsaKey key =
      tsm::RsaKey::from_pem(tools::read_file(OTRP_DEV_CA_TSM_KEY)).value();
  return key;
}

tsm::Identity admitted(const std::string &tsmid, const tsm::RsaKey &key) {
  return {
      tsmid, key,
      tsm::key_chain(tsm::ca_tsm_hash(dev_ca()), {tsm::tsm_entry(dev_ca(), tsmid, key.encoded())}),
      dev_ca()};
}

const StoredDevice &stored_device() {
  static const StoredDevice device = read_stored_device(OTRP_FUZZ_DEVICE);
  return device;
}

void write_stored_device(const StoredDevice &device, const std::string &path) {
  const Json file = {{"tsmid", device.tsm.tsmid},
                     {"tsm_key", device.tsm.key.private_pem()},
                     {"dsi", device.dsi_text},
                     {"agent", json_of(device.agent)},
                     {"key_service", json_of(device.key_service)}};
  tools::write_file(path, file.dump(1) + "\n");
}

}  // namespace fuzz
