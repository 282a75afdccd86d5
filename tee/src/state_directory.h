// SPDX-License-Identifier: BSD-2-Clause
/// The directory that holds the state of a device, and the lock that makes this process its owner.
#ifndef TEE_STATE_DIRECTORY_H
#define TEE_STATE_DIRECTORY_H

#include <sys/types.h>

#include <filesystem>
#include <utility>

#include "host_file.h"

namespace tee {

class StateDirectory {
 public:
  /// Names a directory however it was reached.
  using Identity = std::pair<dev_t, ino_t>;

  /// Creates `path`, and what is missing above it, with mode 0700.
  static Identity make(const std::filesystem::path &path);

  /// Takes the lock; throws TEE_ERROR_BUSY while another process holds it.
  explicit StateDirectory(const std::filesystem::path &path);

  const std::filesystem::path &path() const { return path_; }

 private:
  std::filesystem::path path_;  // absolute
  host::File lock_;
};

}  // namespace tee

#endif
