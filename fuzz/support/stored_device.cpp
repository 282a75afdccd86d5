// SPDX-License-Identifier: BSD-2-Clause
#include "support/stored_device.h"

#include "common/files.h"
#include "support/manager.h"

namespace fuzz {

using tsm::Json;

// The key service's one object: the device ID, and a box with the TEE key.
const char kIdentityId[] = "IDENTITY";
constexpr size_t kDeviceIdLen = 32;

static size_t little_endian_at(std::string_view bytes, size_t at) {
  return static_cast<uint8_t>(bytes.at(at)) | size_t{static_cast<uint8_t>(bytes.at(at + 1))} << 8;
}

Objects parse_objects(std::string_view bytes) {
  Objects objects;
  for (;;) {
    const size_t id_len = bytes.empty() ? 0 : static_cast<uint8_t>(bytes[0]);
    const size_t data_at = 1 + id_len + 2;
    if (bytes.size() < data_at) return objects;
    const size_t data_len = little_endian_at(bytes, 1 + id_len);
    if (bytes.size() < data_at + data_len) return objects;
    objects[std::string(bytes.substr(1, id_len))] = bytes.substr(data_at, data_len);
    bytes.remove_prefix(data_at + data_len);
  }
}

std::string serialize_objects(const Objects &objects) {
  std::string bytes;
  for (const auto &[id, data] : objects) {
    bytes += tsm::little_endian(id.size(), 1) + id + tsm::little_endian(data.size(), 2) + data;
  }
  return bytes;
}

std::string StoredDevice::device_id() const {
  return key_service.at(kIdentityId).substr(0, kDeviceIdLen);
}

std::string tee_key_box_of(const Objects &key_service) {
  return key_service.at(kIdentityId).substr(kDeviceIdLen);
}

// Modulus and the two exponents, each behind its type and length.
tsm::RsaKey tee_key_of(const Objects &key_service) {
  const std::string box = tee_key_box_of(key_service);
  std::string numbers[3];
  size_t at = 0;
  for (std::string &number : numbers) {
    number = box.substr(at + 4, little_endian_at(box, at + 2));
    at += 4 + number.size();
  }
  return tsm::RsaKey::from_numbers(numbers[0], numbers[1], numbers[2]).value();
}

tsm::Identity admitted(const tsm::RsaKey &key) {
  return tsm::admit("tsm1", key, otrp_test::dev_ca());
}

static StoredDevice read_stored_device(const std::string &path) {
  const Json file = tsm::parse_json(tools::read_file(path)).value();
  const auto text = [&file](const char *name) { return file.at(name).get<std::string>(); };
  const auto objects = [&text](const char *name) {
    return parse_objects(tsm::base64_decode(text(name)).value());
  };
  return {admitted(tsm::RsaKey::from_pem(text("tsm_key")).value()), text("dsi"), objects("agent"),
          objects("key_service")};
}

const StoredDevice &stored_device() {
  static const StoredDevice device = read_stored_device(OTRP_FUZZ_DEVICE);
  return device;
}

void write_stored_device(const StoredDevice &device, const std::string &path) {
  const Json file = {{"tsm_key", device.tsm.key.private_pem()},
                     {"dsi", device.dsi_text},
                     {"agent", tsm::base64_encode(serialize_objects(device.agent))},
                     {"key_service", tsm::base64_encode(serialize_objects(device.key_service))}};
  tools::write_file(path, file.dump(1) + "\n");
}

}  // namespace fuzz
