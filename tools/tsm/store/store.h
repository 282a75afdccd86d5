// SPDX-License-Identifier: BSD-2-Clause
/// What servers know of a fleet, in a database that any number of them share.
///
///     devices        one row a device: who it is, what it holds, how far it is, and the one
///                    message that waits for its answer
///     events         the last things that happened to a device, numbered by its versions
///     device_groups  which plan the devices of a group are to be brought to
///     plans, images  by their SHA-256 digests, whole, so that each server has them
///     history        how many devices were where, a row each minute, of the last week
///
/// A device's row is read, the next message is made, and the row is written if nobody else wrote it
/// meanwhile: its version says so. The store does not look into the texts that it keeps.
///
/// Functions throw a StoreError. Objects may be used by any number of threads.
#ifndef TSM_STORE_STORE_H
#define TSM_STORE_STORE_H

#include <array>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <vector>

namespace tsm {

class Database;

/// The database cannot be reached, or failed. One line. Nothing of the transaction was done, unless
/// its very end is not known.
class StoreError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

constexpr char kDefaultGroup[] = "default";
constexpr size_t kNumKeptEvents = 50;  // of a device
constexpr int64_t kHistoryStep = 60;   // seconds
constexpr int64_t kHistoryTime = 7 * 24 * 3600;

/// Where devices stand: as their plan wants them, not yet or no more, not to be brought there;
/// never seen; without a plan. An outcome counts for the plan that it is about.
enum class Standing { kCurrent, kBehind, kRefused, kUnseen, kUnplanned };
constexpr std::array<const char *, 5> kStandings = {"current", "behind", "refused", "unseen",
                                                    "unplanned"};
constexpr const char *name_of(Standing standing) {
  return kStandings[static_cast<size_t>(standing)];
}
using StandingCounts = std::array<uint64_t, kStandings.size()>;

struct StoredDevice {
  std::string device_id = {};
  std::string key = {};    // as it was enrolled
  std::string group = {};  // not written by save()
  std::string plan = {};   // the group's, by digest; empty: none; not written by save()
  int64_t version = 0;     // that was read
  std::string state = {};  // last verified state document; empty: none
  std::string progress = {};
  Standing standing = Standing::kUnplanned;  // not written by save()
  std::string outcome = {};                  // empty until the device has called
  std::string outcome_plan = {};             // digest of the plan that the outcome is about
  std::string reason = {};                   // of the outcome; a line
  int64_t seen = 0;                          // seconds since 1970; 0: never
  std::string open_message = {};             // that waits for its answer; empty: none
  std::string open_request = {};             // what the answer is tied to
  int64_t deadline = 0;                      // of the answer, in seconds since 1970
};

struct Event {
  std::string device_id = {};
  int64_t number = 0;  // given by save()
  int64_t time = 0;    // seconds since 1970
  std::string message = {};
  std::string outcome = {};
  std::string reason = {};
  std::string next = {};  // the message that was sent; empty: none
};

struct EnrolledDevice {
  std::string device_id;
  std::string key;
};

struct StoredPlan {
  std::string digest;
  std::string document;
  std::map<std::string, std::string> images;  // by digest
};

/// Which devices to list: by their IDs, those behind `after`.
struct DeviceQuery {
  std::string text = {};  // in the ID or the group, small and capital letters alike; empty: all
  std::optional<Standing> standing = {};
  std::string after = {};
  size_t max_devices = 50;
};

struct ListedDevice {
  std::string device_id = {};
  std::string group = {};
  Standing standing = Standing::kUnplanned;
  std::string reason = {};
  int64_t seen = 0;
};

struct HistoryEntry {
  int64_t time = 0;  // seconds since 1970
  StandingCounts counts = {};
};

class Store {
 public:
  /// See Database.
  explicit Store(const std::string &uri);
  ~Store();

  std::optional<StoredDevice> find_device(const std::string &device_id);

  /// Writes the row with the next version, and the event, in one transaction; of the device's
  /// events the last are kept. False, and nothing is written, when another was quicker.
  bool save(const StoredDevice &device, Event event);

  /// The newest first.
  std::vector<Event> events_of(const std::string &device_id);

  /// Devices that are there already change their group. Throws tools::UsageError, having enrolled
  /// none of `devices`, for an ID that is enrolled with another key.
  void enrol(const std::vector<EnrolledDevice> &devices, const std::string &group);

  /// False for no such device. A message that waits stays.
  bool move(const std::string &device_id, const std::string &group);

  /// With all that is known of them. Throws tools::UsageError, having removed none, for a device
  /// that is not enrolled.
  void remove(const std::vector<std::string> &device_ids);

  /// Keeps the plan and makes it that of the group.
  void assign(const StoredPlan &plan, const std::string &group);

  std::optional<std::string> find_plan_document(const std::string &digest);
  std::optional<std::string> find_image(const std::string &digest);

  /// The plans of groups that have one, by digest.
  std::map<std::string, std::string> group_plans();

  // These look through all devices, in an index that is narrow.
  std::vector<ListedDevice> list_devices(const DeviceQuery &query);
  StandingCounts count_devices();
  uint64_t count_open(int64_t now);  // messages that wait, and whose deadline has not passed

  /// Counts, unless a server has done so in this step of time.
  void keep_history(int64_t now);
  std::vector<HistoryEntry> history_since(int64_t time);  // the oldest first

  /// Throws unless the database answers.
  void ping();

 private:
  std::unique_ptr<Database> database_;
};

}  // namespace tsm

#endif
