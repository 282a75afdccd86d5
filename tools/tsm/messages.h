// SPDX-License-Identifier: BSD-2-Clause
/// The eight messages and their names, in one place.
#ifndef TSM_MESSAGES_H
#define TSM_MESSAGES_H

#include <cstdint>
#include <span>
#include <string_view>

namespace tsm {

enum class MessageId : uint32_t {
  kGetDeviceState = 1,
  kInstallTa = 2,
  kUpdateTa = 3,
  kDeleteTa = 4,
  kCreateSd = 5,
  kUpdateSd = 6,
  kDeleteSd = 7,
  kGetTaInfo = 8,
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
const Message &message_of(MessageId id);

/// NULL for an unknown name.
const Message *find_message_by_command(std::string_view command);
const Message *find_message_by_response(std::string_view response);

}  // namespace tsm

#endif
