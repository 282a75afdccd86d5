// SPDX-License-Identifier: BSD-2-Clause
#include "tee_support.h"

using namespace tee::test;

namespace {

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

  device.fail({}, Fault::kAllocation, 1, true);
  EXPECT_FALSE(allocates());
  EXPECT_FALSE(allocates());
  device.clear_faults();
  EXPECT_TRUE(allocates());
  EXPECT_FALSE(device.fault_report().fired);
}

TEST(Faults, EachCallFailsInItsTurnAndCanBeMadeAgain) {
  Device device;
  const InsideTa ta(device);
  TEE_ObjectHandle key, object;
  TEE_OperationHandle mac;
  char byte;
  uint32_t count;
  const uint32_t access = TEE_DATA_FLAG_ACCESS_READ | TEE_DATA_FLAG_ACCESS_WRITE_META;
  struct {
    Fault fault;
    const char *name;
    std::function<TEE_Result()> make;
  } const kCalls[] = {
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
  for (const auto &[fault, name, make] : kCalls) {
    SCOPED_TRACE(name);
    device.fail({}, fault, 1, false, TEE_ERROR_BUSY);
    EXPECT_EQ(make(), TEE_ERROR_BUSY);
    EXPECT_EQ(device.fault_report().call, name);
    EXPECT_EQ(make(), TEE_SUCCESS);
  }
  TEE_FreeOperation(mac);
  TEE_FreeTransientObject(key);
  EXPECT_EQ(ta.stats().open_objects + ta.stats().open_operations, 0u);
  EXPECT_EQ(device.objects({})["id"], "x");
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
