// SPDX-License-Identifier: BSD-2-Clause
/// Persistent objects in an SQLite database: objects.db of a state directory.
///
///   objects(ta, id, digest, data)   one row per object, key (ta, id)
///
/// `ta` is the UUID in 16 bytes; `digest` the SHA-256 of ta, id and data, for SQLite itself does
/// not notice a changed byte inside a value. The row whose ta and id are empty has the number of
/// changes (8 bytes, little-endian), which tells when the log has lost some: see change_count.h.
#ifndef TEE_SQLITE_STORAGE_H
#define TEE_SQLITE_STORAGE_H

#include <sqlite3.h>

#include <optional>

#include "change_count.h"
#include "evp.h"
#include "state_directory.h"
#include "storage.h"

namespace tee {

class SqliteStorage : public Storage {
 public:
  /// Opens or creates the database. Before anything is written, an existing one is checked whole:
  /// a damaged or foreign one is TEE_ERROR_CORRUPT_OBJECT and stays as it is. One that others may
  /// write is TEE_ERROR_ACCESS_DENIED.
  explicit SqliteStorage(StateDirectory directory);
  ~SqliteStorage() override;

  std::optional<Bytes> load(const ObjectKey &key) override;
  void save(const ObjectKey &key, ByteView data) override;
  bool remove(const ObjectKey &key) override;
  std::vector<ObjectListing> list(const UuidBytes &ta) override;

 private:
  using Connection = std::unique_ptr<sqlite3, FreedBy<sqlite3_close>>;
  using Statement = std::unique_ptr<sqlite3_stmt, FreedBy<sqlite3_finalize>>;
  using Digest = std::array<uint8_t, 32>;
  class Run;
  class Transaction;

  void open_database();
  void check_or_create();
  bool is_blank();
  void create_schema();
  void check();
  void check_digests();
  void check_count();
  [[noreturn]] void damaged(const std::string &how) const;

  Statement prepare(const char *sql) const;
  void execute(const char *sql) const;
  std::string text_of(const char *sql) const;
  [[noreturn]] void fail(int result) const;
  Digest digest(ByteView ta, ByteView id, ByteView data) const;

  void save_row(ByteView ta, ByteView id, ByteView data);
  /// `make` returns false when there is nothing to change.
  template <class Make>
  bool change(Make &&make);

  StateDirectory directory_;  // its lock outlives the connection
  std::string path_;
  std::string log_;
  ChangeCount acknowledged_;
  DigestContext hash_;
  Connection db_;
  struct Statements {
    Statement load, save, remove, list, begin, commit, rollback;
  };
  std::optional<Statements> run_;
  uint64_t num_changes_ = 0;
};

}  // namespace tee

#endif
