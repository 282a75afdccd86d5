// SPDX-License-Identifier: BSD-2-Clause
/// What a device's row says of its way to the plan, as texts, so that any server can go on with a
/// session where another one left it.
#ifndef TSM_SERVER_STORED_PROGRESS_H
#define TSM_SERVER_STORED_PROGRESS_H

#include <string>

#include "tsm/plan/progress.h"
#include "tsm/protocol/order.h"
#include "tsm/protocol/waiting.h"
#include "tsm/store/store.h"

namespace tsm {

/// All but the state, which few exchanges need. A row whose progress cannot be read is one without:
/// the device is asked anew.
Progress stored_progress(const StoredDevice &row);
std::string progress_text(const Progress &progress);

/// A message that waits: what was ordered, and what ties its answer. The image is not kept.
struct OpenRequest {
  Order order;
  SentRequest sent;
};
std::string open_request_text(const Order &order, const SentRequest &sent);
OpenRequest parse_open_request(const std::string &text);  // throws std::runtime_error

}  // namespace tsm

#endif
