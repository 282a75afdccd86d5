// SPDX-License-Identifier: BSD-2-Clause
/// Files of the host. A namespace of its own, because <fcntl.h> declares a function tee(): its
/// source must not see the namespace of that name.
#ifndef TEE_HOST_FILE_H
#define TEE_HOST_FILE_H

#include <utility>

namespace host {

/// A file descriptor that is closed with its owner.
class File {
 public:
  explicit File(int fd = -1) : fd_(fd) {}
  File(File &&other) noexcept : fd_(std::exchange(other.fd_, -1)) {}
  File &operator=(File &&other) noexcept {
    std::swap(fd_, other.fd_);
    return *this;
  }
  ~File();

  int get() const { return fd_; }
  bool valid() const { return fd_ >= 0; }

 private:
  int fd_;
};

// What fails returns an invalid file, or false, and leaves the reason in errno.

File open_for_reading(const char *path);

/// For reading and writing; a new file is empty and its owner's alone (mode 0600).
File open_or_create(const char *path);

/// A file without a path, in memory, with what is in `source` from its position on.
File copy_in_memory(const char *name, const File &source);

/// Takes the lock that a file has for one process, without waiting; EWOULDBLOCK when it is taken.
bool lock(const File &file);

/// Makes the names in a directory durable.
void sync_directory(const char *path);

}  // namespace host

#endif
