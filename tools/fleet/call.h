// SPDX-License-Identifier: BSD-2-Clause
/// One device calls its TSM.
#ifndef FLEET_CALL_H
#define FLEET_CALL_H

#include <functional>
#include <string>
#include <vector>

#include "device/broker/broker.h"
#include "fleet/faults.h"
#include "fleet/figures.h"
#include "fleet/fleet.h"

namespace fleet {

struct CallOptions {
  std::vector<std::string> tsms;  // URLs, which the device's ID is added to; asked in turn
  std::string ca_file;
  broker::Policy policy;
  Faults faults;
};

/// What happened is added to `figures`. Each call has connections of its own. TA images are
/// dropped. `on_message`, where given, is called when the device has carried out a message, before
/// the TSM hears of it.
broker::Outcome call_tsm(const Member &member, const CallOptions &options, const broker::Stop &stop,
                         Random &random, Figures &figures,
                         const std::function<void()> &on_message = {});

}  // namespace fleet

#endif
