// SPDX-License-Identifier: BSD-2-Clause
#include "device/agent_log.h"

#include <cstdio>
#include <exception>
#include <utility>

#include "device/inspect.h"

namespace device {

AgentLog::AgentLog(bool is_live)
    : is_live_(is_live || inspection() == nullptr), num_exceptions_(std::uncaught_exceptions()) {
  if (!is_live_) inspection()->collect_trace(&lines_);
}

AgentLog::~AgentLog() {
  if (!is_live_) inspection()->collect_trace(nullptr);
  if (std::uncaught_exceptions() > num_exceptions_) show();
}

void AgentLog::show() {
  fwrite(lines_.data(), 1, lines_.size(), stderr);
  lines_.clear();
}

std::string AgentLog::take() {
  return std::exchange(lines_, {});
}

}  // namespace device
