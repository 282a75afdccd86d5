// SPDX-License-Identifier: BSD-2-Clause
/// What each exchange does, prepared once for each connection.
#ifndef TSM_STORE_CONNECTION_H
#define TSM_STORE_CONNECTION_H

#include <soci/soci.h>

#include <memory>
#include <string>

#include "tsm/store/store.h"

namespace tsm {

class Connection {
 public:
  Connection() = default;
  Connection(const Connection &) = delete;
  Connection &operator=(const Connection &) = delete;

  soci::session sql;

  /// Once `sql` is open.
  void prepare();

  /// Rolled back unless it comes to its end.
  class Transaction {
   public:
    explicit Transaction(Connection *connection);
    ~Transaction();
    Transaction(const Transaction &) = delete;
    Transaction &operator=(const Transaction &) = delete;
    void commit();

   private:
    Connection *connection_;  // NULL: committed
  };

  bool find(const std::string &device_id, StoredDevice *device);

  /// Inside a transaction; false when the row has another version by now.
  bool update(const StoredDevice &device);
  void insert(const Event &event);
  void prune_events(const std::string &device_id, int64_t last_number);

 private:
  // Statements are bound to these, and a connection is used by one thread at a time.
  StoredDevice device_;
  Event event_;
  int standing_ = 0;
  int waits_ = 0;
  long long version_ = 0;
  long long number_ = 0;
  long long seen_ = 0;
  long long deadline_ = 0;
  long long time_ = 0;
  std::unique_ptr<soci::statement> begin_;
  std::unique_ptr<soci::statement> commit_;
  std::unique_ptr<soci::statement> find_;
  std::unique_ptr<soci::statement> update_in_place_;  // NULL: the database needs none
  std::unique_ptr<soci::statement> update_;
  std::unique_ptr<soci::statement> insert_;
  std::unique_ptr<soci::statement> prune_;
};

}  // namespace tsm

#endif
