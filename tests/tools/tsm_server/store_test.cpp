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

TEST(Store, CountsDevicesAndWhatTheyOwe) {
  const otrp_test::FreshStore fresh;
  Store store(fresh.uri());
  store.enrol({{"d1", "key"}, {"d2", "key"}, {"d3", "key"}}, "g");
  store.assign({"p1", "one", {}}, "g");
  StoredDevice device = store.find_device("d1").value();
  device.outcome = "current";
  device.outcome_plan = "p1";
  device.deadline = 100;
  ASSERT_TRUE(store.save(device, {}));
  EXPECT_EQ(store.count_open(99), 1u);
  EXPECT_EQ(store.count_open(100), 0u);
  std::map<std::string, uint64_t> counts;
  for (const DeviceCount &count : store.count_devices()) {
    EXPECT_EQ(count.plan, "p1");
    counts[count.outcome + "/" + count.outcome_plan] = count.num_devices;
  }
  EXPECT_EQ(counts, (std::map<std::string, uint64_t>{{"/", 2}, {"current/p1", 1}}));
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
