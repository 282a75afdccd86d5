// SPDX-License-Identifier: BSD-2-Clause
#include "uuid.h"

#include <algorithm>

namespace tee {

UuidBytes uuid_bytes(const TEE_UUID &uuid) {
  UuidBytes bytes;
  for (unsigned i = 0; i < 4; ++i) bytes[i] = static_cast<uint8_t>(uuid.timeLow >> (24 - 8 * i));
  bytes[4] = static_cast<uint8_t>(uuid.timeMid >> 8);
  bytes[5] = static_cast<uint8_t>(uuid.timeMid);
  bytes[6] = static_cast<uint8_t>(uuid.timeHiAndVersion >> 8);
  bytes[7] = static_cast<uint8_t>(uuid.timeHiAndVersion);
  std::copy_n(uuid.clockSeqAndNode, 8, bytes.begin() + 8);
  return bytes;
}

std::string uuid_text(const TEE_UUID &uuid) {
  static const char kDigits[] = "0123456789abcdef";
  const UuidBytes bytes = uuid_bytes(uuid);
  std::string text;
  text.reserve(36);
  for (size_t i = 0; i < bytes.size(); ++i) {
    if (i == 4 || i == 6 || i == 8 || i == 10) text += '-';
    text += kDigits[bytes[i] >> 4];
    text += kDigits[bytes[i] & 0xF];
  }
  return text;
}

TEE_UUID from_client(const TEEC_UUID &uuid) {
  TEE_UUID result = {uuid.timeLow, uuid.timeMid, uuid.timeHiAndVersion, {}};
  std::copy_n(uuid.clockSeqAndNode, 8, result.clockSeqAndNode);
  return result;
}

}  // namespace tee
