// SPDX-License-Identifier: BSD-2-Clause
/// Whole files in and out. A path of "-" is standard input or standard output.
///
/// Failures throw UsageError with the path and the system's reason. Bytes travel in std::string.
#ifndef COMMON_FILES_H
#define COMMON_FILES_H

#include <functional>
#include <memory>
#include <string>
#include <string_view>

#include "common/error_line.h"

namespace tools {

enum class FileAccess { kShared, kOwnerOnly };  // as the umask says, or 0600

std::string read_file(const std::string &path);

/// A file that is opened, and so found writable, before what it is to hold is there.
///
/// The bytes go to a file beside it, which takes its place when they, and then the folder, are
/// safely on disk; until then, and after a failure, the file is as it was. What is not a regular
/// file (a pipe, a device) is written to directly.
class OutputFile {
 public:
  explicit OutputFile(const std::string &path, FileAccess access = FileAccess::kShared);
  OutputFile(OutputFile &&other) noexcept;
  OutputFile &operator=(OutputFile &&other) noexcept;
  ~OutputFile();

  void write(std::string_view bytes);  // at most once

 private:
  struct Target;
  std::unique_ptr<Target> target_;
};

/// Replaces the file as a whole or leaves it as it was.
void write_file(const std::string &path, std::string_view bytes,
                FileAccess access = FileAccess::kShared);

/// Calls `keep`, which keeps a response that cannot be had again. When that fails, the response
/// goes to standard output, or where that fails too to standard error; the failure is thrown and
/// says so.
void keep_or_print(std::string_view response, const std::function<void()> &keep);

/// Holds the lock file `path`, which is made, while the object lives; waits for who holds it.
class FileLock {
 public:
  explicit FileLock(const std::string &path);
  FileLock(const FileLock &) = delete;
  FileLock &operator=(const FileLock &) = delete;
  ~FileLock();

 private:
  int fd_;
};

/// Whether something is at `path`; what cannot be told, for want of permission, is a failure.
bool file_exists(const std::string &path);

}  // namespace tools

#endif
