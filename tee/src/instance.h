// SPDX-License-Identifier: BSD-2-Clause
/// What the rest of the host TEE knows of the trusted application that is running.
#ifndef TEE_INSTANCE_H
#define TEE_INSTANCE_H

#include <tee_internal_api.h>

#include <unordered_set>

#include "tee_test.h"

struct __TEE_ObjectHandle;
struct __TEE_OperationHandle;

namespace tee {

using test::Fault;

/// Handles that an instance has open. A handle that is not in its set was never given out, or was
/// given back: using it is a programmer error.
struct OpenHandles {
  std::unordered_set<__TEE_ObjectHandle *> objects;
  std::unordered_set<__TEE_OperationHandle *> operations;
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

}  // namespace tee

#endif
