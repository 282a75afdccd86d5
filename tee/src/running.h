// SPDX-License-Identifier: BSD-2-Clause
/// What the rest of the host TEE knows of the trusted application that is running.
#ifndef TEE_RUNNING_H
#define TEE_RUNNING_H

#include <tee_internal_api.h>

#include <algorithm>
#include <string_view>
#include <vector>

#include "tee_test.h"

namespace tee {

using test::Fault;

/// Handles of one kind. They are few, and the one that is looked for is mostly the newest.
template <class Handle>
class HandleSet {
 public:
  void insert(Handle handle) { handles_.push_back(handle); }
  bool contains(Handle handle) const {
    return std::find(handles_.rbegin(), handles_.rend(), handle) != handles_.rend();
  }
  bool erase(Handle handle) { return std::erase(handles_, handle) != 0; }
  bool empty() const { return handles_.empty(); }
  size_t size() const { return handles_.size(); }
  Handle newest() const { return handles_.back(); }

 private:
  std::vector<Handle> handles_;
};

/// Handles that an instance has open. A handle that is not in its set was never given out, or was
/// given back: using it is a programmer error.
struct OpenHandles {
  HandleSet<TEE_ObjectHandle> objects;
  HandleSet<TEE_OperationHandle> operations;
};

class Instance;

/// The instance as which the calling thread runs. Aborts with a message when it runs as none.
Instance &current_instance();

OpenHandles &open_handles(Instance &instance);

/// Ends the process with a clear message: the running trusted application broke the rules of
/// `call` in the way that `why` says. The standard calls it a panic.
[[noreturn]] void panic(const char *call, const char *why);

/// True when a test asked that this call, one of kind `fault`, fail; `*code` is then the result
/// to return. `natural` is the result when the test named none.
bool fault_due(Fault fault, const char *call, TEE_Result natural, TEE_Result *code);

/// Shows a block of heap that is given back to the test that watches, if one does.
void show_freed(std::string_view bytes);

/// True when a test asked that this instance never have so many bytes of its heap in use.
bool heap_limit_reached(uint64_t in_use);

}  // namespace tee

#endif
