// SPDX-License-Identifier: BSD-2-Clause
#include "host_file.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/mman.h>
#include <sys/sendfile.h>
#include <unistd.h>

namespace host {

// Never as one of the standard streams: a program that was started without one would write its
// output into the file.
static File opened(int fd) {
  if (fd < 0 || fd > STDERR_FILENO) return File(fd);
  const File low(fd);
  return File(::fcntl(fd, F_DUPFD_CLOEXEC, STDERR_FILENO + 1));
}

File::~File() {
  if (valid()) ::close(fd_);
}

File open_for_reading(const char *path) {
  return opened(::open(path, O_RDONLY | O_CLOEXEC));
}

File open_or_create(const char *path) {
  return opened(::open(path, O_RDWR | O_CREAT | O_CLOEXEC, 0600));
}

File copy_in_memory(const char *name, const File &source) {
  constexpr size_t kChunkLen = 1 << 20;
  File copy = opened(::memfd_create(name, MFD_CLOEXEC));
  ssize_t sent;
  do {
    sent = copy.valid() ? ::sendfile(copy.get(), source.get(), nullptr, kChunkLen) : -1;
  } while (sent > 0);
  return sent == 0 ? std::move(copy) : File();
}

bool lock(const File &file) {
  return ::flock(file.get(), LOCK_EX | LOCK_NB) == 0;
}

void sync_directory(const char *path) {
  const File directory(::open(path, O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (directory.valid()) ::fsync(directory.get());
}

}  // namespace host
