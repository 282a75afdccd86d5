// SPDX-License-Identifier: BSD-2-Clause
// What the store says of many devices at once.
#include <algorithm>

#include "tsm/store/connection.h"
#include "tsm/store/database.h"
#include "tsm/store/schema.h"
#include "tsm/store/store.h"

namespace tsm {
namespace {

using soci::into;
using soci::use;

/// A pattern of LIKE that finds `text` anywhere.
std::string pattern_for(const std::string &text) {
  std::string pattern = "%";
  for (const char c : text) {
    if (c == '%' || c == '_' || c == '!') pattern += '!';
    pattern += c;
  }
  return pattern + "%";
}

/// The IDs come from the index alone; then only the rows that are shown are read.
std::string list_statement(const DeviceQuery &query) {
  std::string conditions;
  if (!query.text.empty()) {
    conditions =
        " AND (LOWER(d.device_id) LIKE LOWER(:text) ESCAPE '!'"
        " OR LOWER(d.device_group) LIKE LOWER(:text) ESCAPE '!')";
  }
  if (query.standing) conditions += " AND " TSM_SQL_STANDING " = :standing";
  return "SELECT d.device_id, d.device_group, " TSM_SQL_STANDING
         ", d.reason, d.seen FROM (SELECT d.device_id AS device_id FROM devices d"
         " LEFT JOIN device_groups g ON g.name = d.device_group"
         " WHERE d.device_id > :after" +
         conditions + " ORDER BY d.device_id LIMIT " + std::to_string(query.max_devices) +
         ") found CROSS JOIN devices d LEFT JOIN device_groups g ON g.name = d.device_group"
         " WHERE d.device_id = found.device_id ORDER BY d.device_id";
}

StandingCounts counts_of(const std::array<long long, kStandings.size()> &numbers) {
  StandingCounts counts;
  std::ranges::copy(numbers, counts.begin());
  return counts;
}

}  // namespace

std::map<std::string, std::string> Store::group_plans() {
  return database_->with([&](Connection &connection) {
    std::map<std::string, std::string> plans;
    std::string name, plan;
    soci::statement query =
        (connection.sql.prepare << "SELECT name, plan FROM device_groups", into(name), into(plan));
    query.execute();
    while (query.fetch()) plans[name] = plan;
    return plans;
  });
}

std::vector<ListedDevice> Store::list_devices(const DeviceQuery &query) {
  return database_->with([&](Connection &connection) {
    std::vector<ListedDevice> devices;
    ListedDevice device;
    const std::string pattern = pattern_for(query.text);
    int wanted = query.standing ? static_cast<int>(*query.standing) : 0;
    int standing = 0;
    long long seen = 0;
    soci::statement statement(connection.sql);
    statement.exchange(use(query.after, "after"));
    if (!query.text.empty()) statement.exchange(use(pattern, "text"));
    if (query.standing) statement.exchange(use(wanted, "standing"));
    statement.exchange(into(device.device_id));
    statement.exchange(into(device.group));
    statement.exchange(into(standing));
    statement.exchange(into(device.reason));
    statement.exchange(into(seen));
    statement.alloc();
    statement.prepare(list_statement(query));
    statement.define_and_bind();
    statement.execute();
    while (statement.fetch()) {
      device.standing = static_cast<Standing>(standing);
      device.seen = seen;
      devices.push_back(device);
    }
    return devices;
  });
}

StandingCounts Store::count_devices() {
  return database_->with([&](Connection &connection) {
    StandingCounts counts = {};
    int standing = 0;
    long long num = 0;
    soci::statement query =
        (connection.sql.prepare << "SELECT " TSM_SQL_STANDING
                                   " AS standing, COUNT(*)"
                                   " FROM devices d LEFT JOIN device_groups g"
                                   " ON g.name = d.device_group GROUP BY standing",
         into(standing), into(num));
    query.execute();
    while (query.fetch()) counts[static_cast<size_t>(standing)] = static_cast<uint64_t>(num);
    return counts;
  });
}

uint64_t Store::count_open(int64_t now) {
  return database_->with([&](Connection &connection) {
    long long num = 0;
    long long after = now;
    connection.sql << "SELECT COUNT(*) FROM devices WHERE deadline > :now AND device_id IN "
                      "(SELECT device_id FROM devices WHERE waits = 1)",
        use(after, "now"), into(num);
    return static_cast<uint64_t>(num);
  });
}

void Store::keep_history(int64_t now) {
  long long time = now - now % kHistoryStep;
  const bool is_kept = database_->with([&](Connection &connection) {
    int num = 0;
    connection.sql << "SELECT COUNT(*) FROM history WHERE time = :time", use(time, "time"),
        into(num);
    return num != 0;
  });
  if (is_kept) return;
  const StandingCounts counts = count_devices();
  const auto turn = database_->writers_turn();
  database_->with([&](Connection &connection) {
    std::array<long long, kStandings.size()> n = {};
    std::ranges::copy(counts, n.begin());
    long long first = now - kHistoryTime;
    soci::transaction transaction(connection.sql);
    connection.sql << "INSERT INTO history (time, num_current, num_behind, num_refused, num_unseen,"
                      " num_unplanned) VALUES (:time, :n0, :n1, :n2, :n3, :n4)"
                      " ON CONFLICT (time) DO NOTHING",
        use(time, "time"), use(n[0], "n0"), use(n[1], "n1"), use(n[2], "n2"), use(n[3], "n3"),
        use(n[4], "n4");
    connection.sql << "DELETE FROM history WHERE time < :first", use(first, "first");
    transaction.commit();
    return true;
  });
}

std::vector<HistoryEntry> Store::history_since(int64_t time) {
  return database_->with(
      [&](Connection &connection) {
        std::vector<HistoryEntry> entries;
        std::array<long long, kStandings.size()> n = {};
        long long first = time;
        long long at = 0;
        soci::statement query =
            (connection.sql.prepare
                 << "SELECT time, num_current, num_behind, num_refused, num_unseen, num_unplanned"
                    " FROM history WHERE time >= :first ORDER BY time",
             use(first, "first"), into(at), into(n[0]), into(n[1]), into(n[2]), into(n[3]),
             into(n[4]));
        query.execute();
        while (query.fetch()) entries.push_back({at, counts_of(n)});
        return entries;
      });
}

}  // namespace tsm
