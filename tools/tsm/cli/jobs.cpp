// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/cli/jobs.h"

#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cstdio>
#include <map>
#include <mutex>
#include <thread>

#include "common/error_line.h"

namespace tsm {
namespace {

/// A line on a terminal that is written again and again.
class ProgressLine {
 public:
  explicit ProgressLine(size_t num_jobs)
      : num_jobs_(num_jobs), is_shown_(isatty(STDERR_FILENO) != 0) {
    draw();
  }
  ProgressLine(const ProgressLine &) = delete;
  ProgressLine &operator=(const ProgressLine &) = delete;
  ~ProgressLine() { wipe(); }

  void add(const std::string &name, const Outcome &outcome, bool wants_log) {
    const std::lock_guard guard(lock_);
    ++num_done_;
    if (outcome.exit_code != 0) ++num_failed_;
    wipe();
    if (wants_log) {
      fwrite(outcome.log.data(), 1, outcome.log.size(), stderr);
    }
    for (const std::string &error : outcome.errors) {
      tools::print_error_line("otrp-tsm", name + ": " + error);
    }
    draw();
  }

 private:
  void wipe() const {
    if (is_shown_) fputs("\r\033[K", stderr);
  }
  void draw() const {
    if (!is_shown_ || num_done_ == num_jobs_) return;
    fprintf(stderr, "%zu of %zu", num_done_, num_jobs_);
    if (num_failed_ != 0) fprintf(stderr, ", %zu failed", num_failed_);
    fflush(stderr);
  }

  const size_t num_jobs_;
  const bool is_shown_;
  std::mutex lock_;
  size_t num_done_ = 0;
  size_t num_failed_ = 0;
};

}  // namespace

std::vector<Outcome> run_jobs(const Jobs &jobs) {
  const size_t num_jobs = jobs.names.size();
  std::vector<Outcome> outcomes(num_jobs);
  ProgressLine progress(num_jobs);
  std::atomic<size_t> next = 0;
  const auto work = [&] {
    for (size_t i = next++; i < num_jobs; i = next++) {
      outcomes[i] = outcome_of([&] { return jobs.work(i); });
      progress.add(jobs.names[i], outcomes[i], jobs.wants_logs);
    }
  };
  std::vector<std::jthread> threads;
  for (size_t i = 1; i < std::min<size_t>(jobs.num_at_once, num_jobs); ++i) {
    threads.emplace_back(work);
  }
  work();
  threads.clear();  // waits for them
  return outcomes;
}

std::string some_names(const std::vector<std::string> &names) {
  constexpr size_t kMaxShown = 5;
  std::string text;
  for (size_t i = 0; i < std::min(names.size(), kMaxShown); ++i) {
    text += (i == 0 ? "" : ", ") + names[i];
  }
  if (names.size() > kMaxShown)
    text += " and " + std::to_string(names.size() - kMaxShown) + " more";
  return text;
}

std::string summary_of(const std::vector<std::string> &names, const std::vector<Outcome> &outcomes,
                       const std::string &success) {
  size_t num_passed = 0;
  std::map<std::string, std::map<std::string, std::vector<std::string>>> failed;  // kind, reason
  for (size_t i = 0; i < outcomes.size(); ++i) {
    if (outcomes[i].exit_code == 0) {
      ++num_passed;
    } else {
      failed[outcomes[i].kind][outcomes[i].reason].push_back(names[i]);
    }
  }
  std::string summary = std::to_string(num_passed) + " " + success;
  for (const auto &[kind, reasons] : failed) {
    size_t num_devices = 0;
    std::string details;
    for (const auto &[reason, devices] : reasons) {
      num_devices += devices.size();
      details += (details.empty() ? ": " : "; ") +
                 (reason.empty() ? some_names(devices) : reason + " (" + some_names(devices) + ")");
    }
    summary += ", " + std::to_string(num_devices) + " " + kind + details;
  }
  return summary;
}

int exit_code_of(const std::vector<Outcome> &outcomes) {
  int worst = 0;
  for (const Outcome &outcome : outcomes) worst = std::max(worst, outcome.exit_code);
  return worst;
}

}  // namespace tsm
