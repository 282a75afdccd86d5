// SPDX-License-Identifier: BSD-2-Clause
/// Persistent objects in an SQLite database: objects.db of a state directory.
///
///   objects(ta, id, digest, data)   one row per object, key (ta, id)
///
/// `ta` is the UUID in 16 bytes; `digest` the SHA-256 of ta, id and data, for SQLite itself does
/// not notice a changed byte inside a value.
#ifndef TEE_SQLITE_STORAGE_H
#define TEE_SQLITE_STORAGE_H

#include <sqlite3.h>

#include "evp.h"
#include "state_directory.h"
#include "storage.h"

namespace tee {

class SqliteStorage : public Storage {
 public:
  /// Opens or creates the database. Before anything is written, an existing one is checked whole:
  /// a damaged or foreign one is TEE_ERROR_CORRUPT_OBJECT and stays as it is.
  explicit SqliteStorage(StateDirectory directory);

  std::optional<Bytes> load(const ObjectKey &key) override;
  void save(const ObjectKey &key, ByteView data) override;
  bool remove(const ObjectKey &key) override;
  std::vector<ObjectListing> list(const UuidBytes &ta) override;

 private:
  using Connection = std::unique_ptr<sqlite3, FreedBy<sqlite3_close>>;
  using Statement = std::unique_ptr<sqlite3_stmt, FreedBy<sqlite3_finalize>>;
  using Digest = std::array<uint8_t, 32>;
  class Run;

  void open_database();
  void check_or_create();
  bool is_blank();
  void create_schema();
  void check();
  void check_digests();
  [[noreturn]] void damaged(const std::string &how) const;

  Statement prepare(const char *sql) const;
  void execute(const char *sql) const;
  std::string text_of(const char *sql) const;
  [[noreturn]] void fail(int result) const;
  Digest digest(ByteView ta, ByteView id, ByteView data) const;

  StateDirectory directory_;  // its lock outlives the connection
  std::string path_;
  DigestContext hash_;
  Connection db_;
  Statement load_, save_, remove_, list_;
};

}  // namespace tee

#endif
