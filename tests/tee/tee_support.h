// SPDX-License-Identifier: BSD-2-Clause
/// What tests of the host TEE share: a folder of their own, trusted applications that do what a
/// test says, and a client.
#ifndef TEE_SUPPORT_H
#define TEE_SUPPORT_H

#include <gtest/gtest.h>
#include <tee_client_api.h>
#include <tee_internal_api.h>
#include <tee_test.h>

#include <cstdlib>
#include <filesystem>
#include <functional>
#include <string>

constexpr TEEC_UUID kTaA = {1, 0, 0x4000, {0x80, 0, 0, 0, 0, 0, 0, 0xA}};
constexpr TEEC_UUID kTaB = {2, 0, 0x4000, {0x80, 0, 0, 0, 0, 0, 0, 0xB}};
constexpr TEEC_UUID kEchoTa = {0, 0, 0x4000, {0x80, 0, 0, 0, 0, 0, 0, 0xEC}};

inline TEE_UUID inner(const TEEC_UUID &uuid) {
  TEE_UUID result = {uuid.timeLow, uuid.timeMid, uuid.timeHiAndVersion, {}};
  std::copy_n(uuid.clockSeqAndNode, 8, result.clockSeqAndNode);
  return result;
}

class TempFolder {
 public:
  TempFolder() {
    std::string name = testing::TempDir() + "tee-test-XXXXXX";
    path = ::mkdtemp(name.data());
  }
  ~TempFolder() { std::filesystem::remove_all(path); }

  std::filesystem::path path;
};

/// What the trusted application number N does.
struct Script {
  std::function<TEE_Result()> create = [] { return TEE_SUCCESS; };
  std::function<void()> destroy = [] {};
  std::function<TEE_Result(TEE_Param *)> open = [](TEE_Param *) { return TEE_SUCCESS; };
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
          .open_session = [](uint32_t, TEE_Param *params,
                             void **) { return script<N>.open(params); },
          .close_session = [](void *) {},
          .invoke_command = [](void *, uint32_t, uint32_t types,
                               TEE_Param *params) { return script<N>.invoke(types, params); },
      });
}

inline TEEC_Operation operation_of(uint32_t types) {
  TEEC_Operation operation{};
  operation.paramTypes = types;
  return operation;
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

/// Writes an object, whole, as the running trusted application.
inline TEE_Result write_object(const std::string &id, const std::string &data,
                               uint32_t flags = TEE_DATA_FLAG_OVERWRITE) {
  TEE_ObjectHandle object;
  TEE_Result result = TEE_CreatePersistentObject(
      TEE_STORAGE_PRIVATE, id.data(), static_cast<uint32_t>(id.size()),
      flags | TEE_DATA_FLAG_ACCESS_WRITE, TEE_HANDLE_NULL, nullptr, 0, &object);
  if (result != TEE_SUCCESS) return result;
  result = TEE_WriteObjectData(object, data.data(), static_cast<uint32_t>(data.size()));
  TEE_CloseObject(object);
  return result;
}

inline TEE_Result open_object(const std::string &id, uint32_t flags, TEE_ObjectHandle *object) {
  return TEE_OpenPersistentObject(TEE_STORAGE_PRIVATE, id.data(), static_cast<uint32_t>(id.size()),
                                  flags, object);
}

/// Reads an object, whole; "(none)" when it cannot be opened.
inline std::string read_object(const std::string &id) {
  TEE_ObjectHandle object;
  if (open_object(id, TEE_DATA_FLAG_ACCESS_READ, &object) != TEE_SUCCESS) return "(none)";
  TEE_ObjectInfo info;
  EXPECT_EQ(TEE_GetObjectInfo1(object, &info), TEE_SUCCESS);
  std::string data(info.dataSize, '\0');
  uint32_t count = 0;
  EXPECT_EQ(TEE_ReadObjectData(object, data.data(), info.dataSize, &count), TEE_SUCCESS);
  EXPECT_EQ(count, info.dataSize);
  TEE_CloseObject(object);
  return data;
}

#endif
