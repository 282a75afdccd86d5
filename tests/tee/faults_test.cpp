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

TEST(Faults, StorageCallsFailOneAfterTheOther) {
  const char *const calls[] = {"TEE_OpenPersistentObject", "TEE_CreatePersistentObject",
                               "TEE_WriteObjectData",      "TEE_OpenPersistentObject",
                               "TEE_ReadObjectData",       "TEE_CloseAndDeletePersistentObject1"};
  for (unsigned n = 1; n <= std::size(calls); ++n) {
    SCOPED_TRACE(calls[n - 1]);
    Device device;
    const InsideTa ta(device);
    device.fail({}, Fault::kStorage, n, false, TEE_ERROR_CORRUPT_OBJECT);
    TEE_ObjectHandle object = TEE_HANDLE_NULL;
    TEE_Result result = open_object("id", 0, &object);
    if (result == TEE_ERROR_ITEM_NOT_FOUND) result = write_object("id", "data");
    if (result == TEE_SUCCESS) {
      result =
          open_object("id", TEE_DATA_FLAG_ACCESS_READ | TEE_DATA_FLAG_ACCESS_WRITE_META, &object);
    }
    char byte;
    uint32_t count;
    if (result == TEE_SUCCESS) result = TEE_ReadObjectData(object, &byte, 1, &count);
    if (result == TEE_SUCCESS) {
      result = TEE_CloseAndDeletePersistentObject1(object);
    } else {
      TEE_CloseObject(object);
    }
    EXPECT_EQ(result, TEE_ERROR_CORRUPT_OBJECT);
    EXPECT_EQ(device.fault_report().call, calls[n - 1]);
    EXPECT_EQ(ta.stats().open_objects, 0u);
    EXPECT_EQ(device.objects({}).contains("id"), n > 2);
  }
}

TEST(Faults, AShortReadGivesHalf) {
  Device device;
  const InsideTa ta(device);
  device.put_object({}, "id", "12345678");
  device.fail({}, Fault::kShortRead, 1);
  TEE_ObjectHandle object;
  ASSERT_EQ(open_object("id", TEE_DATA_FLAG_ACCESS_READ, &object), TEE_SUCCESS);
  char data[8];
  uint32_t count;
  EXPECT_EQ(TEE_ReadObjectData(object, data, 8, &count), TEE_SUCCESS);
  EXPECT_EQ(count, 4u);
  EXPECT_EQ(TEE_ReadObjectData(object, data, 8, &count), TEE_SUCCESS);
  EXPECT_EQ(std::string(data, count), "5678");
  TEE_CloseObject(object);
}

}  // namespace
