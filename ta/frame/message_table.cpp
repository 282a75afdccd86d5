// SPDX-License-Identifier: BSD-2-Clause
#include "frame/message_table.h"

#include "operations/operations.h"
#include "security/jws.h"

namespace {

#define SIGNED_REQUEST(name) \
  "{\"" name                 \
  "\":{\"payload\":\"\",\"protect\":\"\",\"header\":{\"tsmid\":\"\"},\"signature\":\"\"}}"

#define SIGNED_TWICE_REQUEST(name)                                                        \
  "{\"" name                                                                              \
  "\":{\"payload\":\"\",\"protect\":\"\",\"header\":{\"tsmid\":\"\"},\"signature\":\"\"," \
  "\"signature2\":\"\"}}"

// The encode function of a message whose response the TEE key signs.
template <const char *kResponseName>
TEE_Result encode_as(const char *response, uint8_t *destination, uint32_t *len) {
  return sign_encode_by_name_with_key(response, kResponseName, destination, len, TEE_HANDLE_NULL);
}

constexpr char kGetDeviceStateResponse[] = "GetDeviceTEEStateResponse";  // "TEE": not as requested
constexpr char kInstallTaResponse[] = "InstallTAResponse";
constexpr char kUpdateTaResponse[] = "UpdateTAResponse";
constexpr char kDeleteTaResponse[] = "DeleteTAResponse";
constexpr char kCreateSdResponse[] = "CreateSDResponse";
constexpr char kUpdateSdResponse[] = "UpdateSDResponse";
constexpr char kDeleteSdResponse[] = "DeleteSDResponse";

const message_entry kMessages[] = {
    {1, SIGNED_REQUEST("GetDeviceStateRequest"), "GetDeviceStateRequest", verify_decode_by_name,
     getdevstat_process, encode_as<kGetDeviceStateResponse>},
    {2, SIGNED_TWICE_REQUEST("InstallTARequest"), "InstallTARequest", verify_decode_by_name,
     installta_process, encode_as<kInstallTaResponse>},
    {3, SIGNED_TWICE_REQUEST("UpdateTARequest"), "UpdateTARequest", verify_decode_by_name,
     updateta_process, encode_as<kUpdateTaResponse>},
    {4, SIGNED_REQUEST("DeleteTARequest"), "DeleteTARequest", verify_decode_by_name,
     deleteta_process, encode_as<kDeleteTaResponse>},
    {5, SIGNED_REQUEST("CreateSDRequest"), "CreateSDRequest", verify_decode_by_name,
     createsd_process, encode_as<kCreateSdResponse>},
    {6, SIGNED_REQUEST("UpdateSDRequest"), "UpdateSDRequest", verify_decode_by_name,
     updatesd_process, encode_as<kUpdateSdResponse>},
    {7, SIGNED_REQUEST("DeleteSDRequest"), "DeleteSDRequest", verify_decode_by_name,
     deletesd_process, encode_as<kDeleteSdResponse>},
    {8, "{\"GetTAInfoRequest\":{\"spid\":\"\",\"taid\":\"\"}}", "GetTAInfoRequest",
     verify_decode_by_name, gettainfo_process, gettainfo_sign_encode},
};

}  // namespace

const message_entry *find_message(uint32_t id) {
  for (const message_entry &entry : kMessages) {
    if (entry.id == id) return &entry;
  }
  return nullptr;
}
