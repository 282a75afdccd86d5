// SPDX-License-Identifier: BSD-2-Clause
#include "ta_instance.h"

#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <functional>
#include <iterator>

#include "host_device.h"
#include "object.h"

namespace tee {

static thread_local const Running *t_running = nullptr;

Instance::Instance(HostDevice &on_device, Program runs)
    : device(on_device),
      program(std::move(runs)),
      uuid(uuid_bytes(program.uuid)),
      heap(program.data_size) {}

Instance::~Instance() {
  const Running running(*this);
  for (std::unique_ptr<Session> &session : sessions) device.close_session(std::move(session));
  while (!handles.operations.empty()) TEE_FreeOperation(handles.operations.newest());
  while (!handles.objects.empty()) close_handle(handles.objects.newest());
}

// Ends, for no session is opened that would close a cycle.
bool Instance::reaches(const Instance &other) const {
  return std::ranges::any_of(sessions, [&](const auto &session) {
    const Instance &next = *session->instance;
    return &next == &other || next.reaches(other);
  });
}

tee_heap_stats Instance::stats() const {
  return {
      .size = heap.size(),
      .in_use = heap.in_use(),
      .peak = heap.peak(),
      .live_blocks = heap.live_blocks(),
      .peak_blocks = heap.peak_blocks(),
      .open_objects = static_cast<uint32_t>(handles.objects.size()),
      .open_operations = static_cast<uint32_t>(handles.operations.size()),
      .open_sessions = static_cast<uint32_t>(sessions.size()),
  };
}

Running::Running(Instance &instance, const TEE_Identity *client, const Message *message)
    : instance_(instance),
      client_(client),
      message_(message),
      was_entered_(std::exchange(instance.entered, true)),
      outer_(std::exchange(t_running, this)) {}

Running::~Running() {
  t_running = outer_;
  instance_.entered = was_entered_;
}

// What the trusted application may have changed in the parameters does not matter: a buffer that
// it put there is its own, and the call that it makes with it no fault of the caller's.
bool Running::shares(const void *data, size_t len) const {
  if (message_ == nullptr) return false;
  const auto *bytes = static_cast<const uint8_t *>(data);
  for (unsigned i = 0; i < std::size(message_->params); ++i) {
    if (TEE_PARAM_TYPE_GET(message_->types, i) < TEE_PARAM_TYPE_MEMREF_INPUT) continue;
    const auto &memref = message_->params[i].memref;
    const auto *shared = static_cast<const uint8_t *>(memref.buffer);
    if (std::less()(bytes, shared + memref.size) && std::less()(shared, bytes + len)) return true;
  }
  return false;
}

const Running *Running::now() {
  return t_running;
}

// ---- What the rest of the host TEE asks

Instance &current_instance() {
  if (t_running == nullptr) panic("Internal Core API", "called outside a trusted application");
  return t_running->instance();
}

OpenHandles &open_handles(Instance &instance) {
  return instance.handles;
}

// Without allocation: the reason may be a lack of memory.
void panic(const char *call, const char *why) {
  char line[512];
  const std::string ta =
      t_running != nullptr ? uuid_text(t_running->instance().program.uuid) : "none";
  const int len =
      std::snprintf(line, sizeof(line), "TEE panic: TA %s: %s: %s\n", ta.c_str(), call, why);
  if (len > 0) {
    const size_t shown = std::min(static_cast<size_t>(len), sizeof(line) - 1);
    [[maybe_unused]] const ssize_t written = ::write(STDERR_FILENO, line, shown);
  }
  std::abort();
}

bool fault_due(Fault fault, const char *call, TEE_Result natural, TEE_Result *code) {
  const Instance &instance = current_instance();
  return instance.device.faults.due(instance.uuid, fault, call, natural, code);
}

void show_freed(std::string_view bytes) {
  const HostDevice &device = current_instance().device;
  if (device.watch_freed) device.watch_freed(bytes);
}

bool heap_limit_reached(uint64_t in_use) {
  const Instance &instance = current_instance();
  return instance.device.faults.forbids(instance.uuid, in_use);
}

}  // namespace tee

using namespace tee;

void TEE_Panic(TEE_Result panicCode) {
  char why[32];
  std::snprintf(why, sizeof(why), "code 0x%08x", panicCode);
  panic(__func__, why);
}

TEE_Result TEE_GetPropertyAsIdentity(TEE_PropSetHandle propsetOrEnumerator, const char *name,
                                     TEE_Identity *value) {
  current_instance();
  const TEE_Identity *client = Running::now()->client();
  if (propsetOrEnumerator != TEE_PROPSET_CURRENT_CLIENT || client == nullptr ||
      std::string_view(name) != "gpd.client.identity") {
    return TEE_ERROR_ITEM_NOT_FOUND;
  }
  *value = *client;
  return TEE_SUCCESS;
}
