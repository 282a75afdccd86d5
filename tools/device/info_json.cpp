// SPDX-License-Identifier: BSD-2-Clause
#include "device/info_json.h"

#include <nlohmann/json.hpp>

#include "common/encoding.h"

namespace device {

std::string info_json(const Info &info) {
  const nlohmann::ordered_json document = {
      {"device_id", info.device_id},
      {"tee_public_key", tools::base64url_encode(info.tee_public_key)}};
  return document.dump() + "\n";
}

}  // namespace device
