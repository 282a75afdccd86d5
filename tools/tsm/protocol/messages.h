// SPDX-License-Identifier: BSD-2-Clause
/// The eight messages and their names, as the TSM calls them.
#ifndef TSM_PROTOCOL_MESSAGES_H
#define TSM_PROTOCOL_MESSAGES_H

#include "common/messages.h"

namespace tsm {

using tools::find_message_by_command;
using tools::find_message_by_request;
using tools::find_message_by_response;
using tools::Message;
using tools::message_of;
using tools::MessageId;
using tools::messages;

}  // namespace tsm

#endif
