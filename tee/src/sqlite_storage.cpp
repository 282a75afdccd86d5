// SPDX-License-Identifier: BSD-2-Clause
#include "sqlite_storage.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "error.h"

namespace tee {

namespace {

constexpr char kSchema[] =
    "CREATE TABLE objects (ta BLOB NOT NULL, id BLOB NOT NULL, digest BLOB NOT NULL, "
    "data BLOB NOT NULL, PRIMARY KEY (ta, id)) WITHOUT ROWID";

// "TEEo" and the version of the schema.
constexpr char kStamp[] = "PRAGMA application_id = 1413825903; PRAGMA user_version = 1";
constexpr char kReadStamp[] =
    "SELECT application_id || '.' || user_version FROM pragma_application_id, pragma_user_version";
constexpr char kExpectedStamp[] = "1413825903.1";

constexpr off_t kPageLen = 4096;
constexpr char kSetPageLen[] = "PRAGMA page_size = 4096";

ByteView bytes_of(const std::string &text) {
  return {reinterpret_cast<const uint8_t *>(text.data()), text.size()};
}

// SQLite knows of one kind alone, and does not keep the error of its log.
bool is_lack_of_space(int error) {
  return error == ENOSPC || error == EDQUOT || error == EFBIG;
}

bool exists(const std::string &path) {
  return ::access(path.c_str(), F_OK) == 0;
}

void expect_owners_alone(const host::File &file, const std::string &path) {
  struct stat status;
  if (::fstat(file.get(), &status) != 0) throw system_error("cannot use " + path);
  if ((status.st_mode & (S_IWGRP | S_IWOTH)) == 0) return;
  throw Error{TEE_ERROR_ACCESS_DENIED, "database " + path + " can be written by others"};
}

off_t file_size(const std::string &path) {
  struct stat status;
  return ::stat(path.c_str(), &status) == 0 ? status.st_size : 0;
}

}  // namespace

// ---- One run of a prepared statement

class SqliteStorage::Run {
 public:
  Run(const SqliteStorage &storage, const Statement &statement)
      : storage_(storage), statement_(statement.get()) {}
  ~Run() {
    sqlite3_reset(statement_);
    sqlite3_clear_bindings(statement_);
  }

  /// Binds the next parameter; the bytes must outlive the run.
  Run &bind(ByteView bytes) {
    const void *data = bytes.empty() ? "" : static_cast<const void *>(bytes.data());
    const int result = sqlite3_bind_blob64(statement_, ++bound_, data, bytes.size(), SQLITE_STATIC);
    if (result != SQLITE_OK) storage_.fail(result);
    return *this;
  }

  /// True when there is a row.
  bool step() {
    const int result = sqlite3_step(statement_);
    if (result != SQLITE_ROW && result != SQLITE_DONE) storage_.fail(result);
    return result == SQLITE_ROW;
  }

  ByteView blob(int column) const {
    const void *data = sqlite3_column_blob(statement_, column);
    return {static_cast<const uint8_t *>(data),
            static_cast<size_t>(sqlite3_column_bytes(statement_, column))};
  }

  size_t number(int column) const {
    return static_cast<size_t>(sqlite3_column_int64(statement_, column));
  }

 private:
  const SqliteStorage &storage_;
  sqlite3_stmt *statement_;
  int bound_ = 0;
};

// Undone at its end, unless it was committed.
class SqliteStorage::Transaction {
 public:
  explicit Transaction(const SqliteStorage &storage) : storage_(storage) {
    Run(storage, storage.run_->begin).step();
  }
  ~Transaction() {
    // Some failures have undone it already.
    if (sqlite3_get_autocommit(storage_.db_.get())) return;
    sqlite3_step(storage_.run_->rollback.get());
    sqlite3_reset(storage_.run_->rollback.get());
  }
  Transaction(const Transaction &) = delete;
  Transaction &operator=(const Transaction &) = delete;

 private:
  const SqliteStorage &storage_;
};

// ---- Opening

SqliteStorage::SqliteStorage(StateDirectory directory)
    : directory_(std::move(directory)),
      path_(directory_.path() / "objects.db"),
      log_(path_ + "-wal"),
      acknowledged_(path_ + "-count"),
      hash_(EVP_MD_CTX_new()) {
  if (!hash_) throw std::bad_alloc();
  open_database();
  check_or_create();
  run_ = Statements{
      .load = prepare("SELECT data FROM objects WHERE ta = ? AND id = ?"),
      .save = prepare("INSERT OR REPLACE INTO objects (ta, id, digest, data) VALUES (?, ?, ?, ?)"),
      .remove = prepare("DELETE FROM objects WHERE ta = ? AND id = ?"),
      .list = prepare("SELECT id, length(data) FROM objects WHERE ta = ? ORDER BY id"),
      .begin = prepare("BEGIN IMMEDIATE"),
      .commit = prepare("COMMIT"),
      .rollback = prepare("ROLLBACK"),
  };
}

SqliteStorage::~SqliteStorage() {
  run_.reset();
  db_.reset();
  if (!exists(log_)) acknowledged_.remove();
}

// SQLite gives its logs the mode of the database, so only the database is created here. Two kinds
// of damage it would take for a new database, or mend in silence: a log whose database is gone,
// which it would throw away, and a file that ends inside a page.
void SqliteStorage::open_database() {
  const off_t len = file_size(path_);
  const off_t log_len = file_size(log_);
  if (len == 0 && log_len != 0) damaged("it is empty, its log is not");
  if (len % kPageLen != 0 && log_len == 0 && file_size(path_ + "-journal") == 0) {
    damaged("it is cut off");
  }
  const host::File file = host::open_or_create(path_.c_str());
  if (!file.valid() && errno == EISDIR) damaged("it is a directory");
  if (!file.valid()) throw system_error("cannot open " + path_);
  expect_owners_alone(file, path_);

  sqlite3 *db = nullptr;
  const int result =
      sqlite3_open_v2(path_.c_str(), &db, SQLITE_OPEN_READWRITE | SQLITE_OPEN_NOMUTEX, nullptr);
  db_.reset(db);
  if (result != SQLITE_OK) fail(result);
}

// Until the database has passed, nothing may write to it; closing would, with a log at hand.
void SqliteStorage::check_or_create() {
  try {
    sqlite3_db_config(db_.get(), SQLITE_DBCONFIG_NO_CKPT_ON_CLOSE, 1, nullptr);
    execute(
        "PRAGMA locking_mode = EXCLUSIVE; PRAGMA synchronous = FULL; "
        "PRAGMA cell_size_check = ON");
    if (is_blank()) {
      create_schema();
    } else {
      check();
    }
    check_count();
    execute("PRAGMA journal_mode = WAL");
    sqlite3_db_config(db_.get(), SQLITE_DBCONFIG_NO_CKPT_ON_CLOSE, 0, nullptr);
  } catch (...) {
    db_.reset();
    if (file_size(log_) == 0) ::unlink(log_.c_str());  // reading had created it
    throw;
  }
}

// A first start that was killed leaves an empty file, which SQLite rolls back to where it must.
bool SqliteStorage::is_blank() {
  return text_of("SELECT count(*) FROM sqlite_schema") == "0" && text_of(kReadStamp) == "0.0";
}

void SqliteStorage::create_schema() {
  execute(kSetPageLen);
  execute("BEGIN EXCLUSIVE");
  execute(kStamp);
  execute(kSchema);
  execute("COMMIT");
}

void SqliteStorage::check() {
  if (text_of(kReadStamp) != kExpectedStamp ||
      text_of("SELECT group_concat(sql) FROM sqlite_schema") != kSchema) {
    damaged("it is not an object database of this version");
  }
  if (text_of("PRAGMA quick_check(1)") != "ok") damaged("its structure is broken");
  check_digests();
}

void SqliteStorage::check_digests() {
  const Statement all = prepare("SELECT ta, id, digest, data FROM objects");
  Run run(*this, all);
  while (run.step()) {
    const Digest expected = digest(run.blob(0), run.blob(1), run.blob(3));
    if (!std::ranges::equal(run.blob(2), expected)) damaged("an object was changed");
  }
}

void SqliteStorage::check_count() {
  const Statement count = prepare("SELECT data FROM objects WHERE ta = x'' AND id = x''");
  Run run(*this, count);
  if (run.step()) {
    const ByteView bytes = run.blob(0);
    std::memcpy(&num_changes_, bytes.data(), std::min(bytes.size(), sizeof(num_changes_)));
  }
  if (const uint64_t acknowledged = acknowledged_.read(); acknowledged > num_changes_) {
    damaged("its log has lost " + std::to_string(acknowledged - num_changes_) +
            " changes that were acknowledged");
  }
}

void SqliteStorage::damaged(const std::string &how) const {
  throw Error{TEE_ERROR_CORRUPT_OBJECT, "database " + path_ + " is damaged: " + how};
}

// ---- Objects

std::optional<Bytes> SqliteStorage::load(const ObjectKey &key) {
  Run run(*this, run_->load);
  if (!run.bind(key.ta).bind(bytes_of(key.id)).step()) return std::nullopt;
  const ByteView data = run.blob(0);
  return Bytes(data.begin(), data.end());
}

void SqliteStorage::save(const ObjectKey &key, ByteView data) {
  change([&] {
    save_row(key.ta, bytes_of(key.id), data);
    return true;
  });
}

bool SqliteStorage::remove(const ObjectKey &key) {
  return change([&] {
    Run(*this, run_->remove).bind(key.ta).bind(bytes_of(key.id)).step();
    return sqlite3_changes(db_.get()) != 0;
  });
}

void SqliteStorage::save_row(ByteView ta, ByteView id, ByteView data) {
  const Digest sum = digest(ta, id, data);
  Run(*this, run_->save).bind(ta).bind(id).bind(sum).bind(data).step();
}

template <class Make>
bool SqliteStorage::change(Make &&make) {
  const Transaction transaction(*this);
  if (!make()) return false;
  const uint64_t count = num_changes_ + 1;
  const auto *bytes = reinterpret_cast<const uint8_t *>(&count);
  save_row({}, {}, {bytes, sizeof(count)});
  Run(*this, run_->commit).step();
  acknowledged_.write(num_changes_ = count);
  return true;
}

std::vector<ObjectListing> SqliteStorage::list(const UuidBytes &ta) {
  std::vector<ObjectListing> listing;
  Run run(*this, run_->list);
  run.bind(ta);
  while (run.step()) {
    const ByteView id = run.blob(0);
    listing.push_back({std::string(id.begin(), id.end()), run.number(1)});
  }
  return listing;
}

// ---- SQLite

SqliteStorage::Statement SqliteStorage::prepare(const char *sql) const {
  sqlite3_stmt *statement = nullptr;
  const int result =
      sqlite3_prepare_v3(db_.get(), sql, -1, SQLITE_PREPARE_PERSISTENT, &statement, nullptr);
  if (result != SQLITE_OK) fail(result);
  return Statement(statement);
}

void SqliteStorage::execute(const char *sql) const {
  const int result = sqlite3_exec(db_.get(), sql, nullptr, nullptr, nullptr);
  if (result != SQLITE_OK) fail(result);
}

std::string SqliteStorage::text_of(const char *sql) const {
  const Statement statement = prepare(sql);
  Run run(*this, statement);
  if (!run.step()) return {};
  const ByteView text = run.blob(0);
  return {text.begin(), text.end()};
}

void SqliteStorage::fail(int result) const {
  const int error = errno;
  const std::string text = sqlite3_errmsg(db_.get());
  switch (result & 0xFF) {
    case SQLITE_CORRUPT:
    case SQLITE_NOTADB:
    case SQLITE_FORMAT:
    case SQLITE_SCHEMA:
      damaged(text);
    case SQLITE_NOMEM:
      throw std::bad_alloc();
    case SQLITE_IOERR:
      if (!is_lack_of_space(error)) {
        throw Error{TEE_ERROR_STORAGE_NOT_AVAILABLE, path_ + ": " + text};
      }
      [[fallthrough]];
    case SQLITE_FULL:
      throw Error{TEE_ERROR_STORAGE_NO_SPACE, path_ + ": " + text};
    case SQLITE_BUSY:
    case SQLITE_LOCKED:
      throw Error{TEE_ERROR_BUSY, path_ + ": " + text};
    case SQLITE_CANTOPEN:
    case SQLITE_PERM:
    case SQLITE_READONLY:
      throw Error{TEE_ERROR_ACCESS_DENIED, path_ + ": " + text};
    default:
      throw Error{TEE_ERROR_STORAGE_NOT_AVAILABLE, path_ + ": " + text};
  }
}

// An ID has at most 64 bytes, so its length in one byte keeps it apart from the data.
SqliteStorage::Digest SqliteStorage::digest(ByteView ta, ByteView id, ByteView data) const {
  const uint8_t id_len = static_cast<uint8_t>(id.size());
  Digest sum;
  if (EVP_DigestInit_ex(hash_.get(), algorithms().sha256, nullptr) != 1 ||
      EVP_DigestUpdate(hash_.get(), ta.data(), ta.size()) != 1 ||
      EVP_DigestUpdate(hash_.get(), &id_len, 1) != 1 ||
      EVP_DigestUpdate(hash_.get(), id.data(), id.size()) != 1 ||
      EVP_DigestUpdate(hash_.get(), data.data(), data.size()) != 1 ||
      EVP_DigestFinal_ex(hash_.get(), sum.data(), nullptr) != 1) {
    throw Error{TEE_ERROR_GENERIC, "cannot compute a digest"};
  }
  return sum;
}

}  // namespace tee
