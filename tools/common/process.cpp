// SPDX-License-Identifier: BSD-2-Clause
#include "common/process.h"

#include <fcntl.h>
#include <sys/prctl.h>
#include <unistd.h>

namespace tools {
namespace {

constexpr int kExitNoStreams = 2;

/// Streams are looked at in order, so the lowest free number is the one that is wanted.
void fill_stream(int fd, int unusable_access) {
  const bool is_open = fcntl(fd, F_GETFD) != -1;
  if (!is_open && open("/dev/null", unusable_access) != fd) _exit(kExitNoStreams);
}

}  // namespace

void prepare_process() {
  fill_stream(STDIN_FILENO, O_WRONLY);
  fill_stream(STDOUT_FILENO, O_RDONLY);
  fill_stream(STDERR_FILENO, O_RDONLY);
  prctl(PR_SET_DUMPABLE, 0, 0, 0, 0);
}

}  // namespace tools
