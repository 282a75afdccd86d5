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

struct Call {
  const char *name;
  std::function<TEE_Result()> make;
};

void expect_each_to_fail_once(Device &device, Fault fault, const std::vector<Call> &calls) {
  for (const auto &[name, make] : calls) {
    SCOPED_TRACE(name);
    device.fail({}, fault, 1, false, TEE_ERROR_BUSY);
    EXPECT_EQ(make(), TEE_ERROR_BUSY);
    EXPECT_EQ(device.fault_report().call, name);
    EXPECT_EQ(make(), TEE_SUCCESS);
  }
}

TEST(Faults, EachCallFailsInItsTurnAndCanBeMadeAgain) {
  Device device;
  const InsideTa ta(device);
  TEE_ObjectHandle key, object;
  TEE_OperationHandle mac;
  expect_each_to_fail_once(
      device, Fault::kCrypto,
      {{"TEE_AllocateTransientObject",
        [&] { return TEE_AllocateTransientObject(TEE_TYPE_HMAC_SHA256, 256, &key); }},
       {"TEE_GenerateKey", [&] { return TEE_GenerateKey(key, 256, nullptr, 0); }},
       {"TEE_AllocateOperation",
        [&] { return TEE_AllocateOperation(&mac, TEE_ALG_HMAC_SHA256, TEE_MODE_MAC, 256); }},
       {"TEE_SetOperationKey", [&] { return TEE_SetOperationKey(mac, key); }}});
  TEE_FreeOperation(mac);
  TEE_FreeTransientObject(key);

  char byte;
  uint32_t count;
  const uint32_t access = TEE_DATA_FLAG_ACCESS_READ | TEE_DATA_FLAG_ACCESS_WRITE_META;
  expect_each_to_fail_once(
      device, Fault::kStorage,
      {{"TEE_CreatePersistentObject",
        [&] { return create_object("id", "", TEE_DATA_FLAG_ACCESS_WRITE, &object); }},
       {"TEE_WriteObjectData", [&] { return TEE_WriteObjectData(object, "x", 1); }},
       {"TEE_OpenPersistentObject",
        [&] {
          TEE_CloseObject(std::exchange(object, nullptr));
          return open_object("id", access, &object);
        }},
       {"TEE_ReadObjectData", [&] { return TEE_ReadObjectData(object, &byte, 1, &count); }},
       // Gives the handle up whatever the result.
       {"TEE_CloseAndDeletePersistentObject1",
        [&] { return TEE_CloseAndDeletePersistentObject1(std::exchange(object, nullptr)); }}});
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
