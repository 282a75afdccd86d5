// SPDX-License-Identifier: BSD-2-Clause
/// One message to one device, from the order to the kept answer.
#ifndef TSM_CLI_EXCHANGE_H
#define TSM_CLI_EXCHANGE_H

#include <optional>
#include <string>

#include "tsm/cli/channel.h"
#include "tsm/home/device_record.h"
#include "tsm/protocol/order.h"
#include "tsm/protocol/response.h"
#include "tsm/protocol/waiting.h"

namespace tsm {

/// A verified response, and how it is known to answer what was asked.
struct Exchange {
  Response response;
  Tie tie;
  std::string failure = {};         // what the device failed with although it answered; or empty
  std::optional<Bytes> image = {};  // that the device handed back, where that was wanted
};

/// A request whose answer `record` waits for from now on. `dsi` is the last known state of the
/// device, without which tools::UsageError is thrown where the message cannot do without.
struct MadeRequest {
  std::string text;
  SentRequest sent;
};
MadeRequest make_kept_request(const Order &order, const Identity &tsm,
                              const std::optional<Json> &dsi, DeviceRecord *record);

/// The state that `message` is made from: the one in `dsi_file` or, when that is empty, the kept
/// one. Nothing for GetDeviceState, which asks for it.
std::optional<Json> state_for(MessageId message, const DeviceRecord &record,
                              const std::string &dsi_file);

/// Files for what an answer brings; not written where they are empty.
struct OutputNames {
  std::string dsi = {};
  std::string image = {};
};

/// Sends a message. The response is kept, or printed where it cannot be. The image that the device
/// hands back must be the one that it was sent.
///
/// Throws tools::UsageError, NotVerified or ChannelError.
Exchange exchange(const Order &order, const Identity &tsm, Channel *channel, DeviceRecord *record,
                  const OutputNames &outputs = {});

}  // namespace tsm

#endif
