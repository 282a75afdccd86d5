// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/server/historian.h"

#include "tsm/server/door.h"

namespace tsm {

Historian::Historian(Store *store)
    : store_(store), thread_([this](const std::stop_token &stop) { write_until(stop); }) {}

void Historian::write_until(const std::stop_token &stop) {
  while (!stop.stop_requested()) {
    try {
      store_->keep_history(seconds_now());
    } catch (const StoreError &) {
      // Devices notice, too, and are counted; here is only a gap.
    }
    const std::chrono::seconds rest{kHistoryStep - seconds_now() % kHistoryStep};
    std::unique_lock guard(lock_);
    wake_.wait_for(guard, stop, rest, [] { return false; });
  }
}

}  // namespace tsm
