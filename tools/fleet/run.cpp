// SPDX-License-Identifier: BSD-2-Clause
#include "fleet/run.h"

#include <mutex>
#include <optional>
#include <thread>

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

/// The TSM, where it is ours to run.
class Server {
 public:
  Server(const RunOptions &options, size_t num_devices) : options_(options) {
    if (options.server_command.empty() && options.call.faults.killed_servers > 0) {
      throw tools::UsageError("kill-server needs a server to kill: expected --server COMMAND");
    }
    every_ = num_devices / (options.call.faults.killed_servers + 1) + 1;
    if (!options.server_command.empty()) start();
  }

  ~Server() {
    if (child_) child_->end();
  }

  /// Kills it when its time has come, and starts it again. Returns whether it did.
  bool look(size_t num_done) {
    if (!child_) return false;
    if (const std::optional<int> code = child_->exit_code()) {
      throw std::runtime_error("the server has ended by itself, with exit code " +
                               std::to_string(*code));
    }
    const bool is_due =
        num_killed_ < options_.call.faults.killed_servers && num_done >= (num_killed_ + 1) * every_;
    if (!is_due) return false;
    ++num_killed_;
    child_->kill();
    start();
    return true;
  }

 private:
  void start() {
    child_.emplace(std::vector<std::string>{"/bin/sh", "-c", options_.server_command},
                   Child::Output::kShown);
    const Clock::time_point end = Clock::now() + kServerStart;
    while (!is_there() && Clock::now() < end) std::this_thread::sleep_for(10 * kLook);
  }

  /// Whatever it answers.
  bool is_there() const {
    try {
      http::Client({.ca_file = options_.call.ca_file}).send({.url = options_.call.tsm});
      return true;
    } catch (const http::ClientError &error) {
      return error.failure() != http::Failure::kNoConnection;
    }
  }

  const RunOptions &options_;
  std::optional<Child> child_;
  size_t every_;
  unsigned num_killed_ = 0;
};

class Run {
 public:
  Run(const std::filesystem::path &root, const RunOptions &options, const broker::Stop &stop)
      : root_(root), members_(members_of(root)), options_(options), stop_(stop) {}

  Figures run(const std::function<void(const RunProgress &)> &progress);

 private:
  void bring(size_t index);
  bool arrives(const Member &member, Random &random);
  bool is_killed_or_arrives(const Member &member, Random &random, bool *arrived);
  void wait_for_turn(size_t index) const;

  const std::filesystem::path &root_;
  const std::vector<Member> members_;
  const RunOptions &options_;
  const broker::Stop &stop_;
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
  Child child({"/proc/self/exe", "call", member.name, "--root", root_.string(), "--tsm",
               options_.call.tsm, "--ca-file", options_.call.ca_file},
              Child::Output::kNone);
  const Clock::time_point end = Clock::now() + std::chrono::duration_cast<Clock::duration>(life);
  std::optional<int> code;
  while (!(code = child.exit_code()) && Clock::now() < end) std::this_thread::sleep_for(kLook);
  *arrived = code == 0;
  return !code;
}

bool Run::arrives(const Member &member, Random &random) {
  Figures figures;
  bool arrived = false;
  if (happens(options_.call.faults.killed_devices, random)) {
    ++figures.num_calls;
    ++figures.num_sessions;
    if (is_killed_or_arrives(member, random, &arrived)) ++figures.failures["killed device"];
  } else {
    const broker::Outcome outcome = call_tsm(member, options_.call, stop_, random, figures);
    arrived = outcome.end == broker::End::kDone;
  }
  figures.num_arrived = arrived ? 1 : 0;
  const std::lock_guard guard(lock_);
  figures_.add(figures);
  return arrived;
}

void Run::bring(size_t index) {
  Random random(static_cast<Random::result_type>(options_.seed * 1'000'003 + index + 1));
  wait_for_turn(index);
  for (unsigned call = 0; call < options_.max_calls && !stop_.is_requested(); ++call) {
    if (arrives(members_[index], random)) break;
  }
  const std::lock_guard guard(lock_);
  ++num_done_;
}

Figures Run::run(const std::function<void(const RunProgress &)> &progress) {
  Server server(options_, members_.size());
  start_ = Clock::now();
  const auto tick = [&] {
    std::unique_lock guard(lock_);
    const RunProgress now = {num_done_, figures_.num_arrived, figures_.exchanges.count()};
    guard.unlock();
    if (server.look(now.num_done)) {
      guard.lock();
      ++figures_.failures["killed server"];
      guard.unlock();
    }
    progress(now);
  };
  for_each(
      members_.size(), options_.num_threads, [&](size_t index) { bring(index); }, tick);
  figures_.num_devices = members_.size();
  figures_.time = Clock::now() - start_;
  return std::move(figures_);
}

}  // namespace

Figures run_fleet(const std::filesystem::path &root, const RunOptions &options,
                  const broker::Stop &stop,
                  const std::function<void(const RunProgress &)> &progress) {
  return Run(root, options, stop).run(progress);
}

}  // namespace fleet
