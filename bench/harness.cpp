// SPDX-License-Identifier: BSD-2-Clause
#include "harness.h"

#include <time.h>

#include <algorithm>
#include <cmath>

namespace bench {
namespace {

constexpr double kShortestTiming = 200e-6;
constexpr size_t kMaxBatch = 1 << 20;

double now(Clock clock) {
  timespec time{};
  ::clock_gettime(clock == Clock::kWall ? CLOCK_MONOTONIC : CLOCK_PROCESS_CPUTIME_ID, &time);
  return static_cast<double>(time.tv_sec) + 1e-9 * static_cast<double>(time.tv_nsec);
}

double time_batch(const Contestant &contestant, size_t batch, Clock clock) {
  if (contestant.before) contestant.before();
  const double begin = now(clock);
  for (size_t i = 0; i < batch; ++i) contestant.run();
  const double end = now(clock);
  if (contestant.after) contestant.after();
  return (end - begin) / static_cast<double>(batch);
}

// Also warms caches up.
size_t find_batch(const Contestant &contestant, Clock clock) {
  size_t batch = 1;
  const double once = time_batch(contestant, 1, clock);
  if (contestant.before || contestant.after || once > kShortestTiming) return batch;
  while (batch < kMaxBatch &&
         time_batch(contestant, batch, clock) * static_cast<double>(batch) < kShortestTiming) {
    batch *= 2;
  }
  return batch;
}

double quantile(const std::vector<double> &sorted, double part) {
  const double at = part * static_cast<double>(sorted.size() - 1);
  const auto below = static_cast<size_t>(at);
  const size_t above = std::min(below + 1, sorted.size() - 1);
  return sorted[below] + (at - static_cast<double>(below)) * (sorted[above] - sorted[below]);
}

}  // namespace

Spread spread_of(std::vector<double> values) {
  if (values.empty()) return {};
  std::ranges::sort(values);
  return {quantile(values, 0.5), quantile(values, 0.25), quantile(values, 0.75)};
}

std::vector<double> Rounds::ratios(size_t subject, size_t reference) const {
  std::vector<double> values;
  for (size_t i = 0; i < seconds_[subject].size(); ++i) {
    values.push_back(seconds_[subject][i] / seconds_[reference][i]);
  }
  return values;
}

Spread Rounds::ratio(size_t subject, size_t reference) const {
  return spread_of(ratios(subject, reference));
}

Spread Rounds::decades(size_t subject, size_t reference) const {
  std::vector<double> values = ratios(subject, reference);
  for (double &value : values) value = std::log10(value);
  return spread_of(values);
}

Rounds compare(const std::vector<Contestant> &contestants, const Effort &effort, Clock clock) {
  std::vector<size_t> batches;
  for (const Contestant &contestant : contestants) {
    batches.push_back(effort.quick ? 1 : find_batch(contestant, clock));
  }
  Rounds rounds(contestants.size());
  const double begin = now(Clock::kWall);
  for (size_t round = 0; round < effort.max_rounds; ++round) {
    if (round >= effort.min_rounds && now(Clock::kWall) - begin > effort.seconds) break;
    // Each comes first as often as the others: what one leaves in the caches meets all of them.
    for (size_t turn = 0; turn < contestants.size(); ++turn) {
      const size_t i = (turn + round) % contestants.size();
      rounds.add(i, time_batch(contestants[i], batches[i], clock));
    }
  }
  return rounds;
}

}  // namespace bench
