// SPDX-License-Identifier: BSD-2-Clause
// Ways into a trusted application: loading, sessions of both worlds, parameters.
#include <atomic>
#include <chrono>
#include <thread>

#include "tee_support.h"

using namespace tee::test;

namespace {

// ---- Images

uint32_t echo_calls(Client &client) {
  TEEC_Operation operation = operation_of(TEEC_VALUE_OUTPUT);
  EXPECT_EQ(client.invoke(0, &operation), TEEC_SUCCESS);
  return operation.params[0].value.a;
}

TEST(Loading, EachInstanceHasGlobalsOfItsOwn) {
  Device device, other_device;
  Client client(device.name()), same(device.name()), other(other_device.name());
  for (int round = 0; round < 2; ++round) {
    ASSERT_EQ(client.open(kEchoTa), TEEC_SUCCESS) << tee_inspect_last_error();
    ASSERT_EQ(same.open(kEchoTa), TEEC_SUCCESS);
    ASSERT_EQ(other.open(kEchoTa), TEEC_SUCCESS) << tee_inspect_last_error();
    EXPECT_EQ(echo_calls(client), 1u);
    EXPECT_EQ(echo_calls(other), 1u);
    client.close();
    EXPECT_EQ(echo_calls(same), 2u);
    same.close();
    other.close();
  }
}

TEST(Loading, AMissingOrWrongImageIsNamed) {
  TempFolder folder;
  const std::filesystem::path images =
      std::filesystem::read_symlink("/proc/self/exe").parent_path().parent_path() / "ta";
  std::filesystem::copy(images / "00000000-0000-4000-8000-0000000000ec.so",
                        folder.path / "00000002-0000-4000-8000-00000000000b.so");
  set_ta_directory(folder.path);
  Device device;
  Client client(device.name());
  EXPECT_EQ(client.open(kTaA), TEEC_ERROR_ITEM_NOT_FOUND);
  EXPECT_EQ(client.origin, TEEC_ORIGIN_TEE);
  EXPECT_NE(std::string(tee_inspect_last_error()).find(folder.path), std::string::npos);
  EXPECT_EQ(client.open(kTaB), TEEC_ERROR_BAD_FORMAT);
  EXPECT_EQ(client.open(kEchoTa), TEEC_SUCCESS);
  EXPECT_STREQ(tee_inspect_last_error(), "");
  set_ta_directory("");
}

// ---- Sessions

TEST(Sessions, AFailingEntryPointLeavesNoInstance) {
  Device device;
  register_script<0>(device, kTaA);
  Client client(device.name());
  script<0>.create = [] { return TEE_ERROR_BAD_STATE; };
  EXPECT_EQ(client.open(kTaA), TEEC_ERROR_BAD_STATE);
  EXPECT_EQ(client.origin, TEEC_ORIGIN_TEE);

  int destroyed = 0;
  script<0>.create = [] { return TEE_SUCCESS; };
  script<0>.destroy = [&] { ++destroyed; };
  script<0>.open = [](TEE_Param *) { return TEE_ERROR_ACCESS_DENIED; };
  EXPECT_EQ(client.open(kTaA), TEEC_ERROR_ACCESS_DENIED);
  EXPECT_EQ(client.origin, TEEC_ORIGIN_TRUSTED_APP);
  EXPECT_EQ(destroyed, 1);
  EXPECT_EQ(client.session.imp, nullptr);
}

// The address sanitizer also sees that nothing leaks.
TEST(Sessions, WhatATrustedApplicationLeavesOpenEndsWithIt) {
  Device device;
  register_script<0>(device, kTaA);
  script<0>.invoke = [](uint32_t, TEE_Param *) {
    TEE_ObjectHandle object;
    EXPECT_NE(TEE_Malloc(100, TEE_MALLOC_FILL_ZERO), nullptr);
    return TEE_CreatePersistentObject(TEE_STORAGE_PRIVATE, "left", 4, TEE_DATA_FLAG_ACCESS_WRITE,
                                      TEE_HANDLE_NULL, "data", 4, &object);
  };
  Client client(device.name());
  ASSERT_EQ(client.open(kTaA), TEEC_SUCCESS);
  EXPECT_EQ(client.invoke(0), TEEC_SUCCESS);
  tee_heap_stats stats;
  ASSERT_EQ(tee_inspect_stats(&client.context, &kTaA, &stats), TEEC_SUCCESS);
  EXPECT_EQ(stats.in_use, 112u + 16u);
  EXPECT_EQ(stats.live_blocks, 1u);
  EXPECT_EQ(stats.open_objects, 1u);
  client.close();
  EXPECT_EQ(tee_inspect_stats(&client.context, &kTaA, &stats), TEEC_ERROR_ITEM_NOT_FOUND);
  EXPECT_TRUE(device.objects(inner(kTaA)).empty());
}

TEST(Sessions, OneCommandAtATime) {
  Device device;
  register_script<0>(device, kTaA);
  std::atomic<int> inside = 0, overlaps = 0;
  script<0>.invoke = [&](uint32_t, TEE_Param *) {
    if (++inside > 1) ++overlaps;
    std::this_thread::sleep_for(std::chrono::microseconds(100));
    --inside;
    return TEE_SUCCESS;
  };
  const auto work = [&] {
    Client client(device.name());
    for (int i = 0; i < 20; ++i) {
      if (client.open(kTaA) != TEEC_SUCCESS || client.invoke(0) != TEEC_SUCCESS) ++overlaps;
      client.close();
    }
  };
  std::thread first(work), second(work);
  first.join();
  second.join();
  EXPECT_EQ(overlaps, 0);
}

TEE_Result open_ta(const TEEC_UUID &uuid, TEE_TASessionHandle *session) {
  const TEE_UUID destination = inner(uuid);
  return TEE_OpenTASession(&destination, TEE_TIMEOUT_INFINITE, 0, nullptr, session, nullptr);
}

TEE_Identity identity_of_client() {
  TEE_Identity identity{0xFF, {}};
  EXPECT_EQ(TEE_GetPropertyAsIdentity(TEE_PROPSET_CURRENT_CLIENT, "gpd.client.identity", &identity),
            TEE_SUCCESS);
  return identity;
}

// A opens a session to B and passes its parameter on.
TEST(TaToTa, TheCalleeKnowsItsCallerAndSeesItsMemory) {
  Device device;
  register_script<0>(device, kTaA);
  register_script<1>(device, kTaB);
  TEE_Identity of_a{}, of_b{};
  script<1>.invoke = [&](uint32_t, TEE_Param *params) {
    of_b = identity_of_client();
    static_cast<char *>(params[0].memref.buffer)[0] = 'B';
    params[0].memref.size = 1;
    return TEE_ERROR_SHORT_BUFFER;
  };
  script<0>.invoke = [&](uint32_t types, TEE_Param *params) {
    TEE_TASessionHandle session;
    uint32_t origin = 0;
    EXPECT_EQ(open_ta(kTaB, &session), TEE_SUCCESS);
    const TEE_Result result =
        TEE_InvokeTACommand(session, TEE_TIMEOUT_INFINITE, 5, types, params, &origin);
    EXPECT_EQ(origin, TEE_ORIGIN_TRUSTED_APP);
    of_a = identity_of_client();  // not B's any more; the session stays open
    return result;
  };
  Client client(device.name());
  ASSERT_EQ(client.open(kTaA), TEEC_SUCCESS);
  char buffer[4] = "...";
  TEEC_Operation operation = operation_of(TEEC_MEMREF_TEMP_INOUT);
  operation.params[0].tmpref = {buffer, sizeof(buffer)};
  EXPECT_EQ(client.invoke(0, &operation), TEEC_ERROR_SHORT_BUFFER);
  EXPECT_STREQ(buffer, "B..");
  EXPECT_EQ(operation.params[0].tmpref.size, 1u);
  EXPECT_EQ(of_b.login, TEE_LOGIN_TRUSTED_APP);
  EXPECT_EQ(of_b.uuid.timeLow, kTaA.timeLow);
  EXPECT_EQ(of_a.login, TEE_LOGIN_PUBLIC);
  EXPECT_EQ(of_a.uuid.timeLow, 0u);

  tee_heap_stats stats;
  ASSERT_EQ(tee_inspect_stats(&client.context, &kTaA, &stats), TEEC_SUCCESS);
  EXPECT_EQ(stats.open_sessions, 1u);
  client.close();
  EXPECT_EQ(tee_inspect_stats(&client.context, &kTaB, &stats), TEEC_ERROR_ITEM_NOT_FOUND);
}

TEST(TaToTa, CyclesAreRefused) {
  Device device;
  register_script<0>(device, kTaA);
  register_script<1>(device, kTaB);
  std::vector<TEE_Result> back;
  TEE_TASessionHandle session;
  const auto back_to_a = [&](uint32_t, TEE_Param *) {
    back.push_back(open_ta(kTaA, &session));
    return TEE_SUCCESS;
  };
  script<0>.create = [&] { return open_ta(kTaB, &session); };
  script<0>.invoke = back_to_a;
  script<1>.invoke = back_to_a;
  script<1>.open = [&](TEE_Param *params) { return back_to_a(0, params); };
  Client client(device.name()), of_b(device.name());
  ASSERT_EQ(client.open(kTaA), TEEC_SUCCESS);  // B opens A while A is created
  ASSERT_EQ(of_b.open(kTaB), TEEC_SUCCESS);    // B opens A, which has a session with B
  EXPECT_EQ(client.invoke(0), TEEC_SUCCESS);   // A opens A
  EXPECT_EQ(back, std::vector<TEE_Result>(3, TEE_ERROR_BUSY));
}

// ---- Parameters

struct TypeCase {
  const char *name;
  uint32_t client_type;
  uint32_t seen_type;
  size_t offset, size;  // of what is seen, in the shared memory of 8 bytes
  size_t size_after;
};

const TypeCase kTypes[] = {
    {"TempInput", TEEC_MEMREF_TEMP_INPUT, TEE_PARAM_TYPE_MEMREF_INPUT, 0, 8, 8},
    {"TempOutput", TEEC_MEMREF_TEMP_OUTPUT, TEE_PARAM_TYPE_MEMREF_OUTPUT, 0, 8, 3},
    {"Whole", TEEC_MEMREF_WHOLE, TEE_PARAM_TYPE_MEMREF_INOUT, 0, 8, 3},
    {"PartInput", TEEC_MEMREF_PARTIAL_INPUT, TEE_PARAM_TYPE_MEMREF_INPUT, 2, 4, 4},
    {"PartOutput", TEEC_MEMREF_PARTIAL_OUTPUT, TEE_PARAM_TYPE_MEMREF_OUTPUT, 2, 4, 3},
};

TEST(Parameters, MemoryReferencesReachTheTrustedApplication) {
  Device device;
  register_script<0>(device, kTaA);
  uint32_t seen_type = 0;
  TEE_Param seen{};
  script<0>.invoke = [&](uint32_t types, TEE_Param *params) {
    seen_type = types;
    seen = params[0];
    params[0].memref.size = 3;
    return TEE_ERROR_SHORT_BUFFER;
  };
  Client client(device.name());
  ASSERT_EQ(client.open(kTaA), TEEC_SUCCESS);
  TEEC_SharedMemory shared{nullptr, 8, TEEC_MEM_INPUT | TEEC_MEM_OUTPUT, nullptr};
  ASSERT_EQ(TEEC_AllocateSharedMemory(&client.context, &shared), TEEC_SUCCESS);
  for (const TypeCase &c : kTypes) {
    SCOPED_TRACE(c.name);
    const bool temporary = c.client_type < TEEC_MEMREF_WHOLE;
    TEEC_Operation operation = operation_of(c.client_type);
    TEEC_Parameter &param = operation.params[0];
    if (temporary) param.tmpref = {shared.buffer, 8};
    if (!temporary) param.memref = {&shared, 4, 2};
    EXPECT_EQ(client.invoke(0, &operation), TEEC_ERROR_SHORT_BUFFER);
    EXPECT_EQ(seen_type, c.seen_type);
    EXPECT_EQ(seen.memref.buffer, static_cast<char *>(shared.buffer) + c.offset);
    EXPECT_EQ(seen.memref.size, c.size);
    const size_t size_after = temporary ? param.tmpref.size : param.memref.size;
    EXPECT_EQ(size_after, c.size_after);
  }
  TEEC_ReleaseSharedMemory(&shared);
}

TEST(Parameters, EveryTypeWordReachesTheTrustedApplicationOrIsRefused) {
  Device device;
  register_script<0>(device, kTaA);
  uint32_t seen = 0;
  script<0>.invoke = [&](uint32_t types, TEE_Param *) {
    seen = types;
    return TEE_SUCCESS;
  };
  Client client(device.name());
  ASSERT_EQ(client.open(kTaA), TEEC_SUCCESS);
  for (uint32_t types = 0; types <= 0xFFFF; ++types) {
    bool registered = false;  // a reference to shared memory, of which there is none
    for (uint32_t i = 0; i < 4; ++i) registered |= TEE_PARAM_TYPE_GET(types, i) >= 0xC;
    TEEC_Operation operation = operation_of(types);
    seen = ~0u;
    ASSERT_EQ(client.invoke(0, &operation), registered ? TEEC_ERROR_BAD_PARAMETERS : TEEC_SUCCESS);
    ASSERT_EQ(seen, registered ? ~0u : types);
  }
}

struct RefusedCase {
  const char *name;
  TEEC_TempMemoryReference temp;
  TEEC_RegisteredMemoryReference part;
};

TEST(Parameters, ReferencesThatLieAreRefused) {
  char bytes[8];
  TEEC_SharedMemory shared{bytes, 8, TEEC_MEM_INPUT, nullptr};
  TEEC_SharedMemory output{bytes, 8, TEEC_MEM_OUTPUT, nullptr};
  const RefusedCase kRefused[] = {
      {"NoBuffer", {nullptr, 1}, {&shared, 8, 0}},
      {"FourGiB", {bytes, size_t{1} << 32}, {&shared, 8, 0}},
      {"PartTooLong", {bytes, 8}, {&shared, 8, 1}},
      {"PartBehindTheEnd", {bytes, 8}, {&shared, 0, 9}},
      {"PartAgainstItsFlags", {bytes, 8}, {&output, 8, 0}},
      {"PartThatWraps", {bytes, 8}, {&shared, SIZE_MAX, 2}},
  };
  Device device;
  register_script<0>(device, kTaA);
  Client client(device.name());
  ASSERT_EQ(client.open(kTaA), TEEC_SUCCESS);
  for (const RefusedCase &c : kRefused) {
    SCOPED_TRACE(c.name);
    TEEC_Operation operation =
        operation_of(TEEC_PARAM_TYPES(TEEC_MEMREF_TEMP_INPUT, TEEC_MEMREF_PARTIAL_INPUT, 0, 0));
    operation.params[0].tmpref = c.temp;
    operation.params[1].memref = c.part;
    EXPECT_EQ(client.invoke(0, &operation), TEEC_ERROR_BAD_PARAMETERS);
    EXPECT_EQ(client.origin, TEEC_ORIGIN_API);
  }
}

}  // namespace
