// SPDX-License-Identifier: BSD-2-Clause
/// Connections to a database: SQLite for one server, PostgreSQL for several.
#ifndef TSM_STORE_DATABASE_H
#define TSM_STORE_DATABASE_H

#include <soci/soci.h>

#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "tsm/store/store.h"

namespace tsm {

/// A connection, and what is prepared on it.
class Connection;

class Database {
 public:
  /// "sqlite:FILE" or "postgresql://..."; throws tools::UsageError for anything else. Tables that
  /// are not there are made. Throws StoreError.
  explicit Database(const std::string &uri);
  ~Database();

  /// What `use` makes of a connection, which is its own meanwhile. One that failed is closed, and
  /// others that wait with it: when the database comes back they would not. Throws StoreError.
  template <class Use>
  auto with(Use &&use) {
    try {
      std::unique_ptr<Connection> connection = take();
      auto result = use(*connection);
      give_back(std::move(connection));
      return result;
    } catch (const soci::soci_error &error) {
      fail(error.what());
    }
  }

  /// SQLite has one writer at a time. Those of this process stand in line here, where waiting costs
  /// nothing; between processes SQLite itself makes them wait.
  std::unique_lock<std::mutex> writers_turn() {
    return is_sqlite_ ? std::unique_lock(writer_) : std::unique_lock<std::mutex>();
  }

 private:
  std::unique_ptr<Connection> take();
  void give_back(std::unique_ptr<Connection> connection);
  [[noreturn]] void fail(const std::string &why);
  void open(soci::session *session) const;
  void make_tables();

  bool is_sqlite_;
  std::string location_;
  std::mutex writer_;
  std::mutex lock_;  // of idle_
  std::vector<std::unique_ptr<Connection>> idle_;
};

}  // namespace tsm

#endif
