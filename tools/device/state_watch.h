// SPDX-License-Identifier: BSD-2-Clause
/// Whether a state directory is still the one that was opened. What a device writes into files that
/// were removed is lost, and nobody would notice.
#ifndef DEVICE_STATE_WATCH_H
#define DEVICE_STATE_WATCH_H

#include <sys/types.h>

#include <map>
#include <mutex>
#include <string>

namespace device {

/// Any thread may ask. A name that is no directory, as that of a device which keeps its state
/// elsewhere, is never missed.
class StateWatch {
 public:
  explicit StateWatch(std::string directory);

  /// False once the directory, or a database that was seen in it, has gone or been replaced.
  bool is_there() const;

 private:
  struct Identity {
    dev_t device;
    ino_t inode;
    bool operator==(const Identity &) const = default;
  };

  static bool identify(const std::string &path, Identity &identity);

  std::string directory_;
  Identity identity_{};
  bool is_watched_;          // filled in with the one above
  mutable std::mutex lock_;  // of the next one
  mutable std::map<std::string, Identity> databases_;
};

}  // namespace device

#endif
