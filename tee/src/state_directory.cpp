// SPDX-License-Identifier: BSD-2-Clause
#include "state_directory.h"

#include <sys/stat.h>

#include <cerrno>

#include "error.h"

namespace tee {

namespace fs = std::filesystem;

// A new directory survives a power cut only once its name is on disk.
static void sync_name(const fs::path &path) {
  const fs::path parent = path.parent_path();
  host::sync_directory(parent.empty() ? "." : parent.c_str());
}

static void make_directory(const fs::path &path) {
  if (::mkdir(path.c_str(), 0700) != 0) {
    if (errno == EEXIST) return;
    const fs::path parent = path.parent_path();
    if (errno != ENOENT || parent.empty() || parent == path) {
      throw system_error("cannot create directory " + path.string());
    }
    make_directory(parent);
    if (::mkdir(path.c_str(), 0700) != 0 && errno != EEXIST) {
      throw system_error("cannot create directory " + path.string());
    }
  }
  sync_name(path);
}

StateDirectory::Identity StateDirectory::make(const fs::path &path) {
  make_directory(path);
  struct stat status;
  if (::stat(path.c_str(), &status) != 0) throw system_error("cannot use " + path.string());
  if (!S_ISDIR(status.st_mode)) {
    throw Error{TEE_ERROR_BAD_PARAMETERS, path.string() + " is not a directory"};
  }
  return {status.st_dev, status.st_ino};
}

StateDirectory::StateDirectory(const fs::path &path) : path_(fs::canonical(path)) {
  const fs::path file = path_ / "lock";
  lock_ = host::open_or_create(file.c_str());
  if (!lock_.valid()) throw system_error("cannot open " + file.string());
  if (host::lock(lock_)) return;
  if (errno != EWOULDBLOCK) throw system_error("cannot lock " + file.string());
  throw Error{TEE_ERROR_BUSY,
              "state directory " + path_.string() + " is in use by another process"};
}

}  // namespace tee
