// SPDX-License-Identifier: BSD-2-Clause
// Persistent objects, on both kinds of storage.
#include <memory>

#include "tee_support.h"

using namespace tee::test;

namespace {

constexpr uint32_t kRead = TEE_DATA_FLAG_ACCESS_READ;
constexpr uint32_t kWrite = TEE_DATA_FLAG_ACCESS_WRITE;
constexpr uint32_t kMeta = TEE_DATA_FLAG_ACCESS_WRITE_META;
constexpr uint32_t kShareRead = TEE_DATA_FLAG_SHARE_READ;
constexpr uint32_t kShareWrite = TEE_DATA_FLAG_SHARE_WRITE;

class Persistent : public testing::TestWithParam<bool> {
 protected:
  Persistent() { reopen(); }

  // Without a folder the device cannot go away: its objects would.
  void reopen() {
    ta.reset();
    if (GetParam()) {
      device.reset();
      device = std::make_unique<Device>(folder.path / "state");
    } else if (!device) {
      device = std::make_unique<Device>();
    }
    ta = std::make_unique<InsideTa>(*device);
  }

  TempFolder folder;
  std::unique_ptr<Device> device;
  std::unique_ptr<InsideTa> ta;
};

INSTANTIATE_TEST_SUITE_P(Storage, Persistent, testing::Bool(),
                         [](const auto &of) { return of.param ? "Database" : "Memory"; });

TEST_P(Persistent, ObjectsOutliveTheirDevice) {
  const std::string large(300000, 'L');
  EXPECT_EQ(write_object("empty", ""), TEE_SUCCESS);
  EXPECT_EQ(write_object(std::string(64, 'x'), large), TEE_SUCCESS);
  EXPECT_EQ(write_object(std::string("\0\xff", 2), "odd ID"), TEE_SUCCESS);
  reopen();
  EXPECT_EQ(read_object("empty"), "");
  EXPECT_EQ(read_object(std::string(64, 'x')), large);
  EXPECT_EQ(read_object(std::string("\0\xff", 2)), "odd ID");
  EXPECT_EQ(read_object(std::string("\0", 1)), "(none)");
  EXPECT_EQ(device->objects({}).size(), 3u);
  EXPECT_TRUE(device->objects(inner(kTaA)).empty());
}

TEST_P(Persistent, WritingOverAnObjectKeepsWhatLiesBehind) {
  write_object("id", "0123456789");
  TEE_ObjectHandle object;
  ASSERT_EQ(open_object("id", kRead | kWrite, &object), TEE_SUCCESS);
  char data[16];
  uint32_t count;
  EXPECT_EQ(TEE_ReadObjectData(object, data, 2, &count), TEE_SUCCESS);
  EXPECT_EQ(TEE_WriteObjectData(object, "AB", 2), TEE_SUCCESS);
  EXPECT_EQ(TEE_ReadObjectData(object, data, sizeof(data), &count), TEE_SUCCESS);
  EXPECT_EQ(std::string(data, count), "456789");
  EXPECT_EQ(TEE_ReadObjectData(object, data, sizeof(data), &count), TEE_SUCCESS);
  EXPECT_EQ(count, 0u);
  EXPECT_EQ(TEE_WriteObjectData(object, "CD", 2), TEE_SUCCESS);
  TEE_CloseObject(object);
  EXPECT_EQ(read_object("id"), "01AB456789CD");
}

TEST_P(Persistent, NothingIsStoredBeforeTheHandleCloses) {
  write_object("old", "before");
  TEE_ObjectHandle old_object, new_object;
  ASSERT_EQ(open_object("old", kWrite, &old_object), TEE_SUCCESS);
  ASSERT_EQ(TEE_CreatePersistentObject(TEE_STORAGE_PRIVATE, "new", 3, kWrite, TEE_HANDLE_NULL,
                                       "initial", 7, &new_object),
            TEE_SUCCESS);
  EXPECT_EQ(TEE_WriteObjectData(old_object, "after!", 6), TEE_SUCCESS);
  EXPECT_EQ(device->objects({}), (std::map<std::string, std::string>{{"old", "before"}}));
  reopen();  // the instance dies with both handles open
  EXPECT_EQ(device->objects({}), (std::map<std::string, std::string>{{"old", "before"}}));
  EXPECT_EQ(write_object("new", "created at last", 0), TEE_SUCCESS);
}

TEST_P(Persistent, CreationHeedsWhatIsThere) {
  EXPECT_EQ(write_object("id", "first", 0), TEE_SUCCESS);
  EXPECT_EQ(write_object("id", "second", 0), TEE_ERROR_ACCESS_CONFLICT);
  EXPECT_EQ(read_object("id"), "first");
  EXPECT_EQ(write_object("id", "3rd", TEE_DATA_FLAG_OVERWRITE), TEE_SUCCESS);
  EXPECT_EQ(read_object("id"), "3rd");
  TEE_ObjectHandle object;
  ASSERT_EQ(open_object("id", kRead | kShareRead | kShareWrite, &object), TEE_SUCCESS);
  EXPECT_EQ(write_object("id", "fourth"), TEE_ERROR_ACCESS_CONFLICT);
  TEE_CloseObject(object);
}

TEST_P(Persistent, DeletedObjectsAreGone) {
  write_object("id", "data");
  TEE_ObjectHandle object;
  ASSERT_EQ(open_object("id", kMeta, &object), TEE_SUCCESS);
  EXPECT_EQ(TEE_CloseAndDeletePersistentObject1(object), TEE_SUCCESS);
  EXPECT_EQ(ta->stats().open_objects, 0u);
  EXPECT_EQ(open_object("id", kMeta, &object), TEE_ERROR_ITEM_NOT_FOUND);
  EXPECT_EQ(object, nullptr);
  reopen();
  EXPECT_EQ(read_object("id"), "(none)");
}

struct ShareCase {
  const char *name;
  uint32_t first;
  uint32_t second;
  bool passes;
};

const ShareCase kShares[] = {
    {"ReadersThatShare", kRead | kShareRead, kRead | kShareRead, true},
    {"SecondReaderDoesNotShare", kRead | kShareRead, kRead, false},
    {"FirstReaderDoesNotShare", kRead, kRead | kShareRead, false},
    {"WriterAmongReaders", kRead | kShareRead, kWrite | kShareRead, false},
    {"AllShareAll", kRead | kShareRead | kShareWrite, kWrite | kShareRead | kShareWrite, true},
    {"WritersThatShare", kWrite | kShareWrite, kWrite | kShareWrite, true},
    {"MetaIsNeverShared", kRead | kShareRead, kMeta | kShareRead, false},
    {"NothingBesideMeta", kMeta | kShareRead | kShareWrite, kRead | kShareRead, false},
};

TEST_P(Persistent, HandlesShareOnlyWhatAllOfThemAllow) {
  write_object("id", "data");
  for (const ShareCase &c : kShares) {
    SCOPED_TRACE(c.name);
    TEE_ObjectHandle first, second;
    ASSERT_EQ(open_object("id", c.first, &first), TEE_SUCCESS);
    EXPECT_EQ(open_object("id", c.second, &second),
              c.passes ? TEE_SUCCESS : TEE_ERROR_ACCESS_CONFLICT);
    TEE_CloseObject(first);
    TEE_CloseObject(second);
  }
}

TEST_P(Persistent, WritersOfOneObjectAreStoredTogether) {
  write_object("id", "....");
  TEE_ObjectHandle first, second;
  ASSERT_EQ(open_object("id", kWrite | kShareWrite, &first), TEE_SUCCESS);
  ASSERT_EQ(open_object("id", kWrite | kShareWrite, &second), TEE_SUCCESS);
  EXPECT_EQ(TEE_WriteObjectData(first, "aa", 2), TEE_SUCCESS);
  EXPECT_EQ(TEE_WriteObjectData(second, "b", 1), TEE_SUCCESS);
  TEE_CloseObject(first);
  EXPECT_EQ(device->objects({})["id"], "....");
  TEE_CloseObject(second);
  EXPECT_EQ(device->objects({})["id"], "ba..");
}

TEST_P(Persistent, AfterAPowerCutStorageHoldsWhatWasBefore) {
  write_object("a", "a");
  write_object("b", "b");
  EXPECT_EQ(device->durable_writes(), 2u);
  device->fail({}, Fault::kPowerCut, 2);
  write_object("a", "A");
  write_object("b", "B");  // cut here
  write_object("c", "C");
  TEE_ObjectHandle object;
  ASSERT_EQ(open_object("a", kMeta, &object), TEE_SUCCESS);
  EXPECT_EQ(TEE_CloseAndDeletePersistentObject1(object), TEE_SUCCESS);
  EXPECT_TRUE(device->fault_report().fired);
  EXPECT_EQ(device->durable_writes(), 3u);
  EXPECT_EQ(device->objects({}), (std::map<std::string, std::string>{{"b", "B"}, {"c", "C"}}));
  EXPECT_EQ(read_object("a"), "(none)");

  device->restore_power();
  EXPECT_EQ(device->objects({}), (std::map<std::string, std::string>{{"a", "A"}, {"b", "b"}}));
  EXPECT_EQ(write_object("c", "C"), TEE_SUCCESS);
  reopen();
  EXPECT_EQ(read_object("c"), "C");
}

TEST(PersistentDeathTest, MisuseOfAHandlePanics) {
  Device device;
  const InsideTa ta(device);
  write_object("id", "data");
  TEE_ObjectHandle object;
  char data[4];
  uint32_t count;
  ASSERT_EQ(open_object("id", kRead, &object), TEE_SUCCESS);
  EXPECT_DEATH(TEE_WriteObjectData(object, "x", 1), "lacks the access right");
  EXPECT_DEATH(TEE_CloseAndDeletePersistentObject1(object), "lacks the access right");
  TEE_CloseObject(object);
  EXPECT_DEATH(TEE_ReadObjectData(object, data, 4, &count), "TEE panic");
  EXPECT_DEATH(open_object(std::string(65, 'x'), kRead, &object), "longer than 64");
  EXPECT_DEATH(open_object("id", kWrite | TEE_DATA_FLAG_OVERWRITE, &object), "flags");
}

}  // namespace
