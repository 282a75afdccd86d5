// SPDX-License-Identifier: BSD-2-Clause
// Ways into a trusted application: loading, sessions of both worlds, parameters.
#include <atomic>
#include <chrono>
#include <fstream>
#include <thread>

#include "tee_support.h"

using namespace tee::test;

namespace {

// ---- Sessions of the normal world

const std::filesystem::path kCorvelImage =
    std::filesystem::read_symlink("/proc/self/exe").parent_path().parent_path() / "ta" /
    OTRP_CORVEL_IMAGE;

TEST(Loading, AMissingOrWrongImageIsNamed) {
  TemporaryFolder folder;
  std::filesystem::copy(kCorvelImage, folder.path / "00000002-0000-4000-8000-00000000000b.so");
  set_ta_directory(folder.path);
  Device device;
  Client client(device.name());
  EXPECT_EQ(client.open(kTaA), TEEC_ERROR_ITEM_NOT_FOUND);
  EXPECT_EQ(client.origin, TEEC_ORIGIN_TEE);
  EXPECT_NE(std::string(tee_inspect_last_error()).find(folder.path), std::string::npos);
  EXPECT_EQ(client.open(kTaB), TEEC_ERROR_BAD_FORMAT);
  set_ta_directory("");
}

uint32_t commands_of(Client &client) {
  TEEC_Operation operation{};
  operation.paramTypes = TEEC_VALUE_OUTPUT;
  EXPECT_EQ(client.invoke(0, &operation), TEEC_SUCCESS);
  return operation.params[0].value.a;
}

// As long as another instance of its device lives, the next one runs what the last one ran, unless
// that was written to.
TEST(Loading, AnImageRestsBetweenInstances) {
  TemporaryFolder folder;
  const std::filesystem::path image = folder.path / "00000001-0000-4000-8000-00000000000a.so";
  const std::filesystem::path moved = folder.path / "moved.so";
  std::filesystem::copy(OTRP_COUNTING_IMAGE, image);
  set_ta_directory(folder.path);
  Device device;
  register_script<1>(device, kTaB);
  Client keeper(device.name()), client(device.name());
  ASSERT_EQ(keeper.open(kTaB), TEEC_SUCCESS);
  for (int i = 0; i < 2; ++i) {
    ASSERT_EQ(client.open(kTaA), TEEC_SUCCESS);
    EXPECT_EQ(commands_of(client), 1u);
    client.close();
    if (i == 0) std::filesystem::rename(image, moved);
  }
  std::filesystem::copy(kCorvelImage, image);
  std::ofstream(moved, std::ios::app) << "more";
  EXPECT_EQ(client.open(kTaA), TEEC_ERROR_BAD_FORMAT);
  set_ta_directory("");
}

TEST(Loading, AnInstanceSharesNoVariableWithOthersOfItsImage) {
  TemporaryFolder folder;
  const std::filesystem::path image = folder.path / "00000001-0000-4000-8000-00000000000a.so";
  std::filesystem::copy(OTRP_COUNTING_IMAGE, image);
  set_ta_directory(folder.path);
  Device device, other_device;
  Client client(device.name()), other(other_device.name());
  for (int i = 0; i < 3; ++i) {
    SCOPED_TRACE(i);
    ASSERT_EQ(client.open(kTaA), TEEC_SUCCESS);
    EXPECT_EQ(commands_of(client), 1u);
    ASSERT_EQ(other.open(kTaA), TEEC_SUCCESS);
    EXPECT_EQ(commands_of(other), 1u);
    EXPECT_EQ(commands_of(client), 101u);
    (i == 1 ? other : client).close();
    (i == 1 ? client : other).close();
  }
  std::filesystem::remove(image);
  EXPECT_EQ(client.open(kTaA), TEEC_ERROR_ITEM_NOT_FOUND);
  std::filesystem::copy(kCorvelImage, image);
  EXPECT_EQ(client.open(kTaA), TEEC_ERROR_BAD_FORMAT);
  set_ta_directory("");
}

TEE_Result open_ta(const TEEC_UUID &uuid, TEE_TASessionHandle *session) {
  const TEE_UUID ta = inner(uuid);
  return TEE_OpenTASession(&ta, TEE_TIMEOUT_INFINITE, 0, nullptr, session, nullptr);
}

class Sessions : public testing::Test {
 protected:
  Sessions() {
    register_script<0>(device, kTaA);
    register_script<1>(device, kTaB);
  }
  Device device;
  Client client{device.name()};
};

TEST_F(Sessions, AFailingEntryPointLeavesNoInstance) {
  int destroyed = 0;
  script<0>.create = [] { return TEE_ERROR_BAD_STATE; };
  script<0>.destroy = [&] { ++destroyed; };
  EXPECT_EQ(client.open(kTaA), TEEC_ERROR_BAD_STATE);
  EXPECT_EQ(client.origin, TEEC_ORIGIN_TEE);
  EXPECT_EQ(destroyed, 0);

  script<0>.create = [] { return TEE_SUCCESS; };
  script<0>.open = [] { return TEE_ERROR_ACCESS_DENIED; };
  EXPECT_EQ(client.open(kTaA), TEEC_ERROR_ACCESS_DENIED);
  EXPECT_EQ(client.origin, TEEC_ORIGIN_TRUSTED_APP);
  EXPECT_EQ(destroyed, 1);
  EXPECT_EQ(client.session.imp, nullptr);
}

// The address sanitizer also sees that nothing leaks.
TEST_F(Sessions, WhatATrustedApplicationLeavesOpenEndsWithIt) {
  script<0>.invoke = [](uint32_t, TEE_Param *) {
    TEE_TASessionHandle session;
    TEE_ObjectHandle object;
    EXPECT_NE(TEE_Malloc(100, TEE_MALLOC_FILL_ZERO), nullptr);
    EXPECT_EQ(open_ta(kTaB, &session), TEE_SUCCESS);
    return create_object("left", "", TEE_DATA_FLAG_ACCESS_WRITE, &object);
  };
  ASSERT_EQ(client.open(kTaA), TEEC_SUCCESS);
  EXPECT_EQ(client.invoke(0), TEEC_SUCCESS);
  tee_heap_stats stats;
  ASSERT_EQ(tee_inspect_stats(&client.context, &kTaA, &stats), TEEC_SUCCESS);
  EXPECT_EQ(stats.in_use, 112u + 16u);
  EXPECT_EQ(stats.live_blocks, 1u);
  EXPECT_EQ(stats.open_objects, 1u);
  EXPECT_EQ(stats.open_sessions, 1u);
  client.close();
  for (const TEEC_UUID &uuid : {kTaA, kTaB}) {
    EXPECT_EQ(tee_inspect_stats(&client.context, &uuid, &stats), TEEC_ERROR_ITEM_NOT_FOUND);
  }
  EXPECT_TRUE(device.objects(inner(kTaA)).empty());
}

TEST_F(Sessions, OneCommandAtATime) {
  std::atomic<int> inside = 0, overlaps = 0;
  script<0>.invoke = [&](uint32_t, TEE_Param *) {
    if (++inside > 1) ++overlaps;
    std::this_thread::sleep_for(std::chrono::microseconds(100));
    --inside;
    return TEE_SUCCESS;
  };
  const auto work = [&] {
    Client own(device.name());
    for (int i = 0; i < 20; ++i) {
      if (own.open(kTaA) != TEEC_SUCCESS || own.invoke(0) != TEEC_SUCCESS) ++overlaps;
      own.close();
    }
  };
  std::thread first(work), second(work);
  first.join();
  second.join();
  EXPECT_EQ(overlaps, 0);
}

// ---- Sessions between trusted applications

TEE_Identity identity_of_client() {
  TEE_Identity identity{0xFF, {}};
  EXPECT_EQ(TEE_GetPropertyAsIdentity(TEE_PROPSET_CURRENT_CLIENT, "gpd.client.identity", &identity),
            TEE_SUCCESS);
  return identity;
}

TEST_F(Sessions, TheCalleeKnowsItsCallerAndSeesItsMemory) {
  script<1>.invoke = [](uint32_t, TEE_Param *params) {
    const TEE_Identity caller = identity_of_client();
    EXPECT_EQ(caller.login, TEE_LOGIN_TRUSTED_APP);
    EXPECT_EQ(caller.uuid.timeLow, kTaA.timeLow);
    params[0].memref.size = 1;
    return static_cast<char *>(params[0].memref.buffer)[0] == 'A' ? TEE_ERROR_SHORT_BUFFER : 0;
  };
  script<0>.invoke = [](uint32_t, TEE_Param *) {
    TEE_TASessionHandle session;
    uint32_t origin = 0;
    char bytes[] = "AA";
    TEE_Param params[4] = {{.memref = {bytes, 2}}};
    EXPECT_EQ(open_ta(kTaB, &session), TEE_SUCCESS);
    EXPECT_EQ(TEE_InvokeTACommand(session, TEE_TIMEOUT_INFINITE, 5, TEE_PARAM_TYPE_MEMREF_INOUT,
                                  params, &origin),
              TEE_ERROR_SHORT_BUFFER);
    EXPECT_EQ(origin, TEE_ORIGIN_TRUSTED_APP);
    EXPECT_EQ(params[0].memref.size, 1u);
    EXPECT_EQ(identity_of_client().login, TEE_LOGIN_PUBLIC);
    return TEE_SUCCESS;
  };
  ASSERT_EQ(client.open(kTaA), TEEC_SUCCESS);
  EXPECT_EQ(client.invoke(0), TEEC_SUCCESS);
}

TEST_F(Sessions, AnObjectIdInSharedMemoryPanics) {
  char shared[] = "0123456789";
  TEEC_Operation operation{.paramTypes = TEEC_MEMREF_TEMP_INPUT};
  operation.params[0].tmpref = {shared + 2, 4};
  script<0>.invoke = [&](uint32_t, TEE_Param *) {
    TEE_ObjectHandle object;
    const auto open = [&](size_t at, uint32_t len) {
      return TEE_OpenPersistentObject(TEE_STORAGE_PRIVATE, shared + at, len,
                                      TEE_DATA_FLAG_ACCESS_READ, &object);
    };
    EXPECT_EQ(open(0, 2), TEE_ERROR_ITEM_NOT_FOUND);
    EXPECT_EQ(open(6, 2), TEE_ERROR_ITEM_NOT_FOUND);
    EXPECT_DEATH(open(0, 3), "shared memory");
    EXPECT_DEATH(open(5, 3), "shared memory");
    return TEE_SUCCESS;
  };
  ASSERT_EQ(client.open(kTaA), TEEC_SUCCESS);
  EXPECT_EQ(client.invoke(0, &operation), TEEC_SUCCESS);
}

// They would wait for each other.
TEST_F(Sessions, CyclesAreRefused) {
  std::vector<TEE_Result> back;
  TEE_TASessionHandle session;
  const auto back_to_a = [&](uint32_t, TEE_Param *) {
    back.push_back(open_ta(kTaA, &session));
    return TEE_SUCCESS;
  };
  script<0>.create = [&] { return open_ta(kTaB, &session); };
  script<0>.invoke = script<1>.invoke = back_to_a;
  script<1>.open = [&] { return back_to_a(0, nullptr); };
  Client of_b(device.name());
  ASSERT_EQ(client.open(kTaA), TEEC_SUCCESS);  // B opens A while A is created
  ASSERT_EQ(of_b.open(kTaB), TEEC_SUCCESS);    // B opens A, which has a session with B
  EXPECT_EQ(client.invoke(0), TEEC_SUCCESS);   // A opens A
  EXPECT_EQ(back, std::vector<TEE_Result>(3, TEE_ERROR_BUSY));
}

// ---- Parameters

TEST_F(Sessions, ValuesGoBothWays) {
  script<0>.invoke = [](uint32_t, TEE_Param *params) {
    params[0].value.b = params[0].value.a + 1;
    return TEE_SUCCESS;
  };
  TEEC_Operation operation{.paramTypes = TEEC_VALUE_INOUT};
  operation.params[0].value = {41, 0};
  ASSERT_EQ(client.open(kTaA), TEEC_SUCCESS);
  EXPECT_EQ(client.invoke(0, &operation), TEEC_SUCCESS);
  EXPECT_EQ(operation.params[0].value.b, 42u);
}

struct MemoryCase {
  const char *name;
  uint32_t type;
  TEEC_RegisteredMemoryReference memory;
  uint32_t seen_type = 0;  // 0: refused
  size_t offset = 0, size = 0, size_after = 0;
};

constexpr uint32_t kSeenIn = TEE_PARAM_TYPE_MEMREF_INPUT;
constexpr uint32_t kSeenOut = TEE_PARAM_TYPE_MEMREF_OUTPUT;
constexpr uint32_t kSeenBoth = TEE_PARAM_TYPE_MEMREF_INOUT;

TEST_F(Sessions, MemoryReachesTheTrustedApplicationOrIsRefused) {
  TEEC_SharedMemory none{};
  TEEC_SharedMemory both{nullptr, 8, TEEC_MEM_INPUT | TEEC_MEM_OUTPUT, nullptr};
  ASSERT_EQ(TEEC_AllocateSharedMemory(&client.context, &both), TEEC_SUCCESS);
  TEEC_SharedMemory out{both.buffer, 8, TEEC_MEM_OUTPUT, nullptr};
  const MemoryCase kCases[] = {
      {"TempInput", TEEC_MEMREF_TEMP_INPUT, {&both, 8, 0}, kSeenIn, 0, 8, 8},
      {"TempOutput", TEEC_MEMREF_TEMP_OUTPUT, {&both, 8, 0}, kSeenOut, 0, 8, 3},
      {"Whole", TEEC_MEMREF_WHOLE, {&both, 4, 2}, kSeenBoth, 0, 8, 3},
      {"PartInput", TEEC_MEMREF_PARTIAL_INPUT, {&both, 4, 2}, kSeenIn, 2, 4, 4},
      {"PartOutput", TEEC_MEMREF_PARTIAL_OUTPUT, {&both, 4, 2}, kSeenOut, 2, 4, 3},
      {"NoBuffer", TEEC_MEMREF_TEMP_INPUT, {&none, 1, 0}},
      {"FourGiB", TEEC_MEMREF_TEMP_INPUT, {&both, size_t{1} << 32, 0}},
      {"PartTooLong", TEEC_MEMREF_PARTIAL_INPUT, {&both, 8, 1}},
      {"PartBehindTheEnd", TEEC_MEMREF_PARTIAL_INPUT, {&both, 0, 9}},
      {"PartThatWraps", TEEC_MEMREF_PARTIAL_INPUT, {&both, SIZE_MAX, 2}},
      {"PartAgainstItsFlags", TEEC_MEMREF_PARTIAL_INPUT, {&out, 8, 0}},
  };
  uint32_t seen_type = 0;
  TEE_Param seen{};
  script<0>.invoke = [&](uint32_t types, TEE_Param *params) {
    seen_type = types;
    seen = params[0];
    params[0].memref.size = 3;
    return TEE_ERROR_SHORT_BUFFER;
  };
  ASSERT_EQ(client.open(kTaA), TEEC_SUCCESS);
  for (const MemoryCase &c : kCases) {
    SCOPED_TRACE(c.name);
    const bool is_temporary = c.type < TEEC_MEMREF_WHOLE;
    TEEC_Operation operation{.paramTypes = c.type};
    TEEC_Parameter &param = operation.params[0];
    if (is_temporary) param.tmpref = {c.memory.parent->buffer, c.memory.size};
    if (!is_temporary) param.memref = c.memory;
    seen_type = 0;
    EXPECT_EQ(client.invoke(0, &operation),
              c.seen_type != 0 ? TEEC_ERROR_SHORT_BUFFER : TEEC_ERROR_BAD_PARAMETERS);
    EXPECT_EQ(seen_type, c.seen_type);
    if (c.seen_type == 0) continue;
    EXPECT_EQ(seen.memref.buffer, static_cast<char *>(both.buffer) + c.offset);
    EXPECT_EQ(seen.memref.size, c.size);
    EXPECT_EQ(is_temporary ? param.tmpref.size : param.memref.size, c.size_after);
  }
  TEEC_ReleaseSharedMemory(&both);
}

}  // namespace
