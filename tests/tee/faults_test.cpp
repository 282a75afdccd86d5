// SPDX-License-Identifier: BSD-2-Clause
#include <new>
#include <vector>

#include "tee_support.h"

using namespace tee::test;

// ---- The host's memory

static unsigned g_allocation_to_fail = 0;  // counted from the next one; 0: none
static unsigned g_num_failed = 0;

void *operator new(size_t size, const std::nothrow_t &) noexcept {
  if (g_allocation_to_fail != 0 && --g_allocation_to_fail == 0) {
    ++g_num_failed;
    return nullptr;
  }
  return std::malloc(size != 0 ? size : 1);
}
void *operator new(size_t size) {
  void *block = operator new(size, std::nothrow);
  if (block == nullptr) throw std::bad_alloc();
  return block;
}
// Inlined without the one above, g++ takes these for mismatched.
[[gnu::noinline]] void operator delete(void *block) noexcept {
  std::free(block);
}
[[gnu::noinline]] void operator delete(void *block, size_t) noexcept {
  std::free(block);
}

namespace {

// Makes the call with its first allocation failing, then with the second, until it needs no more.
void expect_codes_without_memory(const std::function<TEE_Result()> &call) {
  for (unsigned n = 1;; ++n) {
    g_allocation_to_fail = n;
    const TEE_Result result = call();
    const bool was_hit = std::exchange(g_allocation_to_fail, 0u) == 0;
    if (!was_hit) {
      EXPECT_EQ(result, TEE_SUCCESS);
      return;
    }
    EXPECT_TRUE(result == TEE_ERROR_OUT_OF_MEMORY || result == TEE_ERROR_STORAGE_NO_SPACE ||
                result == TEE_ERROR_STORAGE_NOT_AVAILABLE)
        << n << std::hex << " " << result;
  }
}

bool allocates() {
  void *block = TEE_Malloc(1, TEE_MALLOC_FILL_ZERO);
  TEE_Free(block);
  return block != nullptr;
}

TEST(Faults, HitTheNthCallOnceOrFromThereOn) {
  Device device;
  const InsideTa ta(device);
  device.fail(inner(kTaA), Fault::kAllocation, 1);  // another trusted application
  device.fail({}, Fault::kStorage, 1);              // another kind
  device.fail({}, Fault::kAllocation, 2);
  EXPECT_TRUE(allocates());
  EXPECT_FALSE(device.fault_report().fired);
  EXPECT_FALSE(allocates());
  EXPECT_TRUE(device.fault_report().fired);
  EXPECT_EQ(device.fault_report().call, "TEE_Malloc");
  EXPECT_TRUE(allocates());

  device.fail({}, Fault::kFullHeap, 40);
  EXPECT_TRUE(allocates());  // 32 bytes, with what each block takes besides
  void *block = TEE_Malloc(1, TEE_MALLOC_FILL_ZERO);
  EXPECT_FALSE(device.fault_report().fired);
  EXPECT_FALSE(allocates());
  EXPECT_TRUE(device.fault_report().fired);
  EXPECT_EQ(device.fault_report().heap_in_use, 32u);
  TEE_Free(block);
  EXPECT_TRUE(allocates());

  device.fail({}, Fault::kAllocation, 1, true);
  EXPECT_FALSE(allocates());
  EXPECT_FALSE(allocates());
  device.clear_faults();
  EXPECT_TRUE(allocates());
  EXPECT_FALSE(device.fault_report().fired);
}

struct Call {
  Fault fault;
  const char *name;
  std::function<TEE_Result()> make;
};

// Calls of an instance, in an order in which each succeeds.
class Calls : public testing::Test {
 protected:
  ~Calls() override {
    TEE_FreeOperation(mac);
    TEE_FreeTransientObject(key);
    EXPECT_EQ(ta.stats().open_objects + ta.stats().open_operations, 0u);
  }

  Device device;
  const InsideTa ta{device};
  TEE_ObjectHandle key = nullptr, object = nullptr;
  TEE_OperationHandle mac = nullptr;
  char byte = 0;
  uint32_t count = 0;
  const uint32_t access = TEE_DATA_FLAG_ACCESS_READ | TEE_DATA_FLAG_ACCESS_WRITE_META;
  const std::vector<Call> calls = {
      {Fault::kCrypto, "TEE_AllocateTransientObject",
       [&] { return TEE_AllocateTransientObject(TEE_TYPE_HMAC_SHA256, 256, &key); }},
      {Fault::kCrypto, "TEE_GenerateKey", [&] { return TEE_GenerateKey(key, 256, nullptr, 0); }},
      {Fault::kCrypto, "TEE_AllocateOperation",
       [&] { return TEE_AllocateOperation(&mac, TEE_ALG_HMAC_SHA256, TEE_MODE_MAC, 256); }},
      {Fault::kCrypto, "TEE_SetOperationKey", [&] { return TEE_SetOperationKey(mac, key); }},
      {Fault::kStorage, "TEE_CreatePersistentObject",
       [&] { return create_object("id", "", TEE_DATA_FLAG_ACCESS_WRITE, &object); }},
      {Fault::kStorage, "TEE_WriteObjectData", [&] { return TEE_WriteObjectData(object, "x", 1); }},
      {Fault::kStorage, "TEE_OpenPersistentObject",
       [&] {
         TEE_CloseObject(std::exchange(object, nullptr));
         return open_object("id", access, &object);
       }},
      {Fault::kStorage, "TEE_ReadObjectData",
       [&] { return TEE_ReadObjectData(object, &byte, 1, &count); }},
      // Gives the handle up whatever the result.
      {Fault::kStorage, "TEE_CloseAndDeletePersistentObject1",
       [&] { return TEE_CloseAndDeletePersistentObject1(std::exchange(object, nullptr)); }},
  };
};

TEST_F(Calls, FailInTheirTurnAndCanBeMadeAgain) {
  for (const auto &[fault, name, make] : calls) {
    SCOPED_TRACE(name);
    device.fail({}, fault, 1, false, TEE_ERROR_BUSY);
    EXPECT_EQ(make(), TEE_ERROR_BUSY);
    EXPECT_EQ(device.fault_report().call, name);
    EXPECT_EQ(make(), TEE_SUCCESS);
  }
  EXPECT_EQ(device.objects({})["id"], "x");
}

// No exception crosses a C function.
TEST_F(Calls, SayWhenTheHostHasNoMemory) {
  for (const auto &[fault, name, make] : calls) {
    SCOPED_TRACE(name);
    expect_codes_without_memory(make);
  }
  register_script<0>(device, kTaA);
  register_script<1>(device, kTaB);
  script<0>.invoke = [](uint32_t, TEE_Param *) {
    expect_codes_without_memory([] {
      const TEE_UUID other = inner(kTaB);
      TEE_TASessionHandle session;
      return TEE_OpenTASession(&other, 0, 0, nullptr, &session, nullptr);
    });
    return TEE_SUCCESS;
  };
  Client client(device.name());
  expect_codes_without_memory([&] { return client.open(kTaA); });
  EXPECT_EQ(client.invoke(0), TEEC_SUCCESS);
  EXPECT_GT(g_num_failed, 20u);
}

TEST_F(Calls, CloseTheHandleOfACorruptObject) {
  device.put_object({}, "id", "data");
  for (const size_t i : {7u, 5u}) {  // a read and a write
    ASSERT_EQ(open_object("id", TEE_DATA_FLAG_ACCESS_READ | TEE_DATA_FLAG_ACCESS_WRITE, &object),
              TEE_SUCCESS);
    device.fail({}, Fault::kStorage, 1, false, TEE_ERROR_CORRUPT_OBJECT);
    EXPECT_EQ(calls[i].make(), TEE_ERROR_CORRUPT_OBJECT);
    EXPECT_EQ(ta.stats().open_objects, 0u);
  }
}

TEST(Faults, AShortReadGivesHalf) {
  Device device;
  const InsideTa ta(device);
  device.put_object({}, "id", "12345678");
  device.fail({}, Fault::kShortRead, 1);
  TEE_ObjectHandle object;
  ASSERT_EQ(open_object("id", TEE_DATA_FLAG_ACCESS_READ, &object), TEE_SUCCESS);
  EXPECT_EQ(read_on(object, 8), "1234");
  EXPECT_EQ(read_on(object, 8), "5678");
  TEE_CloseObject(object);
}

}  // namespace
