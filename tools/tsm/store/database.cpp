// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/store/database.h"

#include <fcntl.h>
#include <soci/postgresql/soci-postgresql.h>
#include <soci/sqlite3/soci-sqlite3.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>

#include "common/error_line.h"
#include "tsm/store/connection.h"
#include "tsm/store/schema.h"

namespace tsm {
namespace {

using tools::UsageError;

constexpr std::string_view kSqlite = "sqlite:";
constexpr std::string_view kPostgresql = "postgresql://";
constexpr long kSchemaLock = 0x4F545250;  // any number, the same for all servers

/// Only its owner is to read who the devices are.
void make_private(const std::string &file) {
  const int fd = ::open(file.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
  if (fd < 0) throw UsageError("cannot open the store " + file + ": " + strerror(errno));
  close(fd);
}

std::string one_line(std::string text) {
  std::ranges::replace(text, '\n', ' ');
  return text.substr(0, text.find_last_not_of(" \t") + 1);
}

}  // namespace

Database::Database(const std::string &uri) : is_sqlite_(uri.starts_with(kSqlite)) {
  location_ = is_sqlite_ ? uri.substr(kSqlite.size()) : uri;
  const bool is_known = is_sqlite_ || uri.starts_with(kPostgresql);
  if (!is_known || location_.empty() || location_.find('"') != location_.npos) {
    throw UsageError("bad store \"" + uri + "\": expected sqlite:FILE or postgresql://...");
  }
  if (is_sqlite_) make_private(location_);
  try {
    make_tables();
  } catch (const soci::soci_error &error) {
    fail(error.what());
  }
}

Database::~Database() = default;

void Database::open(soci::session *session) const {
  if (!is_sqlite_) {
    session->open(soci::postgresql, location_);
    *session << "SET client_min_messages = warning";  // the library prints notices
    return;
  }
  session->open(soci::sqlite3, "dbname=\"" + location_ + "\" timeout=30");
  *session << "PRAGMA journal_mode = WAL";
  // What a device was told must be known after a power cut: it may have done it.
  *session << "PRAGMA synchronous = FULL";
}

void Database::make_tables() {
  soci::session session;
  open(&session);
  if (is_sqlite_) {
    session << "BEGIN IMMEDIATE";
  } else {
    session.begin();
    session << "SELECT pg_advisory_xact_lock(" << kSchemaLock << ")";
  }
  session << kFormatTable;
  int format = kSchemaFormat;
  session << "INSERT INTO store_format (only_one, format) VALUES (1, :format) "
             "ON CONFLICT (only_one) DO NOTHING",
      soci::use(format, "format");
  session << "SELECT format FROM store_format", soci::into(format);
  if (format != kSchemaFormat) {
    throw UsageError("the store is of format " + std::to_string(format) +
                     ", of another version of this program: expected format " +
                     std::to_string(kSchemaFormat) +
                     ", or a new store, in which the devices are enrolled anew");
  }
  for (const char *statement : kSchema) session << statement;
  session << kEventsTable << (is_sqlite_ ? kInOrderOfKey : "");
  session << "COMMIT";
}

std::unique_ptr<Connection> Database::take() {
  {
    const std::lock_guard guard(lock_);
    if (!idle_.empty()) {
      std::unique_ptr<Connection> connection = std::move(idle_.back());
      idle_.pop_back();
      return connection;
    }
  }
  auto connection = std::make_unique<Connection>();
  open(&connection->sql);
  connection->prepare();
  return connection;
}

void Database::give_back(std::unique_ptr<Connection> connection) {
  const std::lock_guard guard(lock_);
  idle_.push_back(std::move(connection));
}

void Database::fail(const std::string &why) {
  const std::lock_guard guard(lock_);
  idle_.clear();
  throw StoreError("the store failed: " + one_line(why));
}

}  // namespace tsm
