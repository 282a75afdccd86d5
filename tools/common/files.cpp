// SPDX-License-Identifier: BSD-2-Clause
#include "common/files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <cstdlib>
#include <cstring>

namespace tools {
namespace {

class Descriptor {
 public:
  explicit Descriptor(int fd) : fd_(fd) {}
  Descriptor(const Descriptor &) = delete;
  Descriptor &operator=(const Descriptor &) = delete;
  ~Descriptor() {
    if (fd_ > STDERR_FILENO) close(fd_);
  }
  int get() const { return fd_; }

 private:
  int fd_;
};

/// A file beside the target that disappears unless it is committed.
class TemporaryFile {
 public:
  explicit TemporaryFile(const std::string &target)
      : path_(target + ".XXXXXX"), fd_(mkostemp(path_.data(), O_CLOEXEC)) {}
  ~TemporaryFile() {
    if (fd_.get() >= 0 && !committed_) unlink(path_.c_str());
  }
  int fd() const { return fd_.get(); }
  bool commit(const std::string &target) {
    committed_ = fsync(fd()) == 0 && rename(path_.c_str(), target.c_str()) == 0;
    return committed_;
  }

 private:
  std::string path_;
  Descriptor fd_;
  bool committed_ = false;
};

[[noreturn]] void fail(const char *what, const std::string &path) {
  const int reason = errno;
  throw UsageError(std::string(what) + " " + (path == "-" ? "standard stream" : path) + ": " +
                   strerror(reason));
}

void write_all(int fd, std::string_view bytes, const std::string &path) {
  while (!bytes.empty()) {
    const ssize_t written = write(fd, bytes.data(), bytes.size());
    if (written < 0 && errno == EINTR) continue;
    if (written < 0) fail("cannot write", path);
    bytes.remove_prefix(static_cast<size_t>(written));
  }
}

mode_t mode_of(FileAccess access) {
  if (access == FileAccess::kOwnerOnly) return S_IRUSR | S_IWUSR;
  const mode_t mask = umask(0);
  umask(mask);
  return (S_IRUSR | S_IWUSR | S_IRGRP | S_IWGRP | S_IROTH | S_IWOTH) & ~mask;
}

/// The file behind a symbolic link, so that replacing it keeps the link.
std::string resolve(const std::string &path) {
  char resolved[PATH_MAX];
  return realpath(path.c_str(), resolved) ? resolved : path;
}

}  // namespace

std::string read_file(const std::string &path) {
  const Descriptor fd(path == "-" ? STDIN_FILENO : open(path.c_str(), O_RDONLY | O_CLOEXEC));
  if (fd.get() < 0) fail("cannot open", path);
  std::string bytes;
  char block[65536];
  for (;;) {
    const ssize_t got = read(fd.get(), block, sizeof(block));
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) fail("cannot read", path);
    if (got == 0) return bytes;
    bytes.append(block, static_cast<size_t>(got));
  }
}

void write_file(const std::string &path, std::string_view bytes, FileAccess access) {
  if (path == "-") return write_all(STDOUT_FILENO, bytes, path);

  const std::string target = resolve(path);
  struct stat info;
  if (stat(target.c_str(), &info) == 0 && !S_ISREG(info.st_mode)) {
    const Descriptor fd(open(target.c_str(), O_WRONLY | O_CLOEXEC));
    if (fd.get() < 0) fail("cannot write", path);
    return write_all(fd.get(), bytes, path);
  }

  TemporaryFile file(target);
  if (file.fd() < 0 || fchmod(file.fd(), mode_of(access)) != 0) fail("cannot write", path);
  write_all(file.fd(), bytes, path);
  if (!file.commit(target)) fail("cannot write", path);
}

}  // namespace tools
