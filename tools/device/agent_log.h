// SPDX-License-Identifier: BSD-2-Clause
/// The lines that the agent logs. Most say what was not there before, which is nobody's failure:
/// they are worth reading when something failed, or when somebody wants to see all of them.
#ifndef DEVICE_AGENT_LOG_H
#define DEVICE_AGENT_LOG_H

#include <string>

namespace device {

/// Keeps what this thread's calls log until it ends. Where the TEE does not hand its trace over, it
/// goes where that sends it.
class AgentLog {
 public:
  /// Shows lines at once, or keeps them.
  explicit AgentLog(bool is_live);
  AgentLog(const AgentLog &) = delete;
  AgentLog &operator=(const AgentLog &) = delete;

  /// An exception that passes is a failure: what was kept is shown.
  ~AgentLog();

  /// Prints what was kept so far to standard error.
  void show();

  /// Gives what was kept so far away.
  std::string take();

 private:
  std::string lines_;
  bool is_live_;
  int num_exceptions_;
};

}  // namespace device

#endif
