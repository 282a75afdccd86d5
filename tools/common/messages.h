// SPDX-License-Identifier: BSD-2-Clause
/// The eight messages and their names, in one place.
#ifndef COMMON_MESSAGES_H
#define COMMON_MESSAGES_H

#include <otrp.h>

#include <cstdint>
#include <span>
#include <string>
#include <string_view>

namespace tools {

enum class MessageId : uint32_t {
  kGetDeviceState = OTRP_GET_DEVICE_STATE,
  kInstallTa = OTRP_INSTALL_TA,
  kUpdateTa = OTRP_UPDATE_TA,
  kDeleteTa = OTRP_DELETE_TA,
  kCreateSd = OTRP_CREATE_SD,
  kUpdateSd = OTRP_UPDATE_SD,
  kDeleteSd = OTRP_DELETE_SD,
  kGetTaInfo = OTRP_GET_TA_INFO,
};

struct Message {
  MessageId id;
  std::string_view command;       // on the command lines
  std::string_view request;       // outer key of the request
  std::string_view tbs_request;   // outer key of its payload; empty where there is no envelope
  std::string_view response;      // outer key of the response
  std::string_view tbs_response;  // outer key of its payload; empty where the payload has none
};

std::span<const Message> messages();
std::string message_commands();  // "get-device-state, install-ta, ..."
const Message &message_of(MessageId id);

/// NULL for an unknown name.
const Message *find_message_by_command(std::string_view command);
const Message *find_message_by_request(std::string_view request);
const Message *find_message_by_response(std::string_view response);

}  // namespace tools

#endif
