// SPDX-License-Identifier: BSD-2-Clause
#include "fleet/child.h"

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <csignal>
#include <system_error>
#include <thread>

namespace fleet {

Child::Child(const std::vector<std::string> &words, Output output) {
  std::vector<char *> arguments;
  for (const std::string &word : words) arguments.push_back(const_cast<char *>(word.c_str()));
  arguments.push_back(nullptr);

  posix_spawn_file_actions_t files;
  posix_spawn_file_actions_init(&files);
  posix_spawn_file_actions_addopen(&files, STDOUT_FILENO, "/dev/null", O_WRONLY, 0);
  if (output == Output::kNone) {
    posix_spawn_file_actions_addopen(&files, STDERR_FILENO, "/dev/null", O_WRONLY, 0);
  }
  posix_spawnattr_t attributes;
  posix_spawnattr_init(&attributes);
  posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETPGROUP);
  const int failure =
      posix_spawn(&pid_, arguments[0], &files, &attributes, arguments.data(), environ);
  posix_spawnattr_destroy(&attributes);
  posix_spawn_file_actions_destroy(&files);
  if (failure != 0) {
    throw std::system_error(failure, std::generic_category(), "cannot run " + words[0]);
  }
}

std::optional<int> Child::exit_code() {
  return wait(WNOHANG);
}

void Child::end() {
  constexpr int kNumLooks = 100;
  constexpr std::chrono::milliseconds kLook(50);
  if (!wait(WNOHANG)) ::kill(-pid_, SIGTERM);
  for (int i = 0; i < kNumLooks && !wait(WNOHANG); ++i) std::this_thread::sleep_for(kLook);
  kill();
}

void Child::kill() {
  if (wait(WNOHANG)) return;
  ::kill(-pid_, SIGKILL);
  (void)wait(0);
}

std::optional<int> Child::wait(int options) {
  if (exit_code_) return exit_code_;
  int status = 0;
  pid_t ended;
  do {
    ended = waitpid(pid_, &status, options);
  } while (ended < 0 && errno == EINTR);
  if (ended == pid_) exit_code_ = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
  return exit_code_;
}

}  // namespace fleet
