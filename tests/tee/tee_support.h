// SPDX-License-Identifier: BSD-2-Clause
/// What tests of the host TEE share: a folder of their own, trusted applications that do what a
/// test says, and a client.
#ifndef TEE_SUPPORT_H
#define TEE_SUPPORT_H

#include <gtest/gtest.h>
#include <tee_client_api.h>
#include <tee_internal_api.h>
#include <tee_test.h>

#include <bit>
#include <functional>
#include <string>

#include "../support/temporary_folder.h"

constexpr TEEC_UUID kTaA = {1, 0, 0x4000, {0x80, 0, 0, 0, 0, 0, 0, 0xA}};
constexpr TEEC_UUID kTaB = {2, 0, 0x4000, {0x80, 0, 0, 0, 0, 0, 0, 0xB}};

inline TEE_UUID inner(const TEEC_UUID &uuid) {
  return std::bit_cast<TEE_UUID>(uuid);
}

/// What the trusted application number N does.
struct Script {
  std::function<TEE_Result()> create = [] { return TEE_SUCCESS; };
  std::function<void()> destroy = [] {};
  std::function<TEE_Result()> open = [] { return TEE_SUCCESS; };
  std::function<TEE_Result(uint32_t types, TEE_Param *)> invoke = [](uint32_t, TEE_Param *) {
    return TEE_SUCCESS;
  };
};

template <int N>
Script script;

template <int N>
void register_script(tee::test::Device &device, const TEEC_UUID &uuid) {
  script<N> = {};
  device.register_ta(
      {.uuid = inner(uuid)},
      {
          .create = [] { return script<N>.create(); },
          .destroy = [] { script<N>.destroy(); },
          .open_session = [](uint32_t, TEE_Param *, void **) { return script<N>.open(); },
          .close_session = [](void *) {},
          .invoke_command = [](void *, uint32_t, uint32_t types,
                               TEE_Param *params) { return script<N>.invoke(types, params); },
      });
}

/// A client of the normal world, with one session at a time.
class Client {
 public:
  explicit Client(const std::string &name) {
    result = TEEC_InitializeContext(name.c_str(), &context);
  }
  ~Client() {
    close();
    TEEC_FinalizeContext(&context);
  }
  Client(const Client &) = delete;

  TEEC_Result open(const TEEC_UUID &uuid) {
    return TEEC_OpenSession(&context, &session, &uuid, TEEC_LOGIN_PUBLIC, nullptr, nullptr,
                            &origin);
  }
  TEEC_Result invoke(uint32_t command, TEEC_Operation *operation = nullptr) {
    return TEEC_InvokeCommand(&session, command, operation, &origin);
  }
  void close() { TEEC_CloseSession(&session); }

  TEEC_Result result;
  TEEC_Context context{};
  TEEC_Session session{};
  uint32_t origin = 0;
};

inline TEE_Result create_object(const std::string &id, const std::string &data, uint32_t flags,
                                TEE_ObjectHandle *object) {
  return TEE_CreatePersistentObject(TEE_STORAGE_PRIVATE, id.data(),
                                    static_cast<uint32_t>(id.size()), flags, TEE_HANDLE_NULL,
                                    data.data(), static_cast<uint32_t>(data.size()), object);
}

inline TEE_Result open_object(const std::string &id, uint32_t flags, TEE_ObjectHandle *object) {
  return TEE_OpenPersistentObject(TEE_STORAGE_PRIVATE, id.data(), static_cast<uint32_t>(id.size()),
                                  flags, object);
}

/// Writes an object, whole, as the running trusted application.
inline TEE_Result write_object(const std::string &id, const std::string &data,
                               uint32_t flags = TEE_DATA_FLAG_OVERWRITE) {
  TEE_ObjectHandle object;
  TEE_Result result = create_object(id, "", flags | TEE_DATA_FLAG_ACCESS_WRITE, &object);
  if (result != TEE_SUCCESS) return result;
  result = TEE_WriteObjectData(object, data.data(), static_cast<uint32_t>(data.size()));
  TEE_CloseObject(object);
  return result;
}

inline std::string read_on(TEE_ObjectHandle object, uint32_t len) {
  std::string data(len, '?');
  uint32_t count = 0;
  EXPECT_EQ(TEE_ReadObjectData(object, data.data(), len, &count), TEE_SUCCESS);
  return data.substr(0, count);
}

#endif
