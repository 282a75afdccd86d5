// SPDX-License-Identifier: BSD-2-Clause
// otrp-bench-server WORK [--quick]: what an exchange costs a TSM's server: verifying, deciding,
// signing and storing, all but HTTP's bytes. A device's answers are recorded once and given again
// by any number of devices, whose rows are put back before to where they were; so the devices' own
// work disturbs nothing. Takes the --benchmark_... options of Google Benchmark; WORK is emptied.
#include <openssl/crypto.h>
#include <openssl/rand.h>
#include <sqlite3.h>

#include <algorithm>
#include <cstdio>
#include <deque>
#include <filesystem>
#include <map>
#include <random>
#include <set>

#include "rsa_works.h"
#include "suite.h"
#include "support/agent_device.h"
#include "support/manager.h"
#include "tsm/plan/plan.h"
#include "tsm/protocol/dsi.h"
#include "tsm/server/service.h"
#include "works.h"

namespace bench {
namespace {

using otrp_test::AgentDevice;
using tsm::Json;
using tsm::Service;
using tsm::Store;
using tsm::StoredDevice;

constexpr double kGrowthTarget = 1.1;
constexpr size_t kFew = 100;
constexpr size_t kMany = 100'000;
constexpr size_t kManyQuick = 1'000;
constexpr size_t kNumAtOnce = 1'000;  // devices in a transaction
constexpr size_t kNumExchanges = 84;  // of a run: each of another device, whole sessions
constexpr int kNumRounds = 25;
constexpr size_t kImageLen = 100'000;
constexpr int64_t kNeverDue = int64_t{1} << 40;
constexpr std::chrono::seconds kTimeToAnswer{3600};
constexpr char kOtrpJson[] = "application/otrp+json";

// ---- What a device says

/// A POST, the row that it meets, and the request that answers it.
struct Step {
  StoredDevice row;
  std::string body;
  std::string request;
};
using Steps = std::vector<Step>;

tsm::Plan usual_plan() {
  const auto app = [](const char *name, uint32_t seed) {
    return tsm::PlannedApp{otrp_test::taid(name), "1.0", otrp_test::make_image(kImageLen, seed)};
  };
  return {.domains = {{"wallet", "bank", "certificate of the bank", {app("pay", 1)}},
                      {"tickets", "bank", "certificate of the bank", {app("fare", 2)}}}};
}

std::shared_ptr<const std::string> post(Service *service, const std::string &device_id,
                                        std::string body) {
  http::Request request = {.method = "POST", .path = "/tam/" + device_id};
  request.headers = {{"Content-Length", std::to_string(body.size())}};
  if (!body.empty()) request.headers.push_back({"Content-Type", kOtrpJson});
  request.body = std::move(body);
  const std::optional<http::Answer> early = service->handler().answer_early(request);
  const http::Answer answer = early ? *early : service->handler().answer(request);
  if (answer.status != 200 && answer.status != 204) {
    throw std::runtime_error("the server answered " + std::to_string(answer.status) + " " +
                             answer.note);
  }
  return answer.body;
}

std::string carry_out(AgentDevice *device, const std::string &request) {
  const std::string name = Json::parse(request).begin().key();
  const auto message =
      std::ranges::find(tsm::messages(), std::string_view(name), &tools::Message::request);
  return device::send(device->session(), *message, request, device::capacity_for(request)).response;
}

Steps record_session(AgentDevice *device, const std::string &device_id, Store *store,
                     Service *service) {
  Steps steps;
  for (std::string body;;) {
    Step step = {.row = store->find_device(device_id).value(), .body = body};
    if (step.row.deadline != 0) step.row.deadline = kNeverDue;
    if (const auto request = post(service, device_id, body)) step.request = *request;
    steps.push_back(step);
    if (step.request.empty()) return steps;
    body = carry_out(device, step.request);
  }
}

/// A device's first call, and one when it is as planned.
struct Recording {
  std::string device_id;
  std::string key;
  Steps first, later;
  StoredDevice settled;  // its row afterwards

  explicit Recording(const std::string &store_file) {
    AgentDevice device;
    device.require_open();
    const tsm::DeviceInfo info = otrp_test::Manager(device).info;
    device_id = info.device_id;
    key = tsm::base64url_encode(info.tee_key.encoded());
    Store store("sqlite:" + store_file);
    store.enrol({{device_id, key}}, tsm::kDefaultGroup);
    store.assign(tsm::stored_plan(usual_plan()), tsm::kDefaultGroup);
    Service service(otrp_test::tsm_named("tsm1"), &store, kTimeToAnswer);
    first = record_session(&device, device_id, &store, &service);
    later = record_session(&device, device_id, &store, &service);
    settled = store.find_device(device_id).value();
    if (settled.outcome != "current") throw std::runtime_error("the device did not arrive");
  }
};

// ---- The cryptography of it

size_t len_of(const Json &object, const char *name) {
  return object.at(name).get_ref<const std::string &>().size();
}

size_t bytes_in(size_t text_len) {
  return text_len * 3 / 4;
}

struct Cryptography {
  std::vector<Work> works = {};

  void add_random(size_t len) {
    works.push_back([len] { require(RAND_bytes(scratch().out.data(), static_cast<int>(len))); });
  }
  void add_signature(size_t len) {
    works.push_back(digest(len));
    works.push_back(rsa_sign(Form::kPair, Keys::kPrepared));
  }
  /// Authentication and encryption of a JWE's content.
  void add_content(const Json &jwe, bool encrypts) {
    constexpr size_t kAlLen = 8;
    const size_t len = bytes_in(len_of(jwe, "ciphertext"));
    works.push_back(hmac(len_of(jwe, "protect") + kAesBlockLen + len + kAlLen));
    works.push_back(aes(len, encrypts));
  }
  void add_answer(const std::string &text);
  void add_request(const std::string &text, const StoredDevice &row);
};

Json payload_of(const Json &envelope) {
  return Json::parse(*tsm::base64url_decode(envelope.at("payload").get<std::string>()));
}

void Cryptography::add_answer(const std::string &text) {
  const Json envelope = Json::parse(text).front();
  works.push_back(digest(len_of(envelope, "protect") + 1 + len_of(envelope, "payload")));
  works.push_back(rsa_verify(Keys::kPrepared));
  const Json payload = payload_of(envelope);
  const Json &members = payload.size() == 1 ? payload.front() : payload;
  for (const char *name : {"edsi", "content"}) {
    if (!members.contains(name)) continue;
    works.push_back(rsa_decrypt(Form::kPair, Keys::kPrepared));
    add_content(members.at(name), false);
  }
}

void Cryptography::add_request(const std::string &text, const StoredDevice &row) {
  constexpr size_t kIdLen = 8;
  const Json envelope = Json::parse(text).front();
  if (!envelope.contains("payload")) return;  // a question that nobody signs
  add_random(kIdLen);
  add_random(kIdLen);
  const Json tbs = payload_of(envelope).front();
  if (tbs.contains("dsihash")) works.push_back(digest((row.state.size() + 2) / 3 * 4));
  if (tbs.contains("content")) {
    add_random(kCekLen);
    add_random(kAesBlockLen);
    works.push_back(rsa_encrypt(Keys::kPrepared));
    add_content(tbs.at("content"), true);
  }
  if (tbs.contains("encrypted_ta")) {
    add_random(kCekLen);
    add_random(kAesBlockLen);
    works.push_back(rsa_encrypt(Keys::kPrepared));
    works.push_back(aes(bytes_in(len_of(tbs.at("encrypted_ta"), "ciphertadata")), true));
    add_signature(row.device_id.size() + row.open_request.size() / 2);
  }
  add_signature(len_of(envelope, "protect") + 1 + len_of(envelope, "payload"));
}

Work cryptography_of(const Steps &steps) {
  Cryptography all;
  for (size_t i = 0; i < steps.size(); ++i) {
    if (!steps[i].body.empty()) all.add_answer(steps[i].body);
    const StoredDevice &row = steps[std::min(i + 1, steps.size() - 1)].row;
    if (!steps[i].request.empty()) all.add_request(steps[i].request, row);
  }
  return in_order(all.works);
}

// ---- Servers of fleets

/// A server of a fleet that is as planned, all of it with the key of the recorded device.
class Fleet {
 public:
  Fleet(const std::string &file, const Recording &recording, size_t num_devices);

  /// Lets `kNumExchanges` devices come to where `steps` found the recorded one, in turn.
  void arrange(const Steps &steps);
  /// They POST what that one did.
  void exchange(const Steps &steps);

 private:
  void copy_settled(const std::string &file, const std::string &device_id) const;
  void put_back(const StoredDevice &row, const std::string &device_id);

  Store store_;
  Service service_;
  std::vector<std::string> ids_;
  std::vector<size_t> chosen_;
  std::deque<std::string> bodies_;
  std::set<size_t> in_sessions_;  // devices whose last session did not end
  std::minstd_rand random_{1};
};

std::string id_of(size_t index) {
  return tsm::hex_encode(tsm::sha256(std::to_string(index))).substr(0, 32);
}

Fleet::Fleet(const std::string &file, const Recording &recording, size_t num_devices)
    : store_("sqlite:" + file), service_(otrp_test::tsm_named("tsm1"), &store_, kTimeToAnswer) {
  std::vector<tsm::EnrolledDevice> devices;
  for (size_t i = 0; i < num_devices; ++i) {
    ids_.push_back(id_of(i));
    devices.push_back({ids_.back(), recording.key});
    if (devices.size() < kNumAtOnce && i + 1 < num_devices) continue;
    store_.enrol(devices, tsm::kDefaultGroup);
    devices.clear();
  }
  store_.assign(tsm::stored_plan(usual_plan()), tsm::kDefaultGroup);
  for (const Steps *steps : {&recording.first, &recording.later}) {
    for (const Step &step : *steps) put_back(step.row, ids_[0]);
  }
  put_back(recording.settled, ids_[0]);
  copy_settled(file, ids_[0]);
}

/// In the database itself: for so many devices anything else takes long.
void Fleet::copy_settled(const std::string &file, const std::string &device_id) const {
  sqlite3 *opened = nullptr;
  sqlite3_open(file.c_str(), &opened);
  const std::unique_ptr<sqlite3, decltype(&sqlite3_close)> database(opened, sqlite3_close);
  const std::string model = "'" + device_id + "'";
  const std::string columns = "version, state, progress, outcome, outcome_plan, reason, seen";
  const std::string statements =
      "BEGIN; UPDATE devices SET (" + columns + ") = (SELECT " + columns +
      " FROM devices WHERE device_id = " + model + ") WHERE device_id <> " + model +
      "; INSERT INTO events (device_id, number, time, message, outcome, reason, next_message) "
      "SELECT d.device_id, e.number, e.time, e.message, e.outcome, e.reason, e.next_message "
      "FROM devices d, events e WHERE e.device_id = " +
      model + " AND d.device_id <> " + model + "; COMMIT; PRAGMA wal_checkpoint(TRUNCATE)";
  if (sqlite3_exec(opened, statements.c_str(), nullptr, nullptr, nullptr) != SQLITE_OK) {
    throw std::runtime_error(std::string("SQLite: ") + sqlite3_errmsg(opened));
  }
}

void Fleet::put_back(const StoredDevice &row, const std::string &device_id) {
  StoredDevice next = row;
  next.device_id = device_id;
  next.version = store_.find_device(device_id).value().version;
  if (!store_.save(next, {.time = row.seen, .message = "call", .outcome = "call"})) {
    throw std::runtime_error("a row was not written");
  }
}

// In a session the exchange before has touched the device's row; a call comes from anywhere.
void Fleet::arrange(const Steps &steps) {
  std::set<size_t> chosen;
  while (chosen.size() < kNumExchanges) {
    chosen.insert(std::uniform_int_distribution<size_t>(0, ids_.size() - 1)(random_));
  }
  chosen_.assign(chosen.begin(), chosen.end());
  std::ranges::shuffle(chosen_, random_);
  bodies_.clear();
  for (size_t i = 0; i < kNumExchanges; ++i) {
    const Step &step = steps[i % steps.size()];
    const bool is_call = step.body.empty();
    const bool is_open = in_sessions_.contains(chosen_[i]);
    if (!is_call || is_open) put_back(step.row, ids_[chosen_[i]]);
    if (step.request.empty()) {
      in_sessions_.erase(chosen_[i]);
    } else {
      in_sessions_.insert(chosen_[i]);
    }
    bodies_.push_back(step.body);
  }
}

void Fleet::exchange(const Steps &steps) {
  for (size_t i = 0; i < kNumExchanges; ++i) {
    const auto request = post(&service_, ids_[chosen_[i]], std::move(bodies_[i]));
    if ((request == nullptr) != steps[i % steps.size()].request.empty()) {
      throw std::runtime_error("the server decided otherwise than before");
    }
  }
}

Contestant contestant_of(const std::string &name, const std::shared_ptr<Fleet> &fleet,
                         const Steps &steps) {
  return {.name = name,
          .run = [=] { fleet->exchange(steps); },
          .before = [=] { fleet->arrange(steps); }};
}

// ---- The groups

class Servers {
 public:
  explicit Servers(const Suite &suite) : suite_(suite) {}

  const Recording &recording() {
    if (!recording_) recording_ = std::make_unique<Recording>(file("recording"));
    return *recording_;
  }
  std::shared_ptr<Fleet> fleet(size_t num_devices) {
    std::shared_ptr<Fleet> &found = fleets_[num_devices];
    if (!found) {
      found = std::make_shared<Fleet>(file(std::to_string(num_devices)), recording(), num_devices);
    }
    return found;
  }

 private:
  std::string file(const std::string &name) const {
    std::filesystem::create_directories(suite_.work_directory);
    return suite_.work_directory + "/" + name + ".db";
  }

  const Suite &suite_;
  std::unique_ptr<Recording> recording_;
  std::map<size_t, std::shared_ptr<Fleet>> fleets_;
};

struct Session {
  const char *name;
  Steps Recording::*steps;
  double target;  // of the server over the cryptography; a later call has little of it
};
constexpr Session kSessions[] = {{"a first call", &Recording::first, 1.5},
                                 {"a later call", &Recording::later, 0}};

std::string devices_text(size_t count) {
  const std::string digits = std::to_string(count);
  const bool is_long = digits.size() > 3;
  return (is_long ? digits.substr(0, digits.size() - 3) + "," : "") +
         digits.substr(is_long ? digits.size() - 3 : 0) + " devices";
}

benchmark::UserCounters counters() {
  benchmark::UserCounters all;
  all["exchanges"] = kNumExchanges;
  return all;
}

void add_servers(Suite &suite) {
  const auto servers = std::make_shared<Servers>(suite);
  const size_t many = suite.quick ? kManyQuick : kMany;
  const Plan plan = {.rounds = kNumRounds, .batches = false};
  for (const Session &session : kSessions) {
    suite.compare(
        std::string("server/") + session.name,
        [=] {
          const Steps &steps = servers->recording().*session.steps;
          const Work once = cryptography_of(steps);
          const auto all = [once, times = kNumExchanges / steps.size()] {
            for (size_t i = 0; i < times; ++i) once();
          };
          return Comparison{
              .contestants = {contestant_of("server", servers->fleet(kFew), steps),
                              {.name = "cryptography", .run = all, .target = session.target}},
              .counters = counters()};
        },
        plan);
    suite.compare(
        std::string("fleet/") + session.name,
        [=] {
          const Steps &steps = servers->recording().*session.steps;
          Contestant few = contestant_of(devices_text(kFew), servers->fleet(kFew), steps);
          few.target = kGrowthTarget;
          return Comparison{
              .contestants = {contestant_of(devices_text(many), servers->fleet(many), steps), few},
              .counters = counters()};
        },
        plan);
  }
}

/// Standard output stays empty: what there is to see is the table of all figures.
struct Progress : benchmark::BenchmarkReporter {
  bool ReportContext(const Context &) override { return true; }
  void ReportRuns(const std::vector<Run> &runs) override {
    std::fprintf(stderr, "measured: %s\n", runs.front().run_name.function_name.c_str());
  }
};

size_t run(const std::string &work, bool is_quick) {
  Suite suite;
  suite.quick = is_quick;
  suite.work_directory = work;
  std::filesystem::remove_all(work);
  add_servers(suite);
  benchmark::AddCustomContext("quick", is_quick ? "yes" : "no");
  benchmark::AddCustomContext("openssl", OpenSSL_version(OPENSSL_VERSION));
  Progress progress;
  return benchmark::RunSpecifiedBenchmarks(&progress);
}

}  // namespace
}  // namespace bench

int main(int argc, char **argv) {
  benchmark::Initialize(&argc, argv);
  const bool is_quick = argc == 3 && std::string(argv[2]) == "--quick";
  if (argc != 2 && !is_quick) {
    std::fprintf(stderr, "usage: otrp-bench-server WORK [--quick]\n");
    return 2;
  }
  try {
    return bench::run(argv[1], is_quick) == 0 ? 2 : 0;
  } catch (const std::exception &error) {
    std::fprintf(stderr, "otrp-bench-server: %s\n", error.what());
    return 1;
  }
}
