// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/store/connection.h"

#include "tsm/store/schema.h"

namespace tsm {

using soci::into;
using soci::use;

void Connection::prepare() {
  StoredDevice &d = device_;
  begin_ = std::make_unique<soci::statement>((sql.prepare << "BEGIN"));
  commit_ = std::make_unique<soci::statement>((sql.prepare << "COMMIT"));
  find_ = std::make_unique<soci::statement>(
      (sql.prepare << "SELECT d.tee_key, d.device_group, COALESCE(g.plan, ''), " TSM_SQL_STANDING
                      ", d.version, d.state, "
                      "d.progress, d.outcome, d.outcome_plan, d.reason, d.seen, d.open_message, "
                      "d.open_request, d.deadline FROM devices d "
                      "LEFT JOIN device_groups g ON g.name = d.device_group "
                      "WHERE d.device_id = :device_id",
       use(d.device_id, "device_id"), into(d.key), into(d.group), into(d.plan), into(standing_),
       into(version_), into(d.state), into(d.progress), into(d.outcome), into(d.outcome_plan),
       into(d.reason), into(seen_), into(d.open_message), into(d.open_request), into(deadline_)));
  // An index that a statement names a column of is written by SQLite, changed or not. In the midst
  // of a session it does not change.
  if (sql.get_backend_name() == "sqlite3") {
    update_in_place_ = std::make_unique<soci::statement>(
        (sql.prepare << "UPDATE devices SET version = version + 1, state = :state, "
                        "progress = :progress, reason = :reason, seen = :seen, "
                        "open_message = :open_message, open_request = :open_request, "
                        "deadline = :deadline WHERE device_id = :device_id AND "
                        "version = :version AND outcome = :outcome AND "
                        "outcome_plan = :outcome_plan AND waits = :waits",
         use(d.state, "state"), use(d.progress, "progress"), use(d.reason, "reason"),
         use(seen_, "seen"), use(d.open_message, "open_message"),
         use(d.open_request, "open_request"), use(deadline_, "deadline"),
         use(d.device_id, "device_id"), use(version_, "version"), use(d.outcome, "outcome"),
         use(d.outcome_plan, "outcome_plan"), use(waits_, "waits")));
  }
  update_ = std::make_unique<soci::statement>(
      (sql.prepare << "UPDATE devices SET version = version + 1, state = :state, "
                      "progress = :progress, outcome = :outcome, outcome_plan = :outcome_plan, "
                      "reason = :reason, seen = :seen, open_message = :open_message, "
                      "open_request = :open_request, deadline = :deadline, "
                      "waits = :waits WHERE device_id = :device_id AND version = :version",
       use(d.state, "state"), use(d.progress, "progress"), use(d.outcome, "outcome"),
       use(d.outcome_plan, "outcome_plan"), use(d.reason, "reason"), use(seen_, "seen"),
       use(d.open_message, "open_message"), use(d.open_request, "open_request"),
       use(deadline_, "deadline"), use(waits_, "waits"), use(d.device_id, "device_id"),
       use(version_, "version")));
  insert_ = std::make_unique<soci::statement>(
      (sql.prepare << "INSERT INTO events (device_id, number, time, message, outcome, reason, "
                      "next_message) VALUES (:device_id, :number, :time, :message, :outcome, "
                      ":reason, :next_message)",
       use(event_.device_id, "device_id"), use(number_, "number"), use(time_, "time"),
       use(event_.message, "message"), use(event_.outcome, "outcome"), use(event_.reason, "reason"),
       use(event_.next, "next_message")));
  prune_ = std::make_unique<soci::statement>(
      (sql.prepare << "DELETE FROM events WHERE device_id = :device_id AND number <= :number",
       use(event_.device_id, "device_id"), use(number_, "number")));
}

Connection::Transaction::Transaction(Connection *connection) : connection_(connection) {
  connection_->begin_->execute(true);
}

Connection::Transaction::~Transaction() {
  if (connection_ == nullptr) return;
  try {
    connection_->sql.rollback();
  } catch (const soci::soci_error &) {
    // The connection is lost, and with it what was begun.
  }
}

void Connection::Transaction::commit() {
  connection_->commit_->execute(true);
  connection_ = nullptr;
}

bool Connection::find(const std::string &device_id, StoredDevice *device) {
  device_.device_id = device_id;
  if (!find_->execute(true)) return false;
  *device = std::move(device_);
  device->standing = static_cast<Standing>(standing_);
  device->version = version_;
  device->seen = seen_;
  device->deadline = deadline_;
  // To its end: a query that is left half way would hold its view of the database.
  while (find_->fetch()) {
  }
  return true;
}

bool Connection::update(const StoredDevice &device) {
  device_ = device;
  version_ = device.version;
  seen_ = device.seen;
  deadline_ = device.deadline;
  waits_ = device.deadline > 0 ? 1 : 0;
  if (update_in_place_) {
    update_in_place_->execute(true);
    if (update_in_place_->get_affected_rows() == 1) return true;
  }
  update_->execute(true);
  return update_->get_affected_rows() == 1;
}

void Connection::insert(const Event &event) {
  event_ = event;
  number_ = event.number;
  time_ = event.time;
  insert_->execute(true);
}

void Connection::prune_events(const std::string &device_id, int64_t last_number) {
  event_.device_id = device_id;
  number_ = last_number;
  prune_->execute(true);
}

}  // namespace tsm
