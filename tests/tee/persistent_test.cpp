// SPDX-License-Identifier: BSD-2-Clause
// Persistent objects, on both kinds of storage.
#include <cstring>
#include <memory>
#include <optional>

#include "tee_support.h"

using namespace tee::test;

namespace {

using ObjectMap = std::map<std::string, std::string>;

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
  ObjectMap stored() const { return device->objects({}); }

  TemporaryFolder folder;
  std::unique_ptr<Device> device;
  std::unique_ptr<InsideTa> ta;
  TEE_ObjectHandle object = TEE_HANDLE_NULL;
};

INSTANTIATE_TEST_SUITE_P(Storage, Persistent, testing::Bool(),
                         [](const auto &of) { return of.param ? "Database" : "Memory"; });

TEST_P(Persistent, ObjectsOutliveTheirDeviceUntilTheyAreDeleted) {
  const ObjectMap objects = {{"empty", ""},
                             {std::string(64, 'x'), std::string(300000, 'L')},
                             {std::string("\0\xff", 2), "odd ID"}};
  for (const auto &[id, data] : objects) EXPECT_EQ(write_object(id, data), TEE_SUCCESS);
  reopen();
  EXPECT_EQ(stored(), objects);
  EXPECT_TRUE(device->objects(inner(kTaA)).empty());
  {
    const InsideTa other(*device, {.uuid = inner(kTaA)});
    EXPECT_EQ(open_object("empty", kRead, &object), TEE_ERROR_ITEM_NOT_FOUND);
  }
  EXPECT_EQ(open_object(std::string("\0", 1), kRead, &object), TEE_ERROR_ITEM_NOT_FOUND);

  ASSERT_EQ(open_object("empty", kMeta, &object), TEE_SUCCESS);
  EXPECT_EQ(TEE_CloseAndDeletePersistentObject1(object), TEE_SUCCESS);
  EXPECT_EQ(open_object("empty", kMeta, &object), TEE_ERROR_ITEM_NOT_FOUND);
  EXPECT_EQ(object, nullptr);
  EXPECT_EQ(ta->stats().open_objects, 0u);
  reopen();
  EXPECT_EQ(stored().size(), 2u);
}

TEST_P(Persistent, WritingOverAnObjectKeepsWhatLiesBehind) {
  write_object("id", "0123456789");
  ASSERT_EQ(open_object("id", kRead | kWrite, &object), TEE_SUCCESS);
  EXPECT_EQ(read_on(object, 2), "01");
  EXPECT_EQ(TEE_WriteObjectData(object, "AB", 2), TEE_SUCCESS);
  EXPECT_EQ(read_on(object, 16), "456789");
  EXPECT_EQ(read_on(object, 16), "");
  EXPECT_EQ(TEE_WriteObjectData(object, "CD", 2), TEE_SUCCESS);
  TEE_CloseObject(object);
  EXPECT_EQ(stored()["id"], "01AB456789CD");
}

// Of an object that is there or not. The instance dies with the handle open, unless it was closed.
TEST_P(Persistent, WhatWasWrittenIsStoredAndOnlyAnEmptyCreationWaits) {
  const std::string kBefore = "there before";
  const struct {
    const char *name;
    std::string initial;
    std::optional<std::string> written;
    bool closed;
    std::string stored;
    uint64_t num_writes, num_at_once;
  } kCases[] = {
      {"WithData", "initial", std::nullopt, false, "initial", 1, 1},
      {"Written", "", "abc", false, "abc", 1, 2},
      {"WrittenOver", "initial", "abc", false, "abctial", 2, 2},
      {"NoBytesWritten", "", "", false, "", 1, 1},
      {"Closed", "", std::nullopt, true, "", 1, 1},
      {"Left", "", std::nullopt, false, "", 0, 1},
  };
  for (const auto &[exists, at_once] : {std::pair(0, 0), {0, 1}, {1, 0}, {1, 1}}) {
    for (const auto &c : kCases) {
      SCOPED_TRACE(std::string(c.name) + (exists ? ", exists" : "") + (at_once ? ", at once" : ""));
      device->create_at_once(at_once);
      device->remove_object({}, "id");
      if (exists) device->put_object({}, "id", kBefore);
      const uint64_t before = device->durable_writes();
      ASSERT_EQ(create_object("id", c.initial, kWrite | TEE_DATA_FLAG_OVERWRITE, &object),
                TEE_SUCCESS);
      if (c.written) {
        const auto len = static_cast<uint32_t>(c.written->size());
        EXPECT_EQ(TEE_WriteObjectData(object, c.written->data(), len), TEE_SUCCESS);
      }
      if (c.closed) TEE_CloseObject(object);
      const uint64_t num_writes = at_once ? c.num_at_once : c.num_writes;
      EXPECT_EQ(device->durable_writes() - before, num_writes);
      reopen();
      ObjectMap expected = {{"id", num_writes != 0 ? c.stored : kBefore}};
      if (num_writes == 0 && !exists) expected.clear();
      EXPECT_EQ(stored(), expected);
    }
  }
}

TEST_P(Persistent, CreationHeedsWhatIsThere) {
  EXPECT_EQ(write_object("id", "first", 0), TEE_SUCCESS);
  EXPECT_EQ(write_object("id", "second", 0), TEE_ERROR_ACCESS_CONFLICT);
  EXPECT_EQ(stored()["id"], "first");
  EXPECT_EQ(write_object("id", "3rd", TEE_DATA_FLAG_OVERWRITE), TEE_SUCCESS);
  ASSERT_EQ(open_object("id", kRead | kShareRead | kShareWrite, &object), TEE_SUCCESS);
  EXPECT_EQ(write_object("id", "fourth"), TEE_ERROR_ACCESS_CONFLICT);
  EXPECT_EQ(stored()["id"], "3rd");
}

struct ShareCase {
  const char *name;
  uint32_t first, second;
  bool passes;
};

const ShareCase kShares[] = {
    {"ReadersThatShare", kRead | kShareRead, kRead | kShareRead, true},
    {"SecondReaderDoesNotShare", kRead | kShareRead, kRead, false},
    {"FirstReaderDoesNotShare", kRead, kRead | kShareRead, false},
    {"WriterAmongReaders", kRead | kShareRead, kWrite | kShareRead, false},
    {"AllShareAll", kRead | kShareRead | kShareWrite, kWrite | kShareRead | kShareWrite, true},
    {"MetaIsNeverShared", kRead | kShareRead, kMeta | kShareRead, false},
    {"NothingBesideMeta", kMeta | kShareRead | kShareWrite, kRead | kShareRead, false},
};

TEST_P(Persistent, HandlesShareOnlyWhatAllOfThemAllow) {
  write_object("id", "data");
  for (const ShareCase &c : kShares) {
    SCOPED_TRACE(c.name);
    TEE_ObjectHandle second;
    ASSERT_EQ(open_object("id", c.first, &object), TEE_SUCCESS);
    EXPECT_EQ(open_object("id", c.second, &second),
              c.passes ? TEE_SUCCESS : TEE_ERROR_ACCESS_CONFLICT);
    TEE_CloseObject(object);
    TEE_CloseObject(second);
  }
}

TEST_P(Persistent, AfterAPowerCutStorageHoldsWhatWasBefore) {
  write_object("a", "a");
  write_object("b", "b");
  EXPECT_EQ(device->durable_writes(), 2u);
  device->fail({}, Fault::kPowerCut, 2);
  write_object("a", "A");
  write_object("b", "B");  // cut here
  ASSERT_EQ(open_object("a", kMeta, &object), TEE_SUCCESS);
  EXPECT_EQ(TEE_CloseAndDeletePersistentObject1(object), TEE_SUCCESS);
  EXPECT_TRUE(device->fault_report().fired);
  EXPECT_EQ(stored(), (ObjectMap{{"b", "B"}}));
  EXPECT_EQ(open_object("a", kRead, &object), TEE_ERROR_ITEM_NOT_FOUND);

  device->restore_power();
  EXPECT_EQ(stored(), (ObjectMap{{"a", "A"}, {"b", "b"}}));
  EXPECT_EQ(write_object("c", "C"), TEE_SUCCESS);
  reopen();
  EXPECT_EQ(stored()["c"], "C");
}

TEST(PersistentDeathTest, MisuseOfAHandlePanics) {
  Device device;
  const InsideTa ta(device);
  write_object("id", "data");
  TEE_ObjectHandle object;
  ASSERT_EQ(open_object("id", kRead, &object), TEE_SUCCESS);
  EXPECT_DEATH(TEE_WriteObjectData(object, "x", 1), "lacks the access right");
  EXPECT_DEATH(TEE_CloseAndDeletePersistentObject1(object), "lacks the access right");
  TEE_CloseObject(object);
  EXPECT_DEATH(read_on(object, 4), "TEE panic");
  EXPECT_DEATH(open_object(std::string(65, 'x'), kRead, &object), "longer than 64");
  EXPECT_DEATH(open_object("id", kWrite | TEE_DATA_FLAG_OVERWRITE, &object), "flags");
}

}  // namespace
