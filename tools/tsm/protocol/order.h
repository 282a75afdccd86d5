// SPDX-License-Identifier: BSD-2-Clause
#ifndef TSM_PROTOCOL_ORDER_H
#define TSM_PROTOCOL_ORDER_H

#include "tsm/protocol/messages.h"
#include "tsm/protocol/request.h"

namespace tsm {

/// A message that is to be sent, whatever the device.
struct Order {
  MessageId message;
  RequestOptions options;
};

}  // namespace tsm

#endif
