// SPDX-License-Identifier: BSD-2-Clause
// Durable objects against the bare transactions of the same database library on the same disk.
#include <sqlite3.h>

#include <filesystem>
#include <memory>
#include <stdexcept>

#include "device.h"
#include "inside.h"
#include "state/object_store.h"

namespace bench {
namespace {

constexpr double kSaveTarget = 1.1;
constexpr double kExchangeTarget = 1.4;
constexpr char kCommits[] = "its bare commits";
constexpr char kRecordId[] = "SD_INFO_record";
constexpr size_t kIdLen = sizeof kRecordId - 1;

/// A table of objects and one statement, made durable in the same way as the device's.
class BareDatabase {
 public:
  explicit BareDatabase(const std::string &directory) {
    std::filesystem::create_directories(directory);
    sqlite3 *db = nullptr;
    const int opened = sqlite3_open((directory + "/bare.db").c_str(), &db);
    db_.reset(db);
    require(opened == SQLITE_OK);
    execute(
        "PRAGMA locking_mode = EXCLUSIVE; PRAGMA synchronous = FULL; PRAGMA journal_mode = WAL;"
        "CREATE TABLE objects (id BLOB PRIMARY KEY, data BLOB NOT NULL) WITHOUT ROWID");
    sqlite3_stmt *save = nullptr;
    require(sqlite3_prepare_v2(db, "INSERT OR REPLACE INTO objects VALUES (?, ?)", -1, &save,
                               nullptr) == SQLITE_OK);
    save_.reset(save);
  }

  void save(const std::string &data) {
    sqlite3_bind_blob(save_.get(), 1, kRecordId, kIdLen, SQLITE_STATIC);
    sqlite3_bind_blob(save_.get(), 2, data.data(), static_cast<int>(data.size()), SQLITE_STATIC);
    require(sqlite3_step(save_.get()) == SQLITE_DONE);
    sqlite3_reset(save_.get());
  }

 private:
  void require(bool passed) const {
    if (!passed) throw std::runtime_error(std::string("SQLite: ") + sqlite3_errmsg(db_.get()));
  }
  void execute(const char *sql) {
    require(sqlite3_exec(db_.get(), sql, nullptr, nullptr, nullptr) == SQLITE_OK);
  }

  std::unique_ptr<sqlite3, decltype(&sqlite3_close)> db_{nullptr, sqlite3_close};
  std::unique_ptr<sqlite3_stmt, decltype(&sqlite3_finalize)> save_{nullptr, sqlite3_finalize};
};

// The record changes each time, or pages could stay as they are.
std::string next_record(size_t len) {
  static unsigned number = 0;
  std::string record = std::to_string(++number);
  return record + std::string(len - record.size(), ' ');
}

Comparison saves(const std::string &directory, size_t len) {
  const auto inside = std::make_shared<Inside>(directory + "/device");
  const auto bare = std::make_shared<BareDatabase>(directory);
  const auto save = [inside, len] {
    const std::string record = next_record(len);
    const TEE_Result result = save_data_to_persistent_object(
        record.data(), static_cast<uint32_t>(record.size()), kRecordId, kIdLen, true);
    if (result != TEE_SUCCESS) throw std::runtime_error("a record was not saved");
  };
  const auto transaction = [bare, len] { bare->save(next_record(len)); };
  return {{{"record", save}, {.name = "transaction", .run = transaction, .target = kSaveTarget}}};
}

Comparison exchange_and_commits(const std::string &directory, const MessageCase &message) {
  const auto scene = std::make_shared<Scene>("tsm1", directory + "/device");
  make_first_sd(*scene);
  const auto exchange = std::make_shared<Exchange>(scene, message);
  const auto in_memory = std::make_shared<Exchange>(filled_device(1), message);
  exchange->before();
  const uint64_t before = scene->device.host().durable_writes();
  exchange->run();
  const uint64_t commits = scene->device.host().durable_writes() - before;
  exchange->after();

  Comparison comparison = {{contestant("exchange", exchange), contestant("in memory", in_memory)},
                           {{"commits", static_cast<double>(commits)}}};
  if (commits == 0) return comparison;
  const auto bare = std::make_shared<BareDatabase>(directory);
  comparison.contestants.push_back({kCommits, [bare, commits] {
                                      for (uint64_t i = 0; i < commits; ++i) {
                                        bare->save(next_record(300));
                                      }
                                    }});
  comparison.remainder = {
      .name = "what the disk adds",
      .of = [](const std::vector<double> &seconds) { return seconds[0] - seconds[1]; },
      .over = kCommits,
      .target = kExchangeTarget};
  return comparison;
}

}  // namespace

void add_storage(Suite &suite) {
  for (const size_t len : {300, 4096}) {
    const std::string name = "save, " + std::to_string(len) + " bytes";
    suite.compare(
        "storage/" + name,
        [=, directory = suite.work_directory + '/' + name] { return saves(directory, len); },
        {.gauge = Gauge::kWall});
  }
  for (const MessageCase &message : message_cases()) {
    suite.compare("storage/" + message.name,
                  [=, directory = suite.work_directory + '/' + message.name] {
                    return exchange_and_commits(directory, message);
                  },
                  {.gauge = Gauge::kWall, .rounds = 41, .batches = false});
  }
}

}  // namespace bench
