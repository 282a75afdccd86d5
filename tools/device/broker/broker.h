// SPDX-License-Identifier: BSD-2-Clause
/// Sessions until one of them gets through: a call of a device at its TSM.
#ifndef DEVICE_BROKER_BROKER_H
#define DEVICE_BROKER_BROKER_H

#include <chrono>
#include <functional>

#include "device/broker/session.h"

namespace broker {

struct Policy {
  size_t max_messages = 64;  // of a session
  unsigned max_retries = 4;
  /// Before the first retry; each further one waits twice as long, up to the longest. Of each pause
  /// the last half is left to chance, so that devices that failed together do not return together.
  std::chrono::milliseconds first_pause{1'000};
  std::chrono::milliseconds max_pause{60'000};
};

/// Before retry number `retry`, from 0; `chance` is from 0 to 1. The server's `wish` is granted, up
/// to the longest pause, and the pause added.
std::chrono::milliseconds pause_before(unsigned retry, double chance, std::chrono::seconds wish,
                                       const Policy &policy);

/// A session that does not reach the TSM is begun anew, from the empty POST, as the policy allows.
/// The outcome is that of the last session, with the messages of all. `on_retry`, where given, gets
/// the outcome of each that is tried again, and the pause that is made.
Outcome call(const Ends &ends, const Policy &policy, const Stop &stop,
             const std::function<void(const Outcome &, std::chrono::milliseconds)> &on_retry = {});

}  // namespace broker

#endif
