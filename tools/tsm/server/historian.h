// SPDX-License-Identifier: BSD-2-Clause
/// Keeps the fleet's history while it lives. Of several servers the one that comes first writes.
#ifndef TSM_SERVER_HISTORIAN_H
#define TSM_SERVER_HISTORIAN_H

#include <condition_variable>
#include <mutex>
#include <thread>

#include "tsm/store/store.h"

namespace tsm {

class Historian {
 public:
  /// The store must live longer.
  explicit Historian(Store *store);

 private:
  void write_until(const std::stop_token &stop);

  Store *store_;
  std::mutex lock_;
  std::condition_variable_any wake_;
  std::jthread thread_;  // the last: it uses all above
};

}  // namespace tsm

#endif
