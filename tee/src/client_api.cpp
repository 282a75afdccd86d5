// SPDX-License-Identifier: BSD-2-Clause
#include <tee_client_api.h>

#include <cstdlib>

#include "client_context.h"
#include "client_params.h"

namespace tee {

namespace {

struct ClientSession {
  DeviceShare device;
  std::unique_ptr<Session> session;
};

constexpr TEE_Identity kNormalWorld = {TEE_LOGIN_PUBLIC, {}};

TEE_Result initialize(const char *name, TEEC_Context &context) {
  if (name == nullptr || *name == '\0') {
    throw Error{TEE_ERROR_BAD_PARAMETERS, "the context name, a state directory, is missing"};
  }
  context.imp = new ClientContext{DeviceShare(open_device(name))};
  return TEE_SUCCESS;
}

TEE_Result open_session(const TEEC_Context &context, const TEEC_UUID &destination, Message &message,
                        TEEC_Session &session) {
  auto fresh = std::make_unique<ClientSession>(ClientSession{device_of(&context), nullptr});
  const TEE_Result result =
      fresh->device->open_session(from_client(destination), kNormalWorld, message, fresh->session);
  if (result == TEE_SUCCESS) session.imp = fresh.release();
  return result;
}

// Takes the parameters in, runs `call`, and hands them out whatever its result. A parameter that
// cannot be taken in is the API's finding; whatever follows tells its own origin.
template <class Call>
TEE_Result exchange(TEEC_Operation *operation, uint32_t *origin, Call &&call) {
  Message message;
  message.origin = TEE_ORIGIN_API;
  const TEE_Result result = client_result_of([&] {
    take_params(operation, message);
    message.origin = TEE_ORIGIN_TEE;
    return call(message);
  });
  if (message.origin != TEE_ORIGIN_API) give_back_params(message, operation);
  if (origin != nullptr) *origin = message.origin;
  return result;
}

TEE_Result refuse(uint32_t *origin, TEE_Result code, const char *why) {
  set_last_error(why);
  if (origin != nullptr) *origin = TEE_ORIGIN_API;
  return code;
}

constexpr uint32_t kDirections = TEEC_MEM_INPUT | TEEC_MEM_OUTPUT;

bool valid_request(const TEEC_Context *context, const TEEC_SharedMemory *memory) {
  return context != nullptr && context->imp != nullptr && memory != nullptr &&
         (memory->flags & kDirections) != 0 && (memory->flags & ~kDirections) == 0;
}

}  // namespace

}  // namespace tee

using namespace tee;

TEEC_Result TEEC_InitializeContext(const char *name, TEEC_Context *context) {
  if (context == nullptr) return refuse(nullptr, TEEC_ERROR_BAD_PARAMETERS, "context is NULL");
  context->imp = nullptr;
  return client_result_of([&] { return initialize(name, *context); });
}

void TEEC_FinalizeContext(TEEC_Context *context) {
  if (context == nullptr) return;
  delete static_cast<ClientContext *>(context->imp);
  context->imp = nullptr;
}

TEEC_Result TEEC_OpenSession(TEEC_Context *context, TEEC_Session *session,
                             const TEEC_UUID *destination, uint32_t connectionMethod,
                             const void *connectionData, TEEC_Operation *operation,
                             uint32_t *returnOrigin) {
  if (session != nullptr) session->imp = nullptr;
  if (context == nullptr || context->imp == nullptr || session == nullptr ||
      destination == nullptr) {
    return refuse(returnOrigin, TEEC_ERROR_BAD_PARAMETERS, "an argument is missing");
  }
  if (connectionMethod != TEEC_LOGIN_PUBLIC || connectionData != nullptr) {
    return refuse(returnOrigin, TEEC_ERROR_NOT_SUPPORTED, "only public login is offered");
  }
  return exchange(operation, returnOrigin, [&](Message &message) {
    return open_session(*context, *destination, message, *session);
  });
}

void TEEC_CloseSession(TEEC_Session *session) {
  if (session == nullptr || session->imp == nullptr) return;
  const std::unique_ptr<ClientSession> open(static_cast<ClientSession *>(session->imp));
  session->imp = nullptr;
  open->device->close_session(std::move(open->session));
}

TEEC_Result TEEC_InvokeCommand(TEEC_Session *session, uint32_t commandID, TEEC_Operation *operation,
                               uint32_t *returnOrigin) {
  if (session == nullptr || session->imp == nullptr) {
    return refuse(returnOrigin, TEEC_ERROR_BAD_PARAMETERS, "session is not open");
  }
  const auto &open = *static_cast<const ClientSession *>(session->imp);
  return exchange(operation, returnOrigin, [&](Message &message) {
    return open.device->invoke(*open.session, commandID, message);
  });
}

// Commands here run to their end; a client may ask, as everywhere.
void TEEC_RequestCancellation(TEEC_Operation *) {}

TEEC_Result TEEC_RegisterSharedMemory(TEEC_Context *context, TEEC_SharedMemory *sharedMem) {
  if (!valid_request(context, sharedMem) || sharedMem->buffer == nullptr) {
    return refuse(nullptr, TEEC_ERROR_BAD_PARAMETERS, "not memory that can be shared");
  }
  sharedMem->imp = nullptr;
  return TEEC_SUCCESS;
}

TEEC_Result TEEC_AllocateSharedMemory(TEEC_Context *context, TEEC_SharedMemory *sharedMem) {
  if (!valid_request(context, sharedMem)) {
    return refuse(nullptr, TEEC_ERROR_BAD_PARAMETERS, "not memory that can be shared");
  }
  sharedMem->buffer = std::calloc(1, sharedMem->size);
  sharedMem->imp = sharedMem->buffer;
  return sharedMem->buffer != nullptr ? TEEC_SUCCESS : TEEC_ERROR_OUT_OF_MEMORY;
}

void TEEC_ReleaseSharedMemory(TEEC_SharedMemory *sharedMem) {
  if (sharedMem == nullptr) return;
  if (sharedMem->imp != nullptr) std::free(sharedMem->imp);
  *sharedMem = {};
}
