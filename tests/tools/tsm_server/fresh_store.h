// SPDX-License-Identifier: BSD-2-Clause
/// A store that nobody has used: a file of SQLite, or a schema of its own at the PostgreSQL server
/// that $OTRP_TEST_POSTGRESQL names.
#ifndef TSM_SERVER_FRESH_STORE_H
#define TSM_SERVER_FRESH_STORE_H

#include <soci/postgresql/soci-postgresql.h>
#include <soci/soci.h>
#include <soci/sqlite3/soci-sqlite3.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>
#include <string>

#include "support/temporary_folder.h"

namespace otrp_test {

class FreshStore {
 public:
  FreshStore() : uri_("sqlite:" + folder_.path.string() + "/fleet.db") {
    const char *server = getenv("OTRP_TEST_POSTGRESQL");
    if (server == nullptr) return;
    static int number = 0;
    const std::string schema = "t" + std::to_string(getpid()) + "_" + std::to_string(++number);
    soci::session(soci::postgresql, server) << "CREATE SCHEMA " + schema;
    uri_ = std::string(server) + "&options=-csearch_path%3D" + schema;
  }

  const std::string &uri() const { return uri_; }
  bool is_shared() const { return uri_.starts_with("postgresql:"); }

  /// Past the store.
  void execute(const std::string &statement) const {
    soci::session sql = is_shared() ? soci::session(soci::postgresql, uri_)
                                    : soci::session(soci::sqlite3, uri_.substr(strlen("sqlite:")));
    sql << statement;
  }

  /// As if the database was started anew.
  void end_connections() const {
    soci::session(soci::postgresql, getenv("OTRP_TEST_POSTGRESQL"))
        << "SELECT pg_terminate_backend(pid) FROM pg_stat_activity "
           "WHERE pid <> pg_backend_pid() AND backend_type = 'client backend'";
  }

 private:
  TemporaryFolder folder_;
  std::string uri_;
};

}  // namespace otrp_test

#endif
