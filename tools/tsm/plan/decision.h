// SPDX-License-Identifier: BSD-2-Clause
/// Which message brings a device nearer to its plan.
///
/// In this order: the device's state; whose the domains are that are there; what is not planned
/// goes; domains are created, and lost AIKs renewed; TAs are installed, and updated where they have
/// another version or are in doubt; and the state again, as the proof. What no message can do is
/// said before any is sent that changes something.
#ifndef TSM_PLAN_DECISION_H
#define TSM_PLAN_DECISION_H

#include <optional>
#include <string>
#include <vector>

#include "tsm/plan/plan.h"
#include "tsm/plan/progress.h"
#include "tsm/protocol/order.h"

namespace tsm {

/// An order and its reason; or else what is in the way; with neither the device is as planned.
struct Decision {
  std::optional<Order> order = {};
  std::string reason = {};                  // such as `"wallet" is missing`
  std::vector<std::string> obstacles = {};  // each a line
};

Decision decide(const Plan &plan, const Progress &progress);

/// An order as an operator reads it: `install-ta 71cc... in wallet`.
std::string order_text(const Order &order);

}  // namespace tsm

#endif
