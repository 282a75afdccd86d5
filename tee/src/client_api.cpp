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

// Throws unless the argument is what it must be.
void expect(bool argument_is_good, const char *why) {
  if (!argument_is_good) throw Error{TEE_ERROR_BAD_PARAMETERS, why};
}

TEE_Result open_session(const TEEC_Context &context, const TEEC_UUID &destination, Message &message,
                        TEEC_Session &session) {
  auto fresh = std::make_unique<ClientSession>(ClientSession{device_of(&context), nullptr});
  const TEE_Result result =
      fresh->device->open_session(from_client(destination), kNormalWorld, message, fresh->session);
  if (result == TEE_SUCCESS) session.imp = fresh.release();
  return result;
}

// Takes the parameters in, runs `call`, and hands them out whatever its result. What `check`
// throws, and a parameter that cannot be taken in, is the API's finding; what follows tells its own
// origin.
template <class Check, class Call>
TEE_Result exchange(TEEC_Operation *operation, uint32_t *origin, Check &&check, Call &&call) {
  Message message;
  message.origin = TEE_ORIGIN_API;
  const TEE_Result result = client_result_of([&] {
    check();
    take_params(operation, message);
    message.origin = TEE_ORIGIN_TEE;
    return call(message);
  });
  if (message.origin != TEE_ORIGIN_API) give_back_params(message, operation);
  if (origin != nullptr) *origin = message.origin;
  return result;
}

constexpr uint32_t kDirections = TEEC_MEM_INPUT | TEEC_MEM_OUTPUT;

void check_request(const TEEC_Context *context, const TEEC_SharedMemory *memory) {
  device_of(context);
  expect(memory != nullptr, "shared memory is NULL");
  expect((memory->flags & kDirections) != 0 && (memory->flags & ~kDirections) == 0,
         "shared memory without a direction, or with other flags");
}

}  // namespace

}  // namespace tee

using namespace tee;

TEEC_Result TEEC_InitializeContext(const char *name, TEEC_Context *context) {
  if (context != nullptr) context->imp = nullptr;
  return client_result_of([&] {
    expect(context != nullptr, "context is NULL");
    expect(name != nullptr && *name != '\0', "the context name, a state directory, is missing");
    context->imp = new ClientContext{DeviceShare(open_device(name))};
    return TEE_SUCCESS;
  });
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
  const auto check = [&] {
    device_of(context);
    expect(session != nullptr, "session is NULL");
    expect(destination != nullptr, "destination is NULL");
    if (connectionMethod != TEEC_LOGIN_PUBLIC || connectionData != nullptr) {
      throw Error{TEE_ERROR_NOT_SUPPORTED, "only public login is offered"};
    }
  };
  return exchange(operation, returnOrigin, check, [&](Message &message) {
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
  const auto check = [&] {
    expect(session != nullptr && session->imp != nullptr, "session is not open");
  };
  return exchange(operation, returnOrigin, check, [&](Message &message) {
    const auto &open = *static_cast<const ClientSession *>(session->imp);
    return open.device->invoke(*open.session, commandID, message);
  });
}

// Commands here run to their end; a client may ask, as everywhere.
void TEEC_RequestCancellation(TEEC_Operation *) {}

TEEC_Result TEEC_RegisterSharedMemory(TEEC_Context *context, TEEC_SharedMemory *sharedMem) {
  return client_result_of([&] {
    check_request(context, sharedMem);
    expect(sharedMem->buffer != nullptr, "shared memory without a buffer");
    sharedMem->imp = nullptr;
    return TEE_SUCCESS;
  });
}

TEEC_Result TEEC_AllocateSharedMemory(TEEC_Context *context, TEEC_SharedMemory *sharedMem) {
  return client_result_of([&] {
    check_request(context, sharedMem);
    sharedMem->imp = sharedMem->buffer = std::calloc(1, sharedMem->size);
    if (sharedMem->buffer == nullptr) throw std::bad_alloc();
    return TEE_SUCCESS;
  });
}

void TEEC_ReleaseSharedMemory(TEEC_SharedMemory *sharedMem) {
  if (sharedMem == nullptr) return;
  if (sharedMem->imp != nullptr) std::free(sharedMem->imp);
  *sharedMem = {};
}
