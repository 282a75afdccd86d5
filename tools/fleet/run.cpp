// SPDX-License-Identifier: BSD-2-Clause
#include "fleet/run.h"

#include <memory>
#include <mutex>
#include <optional>
#include <thread>
#include <utility>

#include "common/error_line.h"
#include "fleet/child.h"
#include "fleet/parallel.h"

namespace fleet {
namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

constexpr milliseconds kLook(5);           // how often a child is looked at
constexpr milliseconds kLongestLife(400);  // of a device that is killed in a call
constexpr std::chrono::seconds kServerStart(30);

/// The TSMs, where they are ours to run. They are killed in turn after counted events, so that they
/// are killed as often as was asked for, however fast the devices are.
class Servers {
 public:
  Servers(const RunOptions &options, size_t num_devices)
      : options_(options), num_devices_(num_devices), children_(options.servers.size()) {
    if (options.servers.empty() && options.call.faults.killed_servers > 0) {
      throw tools::UsageError("kill-server needs a server to kill: expected --server COMMAND");
    }
    if (!options.servers.empty() && options.servers.size() != options.call.tsms.size()) {
      throw tools::UsageError("as many --server as --tsm belong together: expected " +
                              std::to_string(options.call.tsms.size()));
    }
    for (size_t i = 0; i < children_.size(); ++i) start(i);
  }

  ~Servers() {
    wait_for_kills();
    for (const std::unique_ptr<Child> &child : children_) {
      if (child) child->end();
    }
  }

  /// Each device utters it once, in the middle of its first call. The kill that is due then meets
  /// what the device and others are about to ask.
  void a_device_is_at_work() {
    const unsigned num_kills = options_.call.faults.killed_servers;
    const std::lock_guard guard(count_lock_);
    ++num_at_work_;
    while (kills_.size() < num_kills &&
           num_at_work_ * (num_kills + 1) >= num_devices_ * (kills_.size() + 1)) {
      const size_t index = kills_.size() % children_.size();
      kills_.emplace_back([this, index] { kill_and_start(index); });
    }
  }

  /// Throws when one has ended by itself.
  void look() {
    const std::lock_guard guard(children_lock_);
    if (failure_) std::rethrow_exception(failure_);
    for (const std::unique_ptr<Child> &child : children_) {
      if (const std::optional<int> code = child->exit_code()) {
        throw std::runtime_error("the server has ended by itself, with exit code " +
                                 std::to_string(*code));
      }
    }
  }

  /// How often one was killed, in the end.
  size_t wait_for_kills() {
    for (std::jthread &kill : kills_) {
      if (kill.joinable()) kill.join();
    }
    return kills_.size();
  }

 private:
  void kill_and_start(size_t index) {
    const std::lock_guard guard(children_lock_);
    try {
      children_[index]->kill();
      start(index);
    } catch (...) {
      failure_ = std::current_exception();
    }
  }

  void start(size_t index) {
    children_[index] = std::make_unique<Child>(
        std::vector<std::string>{"/bin/sh", "-c", options_.servers[index]}, Child::Output::kShown);
    const Clock::time_point end = Clock::now() + kServerStart;
    while (!is_there(index) && Clock::now() < end) std::this_thread::sleep_for(10 * kLook);
  }

  /// Whatever it answers.
  bool is_there(size_t index) const {
    try {
      http::Client({.ca_file = options_.call.ca_file}).send({.url = options_.call.tsms[index]});
      return true;
    } catch (const http::ClientError &error) {
      return error.failure() != http::Failure::kNoConnection;
    }
  }

  const RunOptions &options_;
  const size_t num_devices_;
  std::mutex children_lock_;  // of children_ and failure_
  std::vector<std::unique_ptr<Child>> children_;
  std::exception_ptr failure_;
  std::mutex count_lock_;  // of the ones below
  size_t num_at_work_ = 0;
  std::vector<std::jthread> kills_;
};

class Run {
 public:
  Run(const std::filesystem::path &root, const RunOptions &options, const broker::Stop &stop)
      : root_(root),
        members_(members_of(root)),
        options_(options),
        stop_(stop),
        servers_(options, members_.size()) {}

  Figures run(const std::function<void(const RunProgress &)> &progress);

 private:
  void bring(size_t index);
  bool arrives(const Member &member, Random &random, const std::function<void()> &on_message);
  bool is_killed_or_arrives(const Member &member, Random &random, bool *arrived);
  void wait_for_turn(size_t index) const;

  const std::filesystem::path &root_;
  const std::vector<Member> members_;
  const RunOptions &options_;
  const broker::Stop &stop_;
  Servers servers_;
  Clock::time_point start_;
  std::mutex lock_;  // of the ones below
  Figures figures_;
  size_t num_done_ = 0;
};

void Run::wait_for_turn(size_t index) const {
  if (options_.rate <= 0) return;
  const std::chrono::duration<double> at(static_cast<double>(index) / options_.rate);
  const auto left = std::chrono::ceil<milliseconds>(start_ + at - Clock::now());
  if (left > milliseconds(0)) (void)stop_.wait_for(left);
}

/// Called in a process of its own, which is killed at any moment of its first fractions of a
/// second.
bool Run::is_killed_or_arrives(const Member &member, Random &random, bool *arrived) {
  const auto life = kLongestLife * std::generate_canonical<double, 32>(random);
  std::vector<std::string> words = {"/proc/self/exe", "call", member.name, "--root",
                                    root_.string()};
  for (const std::string &tsm : options_.call.tsms) words.insert(words.end(), {"--tsm", tsm});
  words.insert(words.end(), {"--ca-file", options_.call.ca_file});
  Child child(words, Child::Output::kNone);
  const Clock::time_point end = Clock::now() + std::chrono::duration_cast<Clock::duration>(life);
  std::optional<int> code;
  while (!(code = child.exit_code()) && Clock::now() < end) std::this_thread::sleep_for(kLook);
  *arrived = code == 0;
  return !code;
}

bool Run::arrives(const Member &member, Random &random, const std::function<void()> &on_message) {
  Figures figures;
  bool arrived = false;
  if (happens(options_.call.faults.killed_devices, random)) {
    ++figures.num_calls;
    ++figures.num_sessions;
    if (is_killed_or_arrives(member, random, &arrived)) ++figures.failures["killed device"];
  } else {
    const broker::Outcome outcome =
        call_tsm(member, options_.call, stop_, random, figures, on_message);
    arrived = outcome.end == broker::End::kDone;
  }
  figures.num_arrived = arrived ? 1 : 0;
  const std::lock_guard guard(lock_);
  figures_.add(figures);
  return arrived;
}

void Run::bring(size_t index) {
  Random random(static_cast<Random::result_type>(options_.seed * 1'000'003 + index + 1));
  bool was_at_work = false;
  const auto note_work = [&] {
    if (!std::exchange(was_at_work, true)) servers_.a_device_is_at_work();
  };
  wait_for_turn(index);
  for (unsigned call = 0; call < options_.max_calls && !stop_.is_requested(); ++call) {
    if (arrives(members_[index], random, note_work)) break;
  }
  note_work();  // if no message came
  const std::lock_guard guard(lock_);
  ++num_done_;
}

Figures Run::run(const std::function<void(const RunProgress &)> &progress) {
  start_ = Clock::now();
  const auto tick = [&] {
    servers_.look();
    std::unique_lock guard(lock_);
    const RunProgress now = {num_done_, figures_.num_arrived, figures_.exchanges.count()};
    guard.unlock();
    progress(now);
  };
  for_each(
      members_.size(), options_.num_threads, [&](size_t index) { bring(index); }, tick);
  figures_.num_devices = members_.size();
  figures_.time = Clock::now() - start_;
  if (const size_t num_kills = servers_.wait_for_kills()) {
    figures_.failures["killed server"] = num_kills;
  }
  servers_.look();
  return std::move(figures_);
}

}  // namespace

Figures run_fleet(const std::filesystem::path &root, const RunOptions &options,
                  const broker::Stop &stop,
                  const std::function<void(const RunProgress &)> &progress) {
  return Run(root, options, stop).run(progress);
}

}  // namespace fleet
