// SPDX-License-Identifier: BSD-2-Clause
/// A running trusted application: its program, and everything that it holds.
#ifndef TEE_TA_INSTANCE_H
#define TEE_TA_INSTANCE_H

#include <tee_inspect.h>
#include <tee_ta_image.h>

#include <memory>
#include <string>
#include <vector>

#include "heap.h"
#include "running.h"
#include "uuid.h"

namespace tee {
class HostDevice;
class LoadedImage;
}  // namespace tee

/// A session with a trusted application, of a client of either world.
struct __TEE_TASessionHandle {
  tee::Instance *instance;  // outlives the session
  TEE_Identity client;
  void *context;  // the trusted application's own
};

namespace tee {

using Session = __TEE_TASessionHandle;

/// What an instance runs, from an image or, in tests, from functions.
struct Program {
  TEE_UUID uuid;
  uint32_t data_size;
  std::string trace_prefix;
  uint32_t trace_level;
  tee_ta_entry_points entry_points;
  std::shared_ptr<LoadedImage> image;  // keeps the loaded code; NULL for functions
};

class Instance {
 public:
  Instance(HostDevice &on_device, Program runs);
  ~Instance();  // gives back what the trusted application left open
  Instance(const Instance &) = delete;
  Instance &operator=(const Instance &) = delete;

  /// True when sessions that it has open lead to `other`, directly or through their instances.
  bool reaches(const Instance &other) const;
  tee_heap_stats stats() const;

  HostDevice &device;
  Program program;
  const UuidBytes uuid;
  Heap heap;
  OpenHandles handles;
  std::vector<std::unique_ptr<Session>> sessions;
  uint32_t num_clients = 0;  // sessions that others have with it
  bool entered = false;      // an entry point of it is on some stack
};

/// Parameters on their way into a trusted application and back.
struct Message {
  uint32_t types = 0;
  TEE_Param params[4] = {};
  uint32_t origin = TEE_ORIGIN_TEE;  // where the result arose
};

/// Makes the calling thread, which holds the lock of the device, run as `instance` while it lives;
/// `client` is who called with what message, NULL where there is none.
class Running {
 public:
  explicit Running(Instance &instance, const TEE_Identity *client = nullptr,
                   const Message *message = nullptr);
  ~Running();
  Running(const Running &) = delete;
  Running &operator=(const Running &) = delete;

  /// The innermost one of this thread, or NULL.
  static const Running *now();

  Instance &instance() const { return instance_; }
  const TEE_Identity *client() const { return client_; }

  /// True when bytes of `data` are the caller's, who may change them at any time.
  bool shares(const void *data, size_t len) const;

 private:
  Instance &instance_;
  const TEE_Identity *client_;
  const Message *message_;
  const bool was_entered_;
  const Running *const outer_;
};

}  // namespace tee

#endif
