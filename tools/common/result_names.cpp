// SPDX-License-Identifier: BSD-2-Clause
#include "common/result_names.h"

#include <algorithm>
#include <cctype>
#include <charconv>
#include <cstdio>
#include <optional>

#include "common/agent_codes.h"

namespace tools {
namespace {

#define NAMED(code) code, #code

constexpr ResultName kResults[] = {
    {NAMED(OTRP_DSI_MISMATCH),
     "\"dsihash\" is not the hash of the device's present state, or another TSM manages this "
     "security domain",
     "send GetDeviceState and try again with the state that it brings"},
    {NAMED(OTRP_SD_EXISTS), "the device has a security domain of this name already",
     "choose another name, or go on with that one"},
    {NAMED(OTRP_SD_MISMATCH),
     "the security domain of an UpdateSD belongs to another service provider or TSM",
     "compare \"spid\" and \"tsmid\" with those that it was created with"},
    {NAMED(OTRP_BAD_REQUEST),
     "the device could not read or verify the request, or could not decrypt its content",
     "check that it goes under its own message's name, that its members are there and are strings, "
     "that the TSM's key signed it, and that the content is for this device's TEE key"},
    {NAMED(OTRP_TA_DECRYPT_FAILED), "the TA image does not decrypt with the service provider's AIK",
     "send GetDeviceState and encrypt the image for the AIK that the state lists"},
    {NAMED(OTRP_TA_EXISTS), "the TA is in the security domain already, or its image is registered",
     "send UpdateTA, or DeleteTA first; send GetDeviceState, since the state may have changed"},
    {NAMED(OTRP_NOT_FOUND),
     "the device has no such security domain or TA, or no registered image of the TA",
     "compare with the device state; a TA without a registered image is gone after a DeleteTA"},
    {NAMED(OTRP_DSI_HASH_FAILED), "the device could not compute the hash of its state",
     "send the request again, and restart the device when that does not help"},
    {NAMED(OTRP_RESPONSE_FAILED),
     "a DeleteSD names no security domain of the device, or the answer could not be made, or a "
     "record is damaged",
     "send GetDeviceState: the request may have been carried out"},
    {NAMED(OTRP_CA_CHECK_FAILED),
     "the CA-TSM key in the device does not vouch for this: \"ca_tsm_hash\" differs, or an entry "
     "of "
     "the key chain or \"signature2\" does not verify",
     "check what was hashed and signed, byte for byte, and whether the device was built for this "
     "CA-TSM key"},
    {NAMED(OTRP_TA_INFO_INCOMPLETE), "the device's record of the TA is damaged",
     "delete the TA and install it again"},
    {NAMED(OTRP_NO_MEMORY),
     "the device ran out of memory, or a value is missing or cannot be decoded, parsed or stored; "
     "as the status beside a response: the TA image did not fit the output buffer",
     "check base64url texts and control characters, and whether the request is too large"},
    {NAMED(OTRP_SD_LIST_BROKEN), "the device's list of security domains is damaged",
     "no request mends it: restore the device's storage"},
    {NAMED(OTRP_MISSING),
     "a value is missing or not acceptable (a registered TA ID has 32 characters, an image a TA "
     "image header)",
     "add or mend it; after an InstallTA send GetDeviceState: the TA may be listed although its "
     "image is not registered, and DeleteTA takes it out"},
    {NAMED(OTRP_SP_NOT_FOUND), "the device has no record of this service provider",
     "create a security domain for it"},
    {NAMED(OTRP_VALUE_MISSING),
     "a text that is to be recorded is missing or no string: \"tsmid\", or \"spcert\" of a new "
     "service provider",
     "add it; send GetDeviceState, since the state may have changed"},
    {0xF0100001, "TEE_ERROR_CORRUPT_OBJECT", "the device's storage is damaged",
     "restore the device's storage"},
    {kStorageNotAvailable, "TEE_ERROR_STORAGE_NOT_AVAILABLE",
     "the device's storage cannot be reached", "try again later"},
    {0xFFFF0000, "TEE_ERROR_GENERIC", "the TEE failed, or the agent has no such command", ""},
    {0xFFFF0001, "TEE_ERROR_ACCESS_DENIED", "the TEE refuses this to the caller", ""},
    {0xFFFF0002, "TEE_ERROR_CANCEL", "the command was cancelled", "send it again"},
    {0xFFFF0003, "TEE_ERROR_ACCESS_CONFLICT", "a stored object is in use", "send it again"},
    {0xFFFF0004, "TEE_ERROR_EXCESS_DATA", "there is more data than the operation takes", ""},
    {0xFFFF0005, "TEE_ERROR_BAD_FORMAT", "a stored object is damaged, or an answer malformed", ""},
    {0xFFFF0006, "TEE_ERROR_BAD_PARAMETERS",
     "the frame or the parameters of a command are malformed, or a name is too long",
     "names have at most 56 bytes, a TSM's ID 55"},
    {0xFFFF0007, "TEE_ERROR_BAD_STATE", "the agent could not start on what the device has stored",
     "see its trace"},
    {0xFFFF0008, "TEE_ERROR_ITEM_NOT_FOUND", "the device does not know this TSM, or this TA",
     "a TSM that it does not know sends GetDeviceState first"},
    {0xFFFF0009, "TEE_ERROR_NOT_IMPLEMENTED", "the TEE does not have the operation", ""},
    {0xFFFF000A, "TEE_ERROR_NOT_SUPPORTED", "the TEE does not offer the algorithm or size", ""},
    {0xFFFF000B, "TEE_ERROR_NO_DATA", "a CreateSD names no service provider", "add \"spid\""},
    {0xFFFF000C, "TEE_ERROR_OUT_OF_MEMORY", "the TEE ran out of memory, or a query is no JSON",
     "send less, or try again later"},
    {0xFFFF000D, "TEE_ERROR_BUSY", "another process has the device open", "try again later"},
    {0xFFFF000E, "TEE_ERROR_COMMUNICATION", "the TEE cannot be reached", "try again later"},
    {0xFFFF000F, "TEE_ERROR_SECURITY", "the TEE refuses this for its security", ""},
    {0xFFFF0010, "TEE_ERROR_SHORT_BUFFER", "the answer does not fit the output buffer",
     "give it a larger one"},
    {0xFFFF3024, "TEE_ERROR_TARGET_DEAD", "the agent panicked",
     "see its trace; a new session starts it again"},
    {kStorageNoSpace, "TEE_ERROR_STORAGE_NO_SPACE", "the device's storage is full",
     "delete what is no longer needed"},
    {kMacInvalid, "TEE_ERROR_MAC_INVALID", "a MAC or tag does not verify", ""},
    {kSignatureInvalid, "TEE_ERROR_SIGNATURE_INVALID", "a signature does not verify", ""},
};

#undef NAMED

constexpr std::string_view kPrefixes[] = {"", "OTRP_", "TEE_ERROR_", "TEEC_ERROR_", "TEE_"};

std::string upper(std::string_view text) {
  std::string result(text);
  std::ranges::transform(result, result.begin(),
                         [](unsigned char c) { return static_cast<char>(std::toupper(c)); });
  return result;
}

std::optional<uint32_t> parse_number(std::string_view text, int base) {
  uint32_t value = 0;
  const auto [end, failure] = std::from_chars(text.data(), text.data() + text.size(), value, base);
  if (text.empty() || failure != std::errc() || end != text.data() + text.size()) {
    return std::nullopt;
  }
  return value;
}

/// Eight digits with a letter among them can only be hexadecimal.
std::optional<uint32_t> parse_code(std::string_view text) {
  if (text.starts_with("0X")) return parse_number(text.substr(2), 16);
  if (const std::optional<uint32_t> decimal = parse_number(text, 10)) return decimal;
  return text.size() == 8 ? parse_number(text, 16) : std::nullopt;
}

}  // namespace

std::span<const ResultName> result_names() {
  return kResults;
}

const ResultName *find_result(uint32_t code) {
  const auto found = std::ranges::find(kResults, code, &ResultName::code);
  return found == std::end(kResults) ? nullptr : found;
}

const ResultName *find_result_by_text(std::string_view text) {
  const std::string wanted = upper(text);
  if (const std::optional<uint32_t> code = parse_code(wanted)) return find_result(*code);
  for (const std::string_view prefix : kPrefixes) {
    const auto found = std::ranges::find(kResults, std::string(prefix) + wanted,
                                         [](const ResultName &result) { return result.name; });
    if (found != std::end(kResults)) return found;
  }
  return nullptr;
}

std::string code_text(uint32_t code) {
  char text[sizeof("0x00000000")];
  snprintf(text, sizeof(text), "0x%08x", code);
  return text;
}

std::string code_name(uint32_t code) {
  const ResultName *result = find_result(code);
  return result == nullptr ? code_text(code) : result->name;
}

std::string advice(const ResultName &result) {
  return result.meaning + std::string(*result.hint == '\0' ? "" : "; ") + result.hint;
}

std::string describe_result(uint32_t code) {
  const ResultName *result = find_result(code);
  if (result == nullptr) return code_text(code);
  return code_text(code) + " (" + result->name + "): " + advice(*result);
}

}  // namespace tools
