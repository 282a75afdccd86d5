// SPDX-License-Identifier: BSD-2-Clause
/// A wish to end, which any thread or a signal can utter, and any number of threads wait for.
#ifndef DEVICE_BROKER_STOP_H
#define DEVICE_BROKER_STOP_H

#include <chrono>

namespace broker {

class Stop {
 public:
  Stop();
  ~Stop();
  Stop(const Stop &) = delete;
  Stop &operator=(const Stop &) = delete;

  /// SIGTERM and SIGINT utter it; a second one of them ends the process. For one object, which must
  /// live as long as the process.
  void obey_signals();

  void request() noexcept;  // from a signal handler, too
  bool is_requested() const { return wait_for(std::chrono::milliseconds(0)); }

  /// Returns at once, and true, when there is or comes the wish; else false after `time`.
  bool wait_for(std::chrono::milliseconds time) const;

 private:
  int fd_;  // can be read from then on
};

}  // namespace broker

#endif
