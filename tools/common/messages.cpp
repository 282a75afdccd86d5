// SPDX-License-Identifier: BSD-2-Clause
#include "common/messages.h"

#include <algorithm>

namespace tools {
namespace {

constexpr Message kMessages[] = {
    {MessageId::kGetDeviceState, "get-device-state", "GetDeviceStateRequest",
     "GetDeviceStateTBSRequest", "GetDeviceTEEStateResponse", ""},
    {MessageId::kInstallTa, "install-ta", "InstallTARequest", "InstallTATBSRequest",
     "InstallTAResponse", "InstallTATBSResponse"},
    {MessageId::kUpdateTa, "update-ta", "UpdateTARequest", "UpdateTATBSRequest", "UpdateTAResponse",
     "UpdateTATBSResponse"},
    {MessageId::kDeleteTa, "delete-ta", "DeleteTARequest", "DeleteTATBSRequest", "DeleteTAResponse",
     "DeleteTATBSResponse"},
    {MessageId::kCreateSd, "create-sd", "CreateSDRequest", "CreateSDTBSRequest", "CreateSDResponse",
     "CreateSDTBSResponse"},
    {MessageId::kUpdateSd, "update-sd", "UpdateSDRequest", "UpdateSDTBSRequest", "UpdateSDResponse",
     "UpdateSDTBSResponse"},
    {MessageId::kDeleteSd, "delete-sd", "DeleteSDRequest", "DeleteSDTBSRequest", "DeleteSDResponse",
     "DeleteSDTBSResponse"},
    {MessageId::kGetTaInfo, "get-ta-info", "GetTAInfoRequest", "", "GetTAInfoResponse",
     "TAInformationTBS"},
};

const Message *find(std::string_view Message::*name, std::string_view value) {
  const auto found = std::ranges::find(kMessages, value, name);
  return found == std::end(kMessages) ? nullptr : found;
}

}  // namespace

std::span<const Message> messages() {
  return kMessages;
}

std::string message_commands() {
  std::string names;
  for (const Message &message : kMessages) {
    names += (names.empty() ? "" : ", ") + std::string(message.command);
  }
  return names;
}

const Message &message_of(MessageId id) {
  return kMessages[static_cast<uint32_t>(id) - static_cast<uint32_t>(MessageId::kGetDeviceState)];
}

const Message *find_message_by_command(std::string_view command) {
  return find(&Message::command, command);
}

const Message *find_message_by_request(std::string_view request) {
  return find(&Message::request, request);
}

const Message *find_message_by_response(std::string_view response) {
  return find(&Message::response, response);
}

}  // namespace tools
