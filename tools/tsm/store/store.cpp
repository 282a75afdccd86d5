// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/store/store.h"

#include "common/encoding.h"
#include "common/error_line.h"
#include "tsm/store/connection.h"
#include "tsm/store/database.h"

namespace tsm {
namespace {

using soci::into;
using soci::use;

/// The text that a query gives, if it gives one.
std::optional<std::string> find_text(Database *database, const char *query,
                                     const std::string &key) {
  return database->with([&](Connection &connection) -> std::optional<std::string> {
    std::string text;
    connection.sql << query, use(key, "key"), into(text);
    if (!connection.sql.got_data()) return std::nullopt;
    return text;
  });
}

/// Inside a transaction, one device after the other.
class Enrolment {
 public:
  Enrolment(soci::session &sql, const std::string &group)
      : insert_((sql.prepare << "INSERT INTO devices (device_id, tee_key, device_group) "
                                "VALUES (:id, :key, :device_group) "
                                "ON CONFLICT (device_id) DO NOTHING",
                 use(device_.device_id, "id"), use(device_.key, "key"),
                 use(group, "device_group"))),
        update_((sql.prepare << "UPDATE devices SET device_group = :device_group "
                                "WHERE device_id = :id AND tee_key = :key",
                 use(group, "device_group"), use(device_.device_id, "id"),
                 use(device_.key, "key"))) {}
  Enrolment(const Enrolment &) = delete;
  Enrolment &operator=(const Enrolment &) = delete;

  void add(const EnrolledDevice &device) {
    device_ = device;
    insert_.execute(true);
    if (insert_.get_affected_rows() == 1) return;
    update_.execute(true);
    if (update_.get_affected_rows() == 1) return;
    throw tools::UsageError("device \"" + device.device_id + "\" is enrolled with another key");
  }

 private:
  EnrolledDevice device_;  // the statements are bound to it
  soci::statement insert_;
  soci::statement update_;
};

}  // namespace

Store::Store(const std::string &uri) : database_(std::make_unique<Database>(uri)) {}
Store::~Store() = default;

std::optional<StoredDevice> Store::find_device(const std::string &device_id) {
  return database_->with([&](Connection &connection) {
    StoredDevice device;
    return connection.find(device_id, &device) ? std::optional(std::move(device)) : std::nullopt;
  });
}

bool Store::save(const StoredDevice &device, Event event) {
  event.device_id = device.device_id;
  event.number = device.version + 1;
  const auto turn = database_->writers_turn();
  return database_->with([&](Connection &connection) {
    Connection::Transaction transaction(&connection);
    if (!connection.update(device)) return false;  // rolled back
    connection.insert(event);
    const int64_t last_number = event.number - int64_t{kNumKeptEvents};
    if (last_number > 0) connection.prune_events(device.device_id, last_number);
    transaction.commit();
    return true;
  });
}

std::vector<Event> Store::events_of(const std::string &device_id) {
  return database_->with([&](Connection &connection) {
    std::vector<Event> events;
    Event event = {.device_id = device_id};
    long long number = 0;
    long long time = 0;
    soci::statement query =
        (connection.sql.prepare << "SELECT number, time, message, outcome, reason, next_message "
                                   "FROM events WHERE device_id = :id ORDER BY number DESC",
         use(device_id, "id"), into(number), into(time), into(event.message), into(event.outcome),
         into(event.reason), into(event.next));
    query.execute();
    while (query.fetch()) {
      event.number = number;
      event.time = time;
      events.push_back(event);
    }
    return events;
  });
}

void Store::enrol(const std::vector<EnrolledDevice> &devices, const std::string &group) {
  const auto turn = database_->writers_turn();
  database_->with([&](Connection &connection) {
    soci::transaction transaction(connection.sql);
    Enrolment enrolment(connection.sql, group);
    for (const EnrolledDevice &device : devices) enrolment.add(device);
    transaction.commit();
    return true;
  });
}

bool Store::move(const std::string &device_id, const std::string &group) {
  const auto turn = database_->writers_turn();
  return database_->with([&](Connection &connection) {
    soci::statement update = (connection.sql.prepare << "UPDATE devices SET device_group = :name "
                                                        "WHERE device_id = :id",
                              use(group, "name"), use(device_id, "id"));
    update.execute(true);
    return update.get_affected_rows() == 1;
  });
}

void Store::remove(const std::vector<std::string> &device_ids) {
  const auto turn = database_->writers_turn();
  database_->with([&](Connection &connection) {
    soci::transaction transaction(connection.sql);
    std::string id;
    soci::statement remove =
        (connection.sql.prepare << "DELETE FROM devices WHERE device_id = :id", use(id, "id"));
    soci::statement remove_events =
        (connection.sql.prepare << "DELETE FROM events WHERE device_id = :id", use(id, "id"));
    for (const std::string &device_id : device_ids) {
      id = device_id;
      remove.execute(true);
      if (remove.get_affected_rows() != 1) {
        throw tools::UsageError("no device \"" + device_id + "\" is enrolled");
      }
      remove_events.execute(true);
    }
    transaction.commit();
    return true;
  });
}

void Store::assign(const StoredPlan &plan, const std::string &group) {
  const auto turn = database_->writers_turn();
  database_->with([&](Connection &connection) {
    soci::session &sql = connection.sql;
    soci::transaction transaction(sql);
    for (const auto &[digest, bytes] : plan.images) {
      const std::string base64 = tools::base64_encode(bytes);
      sql << "INSERT INTO images (digest, base64) VALUES (:digest, :base64) "
             "ON CONFLICT (digest) DO NOTHING",
          use(digest, "digest"), use(base64, "base64");
    }
    sql << "INSERT INTO plans (digest, document) VALUES (:digest, :document) "
           "ON CONFLICT (digest) DO NOTHING",
        use(plan.digest, "digest"), use(plan.document, "document");
    sql << "INSERT INTO device_groups (name, plan) VALUES (:name, :plan) "
           "ON CONFLICT (name) DO UPDATE SET plan = excluded.plan",
        use(group, "name"), use(plan.digest, "plan");
    transaction.commit();
    return true;
  });
}

std::optional<std::string> Store::find_plan_document(const std::string &digest) {
  return find_text(database_.get(), "SELECT document FROM plans WHERE digest = :key", digest);
}

std::optional<std::string> Store::find_image(const std::string &digest) {
  const std::optional<std::string> base64 =
      find_text(database_.get(), "SELECT base64 FROM images WHERE digest = :key", digest);
  return base64 ? tools::base64_decode(*base64) : std::nullopt;
}

void Store::ping() {
  database_->with([](Connection &connection) {
    int one = 0;
    connection.sql << "SELECT 1", into(one);
    return one;
  });
}

}  // namespace tsm
