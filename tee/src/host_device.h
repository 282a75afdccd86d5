// SPDX-License-Identifier: BSD-2-Clause
/// A device: its storage, the instances that run on it, and the way into them.
///
/// The secure world here has one core: a lock per device lets one thread at a time enter, whatever
/// the instance. Calls between trusted applications stay on that thread, so they cannot deadlock;
/// one that would enter an instance a second time gets TEE_ERROR_BUSY.
#ifndef TEE_HOST_DEVICE_H
#define TEE_HOST_DEVICE_H

#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "faults.h"
#include "persistent.h"
#include "storage.h"
#include "ta_instance.h"

namespace tee {

class HostDevice {
 public:
  explicit HostDevice(std::unique_ptr<Storage> medium) : storage(std::move(medium)) {}
  HostDevice(const HostDevice &) = delete;
  HostDevice &operator=(const HostDevice &) = delete;

  /// Runs `program` for its UUID in place of an image.
  void register_program(Program program);

  /// Opens a session with `ta` for `client`, which creates the instance when there is none.
  TEE_Result open_session(const TEE_UUID &ta, const TEE_Identity &client, Message &message,
                          std::unique_ptr<Session> &session);

  TEE_Result invoke(Session &session, uint32_t command, Message &message);

  /// The instance ends with its last session.
  void close_session(std::unique_ptr<Session> session);

  /// The live instance of `ta`, or NULL.
  Instance *find_instance(const UuidBytes &ta);

  std::recursive_mutex lock;  // guards everything but `faults`, which locks itself
  FaultPlans faults;
  std::unique_ptr<Storage> storage;
  std::vector<OpenData *> open_data;                  // of all instances
  std::function<void(std::string_view)> watch_freed;  // for tests; empty: nobody does
  bool creates_at_once = false;  // a creation without data is stored like one with data

 private:
  Program program_of(const TEE_UUID &ta);
  TEE_Result find_or_create(const TEE_UUID &ta, Instance **instance);
  void drop_client(Instance &instance);
  void rest(Program program) noexcept;

  std::map<UuidBytes, Program> registered_;
  std::map<UuidBytes, Program> resting_;  // of images that no instance runs
  std::map<UuidBytes, std::unique_ptr<Instance>> instances_;
};

/// The device of a context name: a state directory, or a name given out by name_device(). All
/// contexts of one process share it.
std::shared_ptr<HostDevice> open_device(const std::string &name);

/// Lets go of a device, which is closed with its last owner. A plain reset would let another
/// thread find the state directory still locked, but without an owner.
void release_device(std::shared_ptr<HostDevice> &device);

void name_device(const std::string &name, const std::shared_ptr<HostDevice> &device);

}  // namespace tee

#endif
