// SPDX-License-Identifier: BSD-2-Clause
// Which devices this process has, by name and by state directory.
#include <unistd.h>

#include "error.h"
#include "host_device.h"
#include "sqlite_storage.h"
#include "state_directory.h"

namespace tee {

namespace {

struct DirectoryEntry {
  std::weak_ptr<HostDevice> device;
  pid_t owner;
};

struct Registry {
  std::mutex lock;
  std::map<std::string, std::weak_ptr<HostDevice>> named;
  std::map<StateDirectory::Identity, DirectoryEntry> directories;
};

// Never destroyed: a context may be finalized by a static object's destructor.
Registry &registry() {
  static Registry *const instance = new Registry;
  return *instance;
}

}  // namespace

std::shared_ptr<HostDevice> open_device(const std::string &name) {
  Registry &known = registry();
  const std::lock_guard guard(known.lock);
  if (const auto named = known.named.find(name); named != known.named.end()) {
    if (auto device = named->second.lock()) return device;
  }

  DirectoryEntry &entry = known.directories[StateDirectory::make(name)];
  if (auto device = entry.device.lock()) {
    // A forked child inherits the entry, but not the right to use its parent's database.
    if (entry.owner == ::getpid()) return device;
    throw Error{TEE_ERROR_BUSY, "state directory " + name + " is in use by another process"};
  }
  auto device = std::make_shared<HostDevice>(std::make_unique<SqliteStorage>(StateDirectory(name)));
  entry = {device, ::getpid()};
  return device;
}

void release_device(std::shared_ptr<HostDevice> &device) {
  Registry &known = registry();
  const std::lock_guard guard(known.lock);
  device.reset();
  std::erase_if(known.named, [](const auto &entry) { return entry.second.expired(); });
  std::erase_if(known.directories, [](const auto &entry) { return entry.second.device.expired(); });
}

void name_device(const std::string &name, const std::shared_ptr<HostDevice> &device) {
  const std::lock_guard guard(registry().lock);
  registry().named[name] = device;
}

}  // namespace tee
