// SPDX-License-Identifier: BSD-2-Clause
#include "common/files.h"

#include <fcntl.h>
#include <sys/file.h>
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

[[noreturn]] void fail(const char *what, const std::string &path) {
  throw UsageError(std::string(what) + " " + path + ": " + strerror(errno));
}

const std::string kStandardInput = "standard input";
const std::string kStandardOutput = "standard output";

bool try_write_all(int fd, std::string_view bytes) {
  while (!bytes.empty()) {
    const ssize_t written = write(fd, bytes.data(), bytes.size());
    if (written < 0 && errno == EINTR) continue;
    if (written < 0) return false;
    bytes.remove_prefix(static_cast<size_t>(written));
  }
  return true;
}

mode_t mode_of(FileAccess access) {
  if (access == FileAccess::kOwnerOnly) return S_IRUSR | S_IWUSR;
  // To read the mask is to change it, which other threads must not see.
  static const mode_t mask = [] {
    const mode_t old = umask(0);
    umask(old);
    return old;
  }();
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
  const std::string &name = path == "-" ? kStandardInput : path;
  if (fd.get() < 0) fail("cannot open", name);
  std::string bytes;
  char block[65536];
  for (;;) {
    const ssize_t got = read(fd.get(), block, sizeof(block));
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) fail("cannot read", name);
    if (got == 0) return bytes;
    bytes.append(block, static_cast<size_t>(got));
  }
}

/// Either the file that is written to, or one beside it that disappears unless it takes its place.
struct OutputFile::Target {
  Target(const std::string &path, FileAccess access);
  ~Target() {
    if (!temporary.empty() && !committed) unlink(temporary.c_str());
  }
  int open_it(FileAccess access);
  void commit();

  std::string path;  // as it was named
  std::string file;  // behind links
  std::string temporary;
  Descriptor fd;
  bool committed = false;
};

OutputFile::Target::Target(const std::string &named, FileAccess access)
    : path(named == "-" ? kStandardOutput : named),
      file(named == "-" ? named : resolve(named)),
      fd(open_it(access)) {
  if (fd.get() < 0) fail("cannot write", path);
}

int OutputFile::Target::open_it(FileAccess access) {
  if (file == "-") {
    const bool is_open = (fcntl(STDOUT_FILENO, F_GETFL) & O_ACCMODE) != O_RDONLY;
    if (!is_open) errno = EBADF;
    return is_open ? STDOUT_FILENO : -1;
  }
  struct stat info;
  if (stat(file.c_str(), &info) == 0 && !S_ISREG(info.st_mode)) {
    return open(file.c_str(), O_WRONLY | O_CLOEXEC);
  }
  std::string name = file + ".XXXXXX";
  const int made = mkostemp(name.data(), O_CLOEXEC);
  if (made >= 0) temporary = name;
  if (made >= 0 && fchmod(made, mode_of(access)) != 0) fail("cannot write", path);
  return made;
}

void OutputFile::Target::commit() {
  if (temporary.empty()) return;
  const size_t slash = file.rfind('/');
  const std::string folder = slash == std::string::npos ? "." : file.substr(0, slash + 1);
  committed = fsync(fd.get()) == 0 && rename(temporary.c_str(), file.c_str()) == 0;
  if (!committed) fail("cannot write", path);
  const Descriptor opened(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (opened.get() >= 0 && fsync(opened.get()) != 0) fail("cannot write", path);
}

OutputFile::OutputFile(const std::string &path, FileAccess access)
    : target_(std::make_unique<Target>(path, access)) {}
OutputFile::OutputFile(OutputFile &&other) noexcept = default;
OutputFile &OutputFile::operator=(OutputFile &&other) noexcept = default;
OutputFile::~OutputFile() = default;

void OutputFile::write(std::string_view bytes) {
  if (!try_write_all(target_->fd.get(), bytes)) fail("cannot write", target_->path);
  target_->commit();
}

void write_file(const std::string &path, std::string_view bytes, FileAccess access) {
  OutputFile(path, access).write(bytes);
}

void keep_or_print(std::string_view response, const std::function<void()> &keep) {
  try {
    keep();
  } catch (const UsageError &failure) {
    const bool printed = try_write_all(STDOUT_FILENO, response);
    if (!printed) try_write_all(STDERR_FILENO, response);
    throw UsageError(std::string(failure.what()) + "; the response went to standard " +
                     (printed ? "output" : "error"));
  }
}

FileLock::FileLock(const std::string &path)
    : fd_(open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, S_IRUSR | S_IWUSR)) {
  if (fd_ < 0) fail("cannot open", path);
  while (flock(fd_, LOCK_EX) != 0) {
    if (errno == EINTR) continue;
    close(fd_);
    fail("cannot lock", path);
  }
}

FileLock::~FileLock() {
  close(fd_);
}

bool file_exists(const std::string &path) {
  struct stat info;
  if (stat(path.c_str(), &info) == 0) return true;
  if (errno != ENOENT && errno != ENOTDIR) fail("cannot open", path);
  return false;
}

}  // namespace tools
