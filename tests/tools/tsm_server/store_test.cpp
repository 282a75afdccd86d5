// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/store/store.h"

#include <gtest/gtest.h>

#include <thread>

#include "common/error_line.h"
#include "tsm_server/fresh_store.h"

namespace tsm {
namespace {

TEST(Store, TheSlowerOfTwoServersWritesNothing) {
  const otrp_test::FreshStore fresh;
  Store one(fresh.uri()), other(fresh.uri());
  one.enrol({{"d1", "key"}}, "g");
  StoredDevice first = one.find_device("d1").value();
  StoredDevice second = other.find_device("d1").value();
  first.state = "{\"quote\":\"'\",\"slash\":\"\\\\\",\"colon\":\":state\"}";
  first.seen = 1LL << 40;
  second.state = "another";
  EXPECT_TRUE(one.save(first, {.message = "first"}));
  EXPECT_FALSE(other.save(second, {.message = "second"}));
  const StoredDevice now = other.find_device("d1").value();
  EXPECT_EQ(std::tuple(now.version, now.state, now.seen), std::tuple(1, first.state, first.seen));
  ASSERT_EQ(one.events_of("d1").size(), 1u);
  EXPECT_EQ(one.events_of("d1")[0].message, "first");
}

TEST(Store, WritesRowAndEventOrNeither) {
  const otrp_test::FreshStore fresh;
  Store store(fresh.uri());
  store.enrol({{"d1", "key"}}, "g");
  const StoredDevice device = store.find_device("d1").value();
  fresh.execute("ALTER TABLE events RENAME TO elsewhere");
  EXPECT_THROW(store.save(device, {.message = "m"}), StoreError);
  fresh.execute("ALTER TABLE elsewhere RENAME TO events");
  EXPECT_EQ(store.find_device("d1").value().version, device.version);
}

TEST(Store, NothingIsLostWhereManyWriteAtOnce) {
  const otrp_test::FreshStore fresh;
  Store stores[] = {Store(fresh.uri()), Store(fresh.uri())};
  stores[0].enrol({{"d1", "key"}}, "g");
  const auto count_up = [](Store *store) {
    for (int i = 0; i < 15;) {
      StoredDevice device = store->find_device("d1").value();
      device.seen += 1;
      if (store->save(device, {.message = "m"})) ++i;
    }
  };
  {
    std::vector<std::jthread> threads;
    for (int i = 0; i < 4; ++i) threads.emplace_back(count_up, &stores[i % 2]);
  }
  const StoredDevice device = stores[0].find_device("d1").value();
  EXPECT_EQ(std::pair(device.version, device.seen), std::pair(int64_t{60}, int64_t{60}));
  const std::vector<Event> events = stores[0].events_of("d1");
  ASSERT_EQ(events.size(), kNumKeptEvents);
  EXPECT_EQ(std::pair(events.front().number, events.back().number),
            std::pair(int64_t{60}, int64_t{11}));
}

TEST(Store, DevicesAreEnrolledTogetherOrNotAtAll) {
  const otrp_test::FreshStore fresh;
  Store store(fresh.uri());
  store.enrol({{"d1", "key1"}, {"d2", "key2"}}, "g");
  EXPECT_THROW(store.enrol({{"d3", "key3"}, {"d1", "stranger"}}, "h"), tools::UsageError);
  EXPECT_FALSE(store.find_device("d3"));
  EXPECT_EQ(store.find_device("d1").value().group, "g");
  store.enrol({{"d1", "key1"}}, "h");
  EXPECT_EQ(store.find_device("d1").value().group, "h");
}

TEST(Store, APlanIsTheGroupsAndItsImagesAreWhole) {
  const otrp_test::FreshStore fresh;
  Store store(fresh.uri()), other(fresh.uri());
  store.enrol({{"d1", "key"}}, "g");
  EXPECT_EQ(store.find_device("d1").value().plan, "");
  const std::string image("im\0ge\xFF", 6);
  store.assign({"p1", "one", {{"i1", image}}}, "g");
  store.assign({"p2", "two", {{"i1", image}}}, "g");
  EXPECT_EQ(other.find_device("d1").value().plan, "p2");
  EXPECT_EQ(other.find_plan_document("p1"), "one");
  EXPECT_EQ(other.find_image("i1"), image);
  EXPECT_EQ(other.find_image("i2"), std::nullopt);
}

TEST(Store, FindsDevicesPageByPageAndByWhereTheyStand) {
  const otrp_test::FreshStore fresh;
  Store store(fresh.uri());
  store.assign({"p1", "one", {}}, "g");
  store.enrol({{"b%1", "key"}, {"B_2", "key"}, {"c'3", "key"}, {"a0", "key"}}, "g");
  store.enrol({{"z", "key"}}, "B-side");
  const auto stand = [&](const char *id, const char *outcome, const char *plan) {
    StoredDevice device = store.find_device(id).value();
    device.outcome = outcome;
    device.outcome_plan = plan;
    device.reason = id;
    device.deadline = 100;
    ASSERT_TRUE(store.save(device, {}));
  };
  stand("a0", "current", "p1");
  stand("b%1", "current", "p0");
  stand("c'3", "refused", "p1");
  const auto found = [&](const DeviceQuery &query) {
    std::string text;
    for (const ListedDevice &device : store.list_devices(query)) {
      text += device.device_id + ":" + name_of(device.standing) + " ";
      EXPECT_EQ(store.find_device(device.device_id).value().standing, device.standing);
    }
    return text;
  };
  EXPECT_EQ(store.list_devices({}).size(), 5u);
  const std::string first = store.list_devices({.max_devices = 2}).back().device_id;
  EXPECT_EQ(store.list_devices({.after = first}).size(), 3u);
  EXPECT_EQ(found({.text = "%"}), "b%1:behind ");
  EXPECT_EQ(found({.text = "b_"}), "B_2:unseen ");
  EXPECT_EQ(found({.text = "side"}), "z:unplanned ");
  EXPECT_EQ(found({.text = "'", .standing = Standing::kRefused}), "c'3:refused ");
  EXPECT_EQ(found({.text = "g", .standing = Standing::kCurrent}), "a0:current ");
  EXPECT_EQ(store.count_devices(), (StandingCounts{1, 1, 1, 1, 1}));
  EXPECT_EQ(std::pair(store.count_open(99), store.count_open(100)), std::pair(3ul, 0ul));
}

TEST(Store, DevicesMoveAndGoWithAllThatIsKnownOfThem) {
  const otrp_test::FreshStore fresh;
  Store store(fresh.uri());
  store.enrol({{"d1", "key"}, {"d2", "key"}}, "g");
  ASSERT_TRUE(store.save(store.find_device("d1").value(), {.message = "m"}));
  EXPECT_TRUE(store.move("d1", "h"));
  EXPECT_EQ(store.find_device("d1").value().group, "h");
  EXPECT_FALSE(store.move("d3", "h"));
  const StoredDevice read_before = store.find_device("d1").value();
  EXPECT_THROW(store.remove({"d1", "d3"}), tools::UsageError);
  EXPECT_TRUE(store.find_device("d1"));
  store.remove({"d1"});
  EXPECT_FALSE(store.find_device("d1"));
  EXPECT_FALSE(store.save(read_before, {}));
  EXPECT_EQ(store.events_of("d1").size(), 0u);
  EXPECT_TRUE(store.find_device("d2"));
}

TEST(Store, HistoryIsOneRowAMinuteOfTheLastWeek) {
  const otrp_test::FreshStore fresh;
  Store store(fresh.uri()), other(fresh.uri());
  store.keep_history(6000);
  store.enrol({{"d1", "key"}}, "g");
  other.keep_history(6059);
  other.keep_history(6060);
  const std::vector<HistoryEntry> entries = store.history_since(6000);
  ASSERT_EQ(entries.size(), 2u);
  EXPECT_EQ(
      std::tuple(entries[0].time, entries[0].counts[4], entries[1].time, entries[1].counts[4]),
      std::tuple(6000, 0u, 6060, 1u));
  store.keep_history(6060 + kHistoryTime);
  EXPECT_EQ(store.history_since(0).size(), 2u);
}

TEST(Store, OfAnotherVersionIsLeftAsItIs) {
  const otrp_test::FreshStore fresh;
  fresh.execute(
      "CREATE TABLE store_format (only_one INTEGER PRIMARY KEY, format INTEGER NOT NULL)");
  fresh.execute("INSERT INTO store_format VALUES (1, 1)");
  EXPECT_THROW(Store{fresh.uri()}, tools::UsageError);
  EXPECT_THROW(fresh.execute("SELECT * FROM devices"), soci::soci_error);
}

TEST(Store, ComesBackWithItsDatabase) {
  const otrp_test::FreshStore fresh;
  if (!fresh.is_shared()) GTEST_SKIP() << "SQLite has no server";
  Store store(fresh.uri());
  store.enrol({{"d1", "key"}}, "g");
  fresh.end_connections();
  EXPECT_THROW(store.find_device("d1"), StoreError);
  EXPECT_TRUE(store.find_device("d1"));
}

TEST(Store, IsNoFileByAnotherName) {
  for (const char *uri : {"", "fleet.db", "sqlite:", "mysql://h/d", "postgresql:", "sqlite:a\"b",
                          "sqlite:/no/such/folder/fleet.db"}) {
    EXPECT_THROW(Store{uri}, tools::UsageError) << uri;
  }
}

}  // namespace
}  // namespace tsm
