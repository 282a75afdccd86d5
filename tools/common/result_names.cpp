// SPDX-License-Identifier: BSD-2-Clause
#include "common/result_names.h"

#include <cstdio>

namespace tools {
namespace {

constexpr ResultName kResults[] = {
    {0xDEAD0001, "OTRP_DSI_MISMATCH",
     "the request quotes an old device state, or another TSM manages this security domain; run "
     "get-device-state and try again"},
    {0xDEAD0002, "OTRP_SD_EXISTS", "the device has a security domain of this name already"},
    {0xDEAD0004, "OTRP_SD_MISMATCH",
     "the security domain belongs to another service provider or TSM; compare with `show`"},
    {0xDEAD0006, "OTRP_BAD_REQUEST",
     "the device could not read or verify the request; was it made for this device, by a TSM that "
     "has sent get-device-state, and left unchanged?"},
    {0xDEAD0007, "OTRP_TA_DECRYPT_FAILED",
     "the image was not encrypted for the service provider's present AIK; run get-device-state "
     "and make the request anew"},
    {0xDEAD0008, "OTRP_TA_EXISTS", "the TA is installed already; use update-ta"},
    {0xDEAD000A, "OTRP_NOT_FOUND", "the device has no such security domain or TA"},
    {0xDEAD000C, "OTRP_DSI_HASH_FAILED", "the device could not compute its own state; restart it"},
    {0xDEAD000E, "OTRP_RESPONSE_FAILED",
     "the device has no such security domain, or could not make its response"},
    {0xDEAD0010, "OTRP_CA_CHECK_FAILED",
     "the device trusts another CA-TSM key than the one behind this request"},
    {0xDEAD1001, "OTRP_TA_INFO_INCOMPLETE", "the device's record of the TA is damaged"},
    {0xDEAD1002, "OTRP_NO_MEMORY",
     "the device ran out of memory, or a value of the request cannot be decoded or is missing"},
    {0xDEAD1003, "OTRP_SD_LIST_BROKEN", "the device's list of security domains is damaged"},
    {0xDEAD1004, "OTRP_MISSING",
     "a value of the request is missing or not acceptable (a TA ID has 32 characters, an image a "
     "TA image header)"},
    {0xDEAD1005, "OTRP_SP_NOT_FOUND", "the device has no record of this service provider"},
    {0xFFFF0000, "TEE_ERROR_GENERIC", ""},
    {0xFFFF0001, "TEE_ERROR_ACCESS_DENIED", ""},
    {0xFFFF0002, "TEE_ERROR_CANCEL", ""},
    {0xFFFF0003, "TEE_ERROR_ACCESS_CONFLICT", ""},
    {0xFFFF0004, "TEE_ERROR_EXCESS_DATA", ""},
    {0xFFFF0005, "TEE_ERROR_BAD_FORMAT", ""},
    {0xFFFF0006, "TEE_ERROR_BAD_PARAMETERS", ""},
    {0xFFFF0007, "TEE_ERROR_BAD_STATE", "the trusted application could not start on its state"},
    {0xFFFF0008, "TEE_ERROR_ITEM_NOT_FOUND",
     "the device has no such record; a TSM that it does not know sends get-device-state first"},
    {0xFFFF0009, "TEE_ERROR_NOT_IMPLEMENTED", ""},
    {0xFFFF000A, "TEE_ERROR_NOT_SUPPORTED", ""},
    {0xFFFF000B, "TEE_ERROR_NO_DATA", ""},
    {0xFFFF000C, "TEE_ERROR_OUT_OF_MEMORY", ""},
    {0xFFFF000D, "TEE_ERROR_BUSY", "another process has the device open"},
    {0xFFFF000E, "TEE_ERROR_COMMUNICATION", ""},
    {0xFFFF000F, "TEE_ERROR_SECURITY", ""},
    {0xFFFF0010, "TEE_ERROR_SHORT_BUFFER", "give the answer a larger buffer"},
    {0xFFFF3024, "TEE_ERROR_TARGET_DEAD", "the trusted application panicked; see its trace"},
    {0xFFFF3071, "TEE_ERROR_MAC_INVALID", ""},
    {0xFFFF3072, "TEE_ERROR_SIGNATURE_INVALID", ""},
    {0xF0100001, "TEE_ERROR_CORRUPT_OBJECT", "the device's storage is damaged"},
    {0xF0100003, "TEE_ERROR_STORAGE_NOT_AVAILABLE", ""},
    {0xFFFF3041, "TEE_ERROR_STORAGE_NO_SPACE", "the device's storage is full"},
};

}  // namespace

const ResultName *find_result(uint32_t code) {
  for (const ResultName &result : kResults) {
    if (result.code == code) return &result;
  }
  return nullptr;
}

std::string describe_result(uint32_t code) {
  char number[sizeof("0x00000000")];
  snprintf(number, sizeof(number), "0x%08x", code);
  const ResultName *result = find_result(code);
  if (result == nullptr) return number;
  std::string text = std::string(number) + " (" + result->name + ")";
  if (*result->hint != '\0') text += ": " + std::string(result->hint);
  return text;
}

}  // namespace tools
