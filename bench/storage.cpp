// SPDX-License-Identifier: BSD-2-Clause
// Durable objects against the bare transactions of the same database library on the same disk.
#include <sqlite3.h>

#include <filesystem>
#include <memory>
#include <stdexcept>

#include "device.h"
#include "groups.h"
#include "inside.h"
#include "state/object_store.h"

namespace bench {
namespace {

constexpr double kSaveTarget = 1.1;
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

void measure_saves(Bench &bench, size_t len) {
  BareDatabase bare(bench.work_directory + "/bare" + std::to_string(len));
  tee::test::Device device(bench.work_directory + "/state" + std::to_string(len));
  const Inside inside(device);
  const Contestant save = {[&] {
    const std::string record = next_record(len);
    const TEE_Result result = save_data_to_persistent_object(
        record.data(), static_cast<uint32_t>(record.size()), kRecordId, kIdLen, true);
    if (result != TEE_SUCCESS) throw std::runtime_error("a record was not saved");
  }};
  const Contestant transaction = {[&] { bare.save(next_record(len)); }};
  const Rounds rounds = compare({save, transaction}, bench.effort, Clock::kWall);
  bench.report.figures.push_back(
      {.group = "durable storage",
       .name = "record save / transaction, " + std::to_string(len) + " bytes",
       .value = rounds.ratio(0, 1),
       .unit = "x",
       .target = at_most(kSaveTarget),
       .detail =
           time_text(rounds.seconds(0).median) + " / " + time_text(rounds.seconds(1).median)});
}

void measure_durable_exchange(Bench &bench, Scene &scene, BareDatabase &bare,
                              const MessageCase &message) {
  Exchange exchange(scene, message);
  exchange.before();
  const uint64_t before = scene.device.host().durable_writes();
  exchange.run();
  const uint64_t commits = scene.device.host().durable_writes() - before;
  exchange.after();
  const Contestant bare_commits = {[&] {
    for (uint64_t i = 0; i < commits; ++i) bare.save(next_record(300));
  }};
  std::vector<Contestant> contestants = {exchange.contestant()};
  if (commits != 0) contestants.push_back(bare_commits);
  const Rounds rounds = compare(contestants, bench.effort, Clock::kWall);
  const Spread seconds = rounds.seconds(0);
  bench.report.figures.push_back({.group = "durable storage",
                                  .name = message.name + ", exchanges",
                                  .value = {1 / seconds.median, 1 / seconds.high, 1 / seconds.low},
                                  .unit = "a second",
                                  .detail = std::to_string(commits) + " commits"});
  if (commits == 0) return;
  bench.report.figures.push_back(
      {.group = "durable storage",
       .name = message.name + ", exchange / its bare commits",
       .value = rounds.ratio(0, 1),
       .unit = "x",
       .detail = time_text(seconds.median) + " / " + time_text(rounds.seconds(1).median)});
}

}  // namespace

void measure_storage(Bench &bench) {
  std::filesystem::remove_all(bench.work_directory);
  for (const size_t len : {300, 4096}) measure_saves(bench, len);

  Scene scene("tsm1", bench.work_directory + "/device");
  make_first_sd(scene);
  BareDatabase bare(bench.work_directory + "/bare");
  for (const MessageCase &message : message_cases()) {
    measure_durable_exchange(bench, scene, bare, message);
  }
}

}  // namespace bench
