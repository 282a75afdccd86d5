// SPDX-License-Identifier: BSD-2-Clause
#include "device/state_watch.h"

#include <sys/stat.h>

#include <filesystem>
#include <utility>

namespace device {

bool StateWatch::identify(const std::string &path, Identity &identity) {
  struct stat info;
  if (stat(path.c_str(), &info) != 0) return false;
  identity = {info.st_dev, info.st_ino};
  return true;
}

StateWatch::StateWatch(std::string directory)
    : directory_(std::move(directory)),
      is_watched_(std::filesystem::is_directory(directory_) && identify(directory_, identity_)) {}

bool StateWatch::is_there() const {
  Identity now{};
  if (!is_watched_) return true;
  if (!identify(directory_, now) || now != identity_) return false;
  const std::lock_guard guard(lock_);
  for (const auto &[path, identity] : databases_) {
    if (!identify(path, now) || now != identity) return false;
  }
  std::error_code failure;
  for (const auto &entry : std::filesystem::directory_iterator(directory_, failure)) {
    // What a database has beside it comes and goes.
    if (entry.path().extension() != ".db" || !identify(entry.path(), now)) continue;
    databases_.emplace(entry.path(), now);
  }
  return true;
}

}  // namespace device
