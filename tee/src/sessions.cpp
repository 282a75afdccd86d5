// SPDX-License-Identifier: BSD-2-Clause
// TA-to-TA sessions (section 4.9).
#include <algorithm>

#include "error.h"
#include "host_device.h"

namespace tee {

namespace {

bool comes_back(uint32_t type, bool memref) {
  return memref ? type == TEE_PARAM_TYPE_MEMREF_OUTPUT || type == TEE_PARAM_TYPE_MEMREF_INOUT
                : type == TEE_PARAM_TYPE_VALUE_OUTPUT || type == TEE_PARAM_TYPE_VALUE_INOUT;
}

// The callee works on a copy; what is no parameter, or only an output, it sees as zeros.
Message message_of(uint32_t types, const TEE_Param *params, const char *call) {
  Message message{.types = types};
  for (unsigned i = 0; i < 4; ++i) {
    switch (TEE_PARAM_TYPE_GET(types, i)) {
      case TEE_PARAM_TYPE_VALUE_INPUT:
      case TEE_PARAM_TYPE_VALUE_INOUT:
      case TEE_PARAM_TYPE_MEMREF_INPUT:
      case TEE_PARAM_TYPE_MEMREF_OUTPUT:
      case TEE_PARAM_TYPE_MEMREF_INOUT:
        if (params == nullptr) panic(call, "params is NULL");
        message.params[i] = params[i];
    }
  }
  return message;
}

void give_back(const Message &message, TEE_Param *params) {
  for (unsigned i = 0; i < 4 && params != nullptr; ++i) {
    const uint32_t type = TEE_PARAM_TYPE_GET(message.types, i);
    if (comes_back(type, false)) params[i].value = message.params[i].value;
    if (comes_back(type, true)) params[i].memref.size = message.params[i].memref.size;
  }
}

// Waiting for an instance that waits for us would never end.
bool closes_cycle(HostDevice &device, const TEE_UUID &destination, const Instance &caller) {
  const Instance *target = device.find_instance(uuid_bytes(destination));
  return target != nullptr && (target == &caller || target->reaches(caller));
}

TEE_Result open_ta_session(Instance &caller, const TEE_UUID &destination, Message &message,
                           TEE_TASessionHandle *handle) {
  if (closes_cycle(caller.device, destination, caller)) return TEE_ERROR_BUSY;
  caller.sessions.reserve(caller.sessions.size() + 1);
  const TEE_Identity identity = {TEE_LOGIN_TRUSTED_APP, caller.program.uuid};
  std::unique_ptr<Session> session;
  const TEE_Result result = caller.device.open_session(destination, identity, message, session);
  if (result != TEE_SUCCESS) return result;
  *handle = session.get();
  caller.sessions.push_back(std::move(session));
  return TEE_SUCCESS;
}

std::unique_ptr<Session> &checked_session(TEE_TASessionHandle handle, const char *call) {
  auto &sessions = current_instance().sessions;
  const auto session = std::ranges::find(sessions, handle, &std::unique_ptr<Session>::get);
  if (session == sessions.end()) panic(call, "not a session that this instance has open");
  return *session;
}

void tell(uint32_t *where, uint32_t origin) {
  if (where != nullptr) *where = origin;
}

}  // namespace

}  // namespace tee

using namespace tee;

TEE_Result TEE_OpenTASession(const TEE_UUID *destination, uint32_t, uint32_t paramTypes,
                             TEE_Param params[4], TEE_TASessionHandle *session,
                             uint32_t *returnOrigin) {
  *session = TEE_HANDLE_NULL;
  if (TEE_Result code; fault_due(Fault::kTaCall, __func__, TEE_ERROR_COMMUNICATION, &code)) {
    tell(returnOrigin, TEE_ORIGIN_COMMS);
    return code;
  }
  Message message = message_of(paramTypes, params, __func__);
  const TEE_Result result = result_of(
      [&] { return open_ta_session(current_instance(), *destination, message, session); });
  give_back(message, params);
  tell(returnOrigin, message.origin);
  return result;
}

TEE_Result TEE_InvokeTACommand(TEE_TASessionHandle session, uint32_t, uint32_t commandID,
                               uint32_t paramTypes, TEE_Param params[4], uint32_t *returnOrigin) {
  Session &known = *checked_session(session, __func__);
  if (TEE_Result code; fault_due(Fault::kTaCall, __func__, TEE_ERROR_COMMUNICATION, &code)) {
    tell(returnOrigin, TEE_ORIGIN_COMMS);
    return code;
  }
  Message message = message_of(paramTypes, params, __func__);
  const TEE_Result result =
      result_of([&] { return current_instance().device.invoke(known, commandID, message); });
  give_back(message, params);
  tell(returnOrigin, message.origin);
  return result;
}

void TEE_CloseTASession(TEE_TASessionHandle session) {
  if (session == TEE_HANDLE_NULL) return;
  std::unique_ptr<Session> closing = std::move(checked_session(session, __func__));
  Instance &caller = current_instance();
  std::erase(caller.sessions, nullptr);
  caller.device.close_session(std::move(closing));
}
