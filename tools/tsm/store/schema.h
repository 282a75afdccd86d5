// SPDX-License-Identifier: BSD-2-Clause
/// The tables, in the SQL that both databases know.
#ifndef TSM_STORE_SCHEMA_H
#define TSM_STORE_SCHEMA_H

namespace tsm {

constexpr int kSchemaFormat = 3;

constexpr char kFormatTable[] =
    "CREATE TABLE IF NOT EXISTS store_format ("
    "  only_one INTEGER PRIMARY KEY,"
    "  format INTEGER NOT NULL)";

constexpr const char *kSchema[] = {
    "CREATE TABLE IF NOT EXISTS plans ("
    "  digest TEXT PRIMARY KEY,"
    "  document TEXT NOT NULL)",

    "CREATE TABLE IF NOT EXISTS images ("
    "  digest TEXT PRIMARY KEY,"
    "  base64 TEXT NOT NULL)",

    "CREATE TABLE IF NOT EXISTS device_groups ("
    "  name TEXT PRIMARY KEY,"
    "  plan TEXT NOT NULL)",

    // What is long comes last: SQLite reads a row from its beginning, and no further than it must.
    "CREATE TABLE IF NOT EXISTS devices ("
    "  device_id TEXT PRIMARY KEY,"
    "  tee_key TEXT NOT NULL,"
    "  device_group TEXT NOT NULL,"
    "  version BIGINT NOT NULL DEFAULT 0,"
    "  outcome TEXT NOT NULL DEFAULT '',"
    "  outcome_plan TEXT NOT NULL DEFAULT '',"
    "  seen BIGINT NOT NULL DEFAULT 0,"
    "  deadline BIGINT NOT NULL DEFAULT 0,"
    "  waits INTEGER NOT NULL DEFAULT 0,"  // 1 with a deadline
    "  open_message TEXT NOT NULL DEFAULT '',"
    "  open_request TEXT NOT NULL DEFAULT '',"
    "  reason TEXT NOT NULL DEFAULT '',"
    "  progress TEXT NOT NULL DEFAULT '',"
    "  state TEXT NOT NULL DEFAULT '')",

    // For counting and looking through all: neither reads a row of a device, but of those whose
    // message waits. There is one such index, and in it nothing that changes with each exchange,
    // which would have to write it.
    "CREATE INDEX IF NOT EXISTS devices_at_a_glance"
    "  ON devices (device_id, device_group, outcome, outcome_plan, waits)",

    "CREATE TABLE IF NOT EXISTS history ("
    "  time BIGINT PRIMARY KEY,"
    "  num_current BIGINT NOT NULL,"
    "  num_behind BIGINT NOT NULL,"
    "  num_refused BIGINT NOT NULL,"
    "  num_unseen BIGINT NOT NULL,"
    "  num_unplanned BIGINT NOT NULL)",
};

/// Rows stand in the order of their key, with which an event is one page to write, and not two.
/// Only SQLite is told: PostgreSQL has no such tables. A table that was made otherwise stays as it
/// is.
constexpr char kEventsTable[] =
    "CREATE TABLE IF NOT EXISTS events ("
    "  device_id TEXT NOT NULL,"
    "  number BIGINT NOT NULL,"
    "  time BIGINT NOT NULL,"
    "  message TEXT NOT NULL,"
    "  outcome TEXT NOT NULL,"
    "  reason TEXT NOT NULL,"
    "  next_message TEXT NOT NULL,"
    "  PRIMARY KEY (device_id, number))";
constexpr char kInOrderOfKey[] = " WITHOUT ROWID";

/// Where a device `d` of a group `g`, which may have no row, stands: an index of kStandings.
#define TSM_SQL_STANDING                        \
  "CASE WHEN COALESCE(g.plan, '') = '' THEN 4 " \
  "WHEN d.outcome = '' THEN 3 "                 \
  "WHEN d.outcome_plan <> g.plan THEN 1 "       \
  "WHEN d.outcome = 'current' THEN 0 "          \
  "WHEN d.outcome = 'refused' THEN 2 ELSE 1 END"

}  // namespace tsm

#endif
