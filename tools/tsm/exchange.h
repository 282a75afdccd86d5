// SPDX-License-Identifier: BSD-2-Clause
/// One message to one device, from the operator's words to the kept answer.
#ifndef TSM_EXCHANGE_H
#define TSM_EXCHANGE_H

#include <optional>
#include <string>

#include "tsm/channel.h"
#include "tsm/commands.h"
#include "tsm/home.h"
#include "tsm/response.h"
#include "tsm/waiting.h"

namespace tsm {

/// A verified response, and how it is known to answer what was asked.
struct Exchange {
  Response response;
  Tie tie;
  std::string failure = {};  // what the device failed with although it answered; or empty
};

/// A request whose answer `record` waits for from now on.
struct MadeRequest {
  std::string text;
  SentRequest sent;
};
MadeRequest make_kept_request(const Arguments &arguments, const Identity &tsm,
                              const std::optional<Json> &dsi, DeviceRecord *record);

/// The state that `message` is made from: the one in `dsi_file` or, when that is empty, the kept
/// one. Nothing for GetDeviceState, which asks for it.
std::optional<Json> state_for(MessageId message, const DeviceRecord &record,
                              const std::string &dsi_file);

/// Sends the message that `arguments` name. The response is kept, or printed where it cannot be.
/// Throws tools::UsageError, NotVerified or ChannelError.
Exchange exchange(const Arguments &arguments, const Identity &tsm, Channel *channel,
                  DeviceRecord *record);

/// Why a verified response is a refusal, with its code; empty when it is none.
std::string refusal_of(const Response &response);

}  // namespace tsm

#endif
