// SPDX-License-Identifier: BSD-2-Clause
/// Programs that are run to be killed.
#ifndef FLEET_CHILD_H
#define FLEET_CHILD_H

#include <sys/types.h>

#include <optional>
#include <string>
#include <vector>

namespace fleet {

class Child {
 public:
  enum class Output { kNone, kShown };

  /// The first word is a program's path. Throws std::system_error.
  Child(const std::vector<std::string> &words, Output output);
  ~Child() { kill(); }  // unless it has ended
  Child(const Child &) = delete;
  Child &operator=(const Child &) = delete;

  /// What it exited with; nothing while it runs. 128 and more: a signal.
  std::optional<int> exit_code();

  /// Asks it to end, and kills it after a while.
  void end();

  /// At once, as a power cut does it. What it started itself goes, too.
  void kill();

 private:
  std::optional<int> wait(int options);

  pid_t pid_ = -1;
  std::optional<int> exit_code_;
};

}  // namespace fleet

#endif
