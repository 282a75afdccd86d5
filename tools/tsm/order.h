// SPDX-License-Identifier: BSD-2-Clause
#ifndef TSM_ORDER_H
#define TSM_ORDER_H

#include "tsm/messages.h"
#include "tsm/request.h"

namespace tsm {

/// A message that is to be sent, whatever the device.
struct Order {
  MessageId message;
  RequestOptions options;
};

}  // namespace tsm

#endif
