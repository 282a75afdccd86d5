// SPDX-License-Identifier: BSD-2-Clause
#include "device/broker/stop.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <limits>
#include <system_error>

namespace broker {
namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

Stop *obedient = nullptr;

void on_signal(int) {
  const int saved = errno;
  obedient->request();
  errno = saved;
}

}  // namespace

Stop::Stop() : fd_(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
  if (fd_ < 0) throw std::system_error(errno, std::generic_category(), "no file to wait on");
}

Stop::~Stop() {
  close(fd_);
}

void Stop::obey_signals() {
  obedient = this;
  struct sigaction action {};
  action.sa_handler = on_signal;
  action.sa_flags = SA_RESTART | static_cast<int>(SA_RESETHAND);
  sigaction(SIGTERM, &action, nullptr);
  sigaction(SIGINT, &action, nullptr);
}

void Stop::request() noexcept {
  (void)eventfd_write(fd_, 1);
}

bool Stop::wait_for(milliseconds time) const {
  constexpr milliseconds kMax(std::numeric_limits<int>::max());
  const Clock::time_point end = Clock::now() + time;
  for (;;) {
    const auto left = std::chrono::ceil<milliseconds>(end - Clock::now());
    pollfd wish = {fd_, POLLIN, 0};
    if (poll(&wish, 1, static_cast<int>(std::clamp(left, milliseconds(0), kMax).count())) > 0) {
      return true;
    }
    if (Clock::now() >= end) return false;
  }
}

}  // namespace broker
