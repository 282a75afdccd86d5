// SPDX-License-Identifier: BSD-2-Clause
#include "suite.h"

#include <malloc.h>
#include <tee_test.h>
#include <time.h>

#include <algorithm>
#include <cstdlib>
#include <numeric>
#include <random>

namespace bench {
namespace {

constexpr double kShortestRound = 500e-6;
constexpr size_t kLargeBlock = 1 << 20;

double read(Gauge gauge) {
  if (gauge == Gauge::kHeap) {
    const struct mallinfo2 info = ::mallinfo2();
    return static_cast<double>(info.uordblks + info.hblkhd);
  }
  timespec time{};
  ::clock_gettime(gauge == Gauge::kWall ? CLOCK_MONOTONIC : CLOCK_PROCESS_CPUTIME_ID, &time);
  return static_cast<double>(time.tv_sec) + 1e-9 * static_cast<double>(time.tv_nsec);
}

// The C library puts its free blocks in order when it is next asked for a large one. Whoever asked
// would be measured with what others have left behind.
void tidy_heap() {
  void *block = std::malloc(kLargeBlock);
  benchmark::DoNotOptimize(block);
  std::free(block);
}

double measure(const Contestant &contestant, benchmark::IterationCount num_runs, Gauge gauge) {
  tidy_heap();
  const double begin = read(gauge);
  for (benchmark::IterationCount i = 0; i < num_runs; ++i) contestant.run();
  const double end = read(gauge);
  return (end - begin) / static_cast<double>(num_runs);
}

size_t index_of(const std::vector<Contestant> &contestants, const std::string &name) {
  const auto found = std::ranges::find(contestants, name, &Contestant::name);
  return static_cast<size_t>(found - contestants.begin());
}

void count(const Comparison &comparison, const Remainder &remainder,
           const std::vector<double> &amounts, benchmark::UserCounters &counters) {
  for (size_t i = 0; i < amounts.size(); ++i) {
    counters[comparison.contestants[i].name] = amounts[i];
  }
  const double rest = remainder.of(amounts);
  counters[remainder.name] = rest;
  const std::string &over = remainder.over;
  counters[(over.empty() ? remainder.name : over) + " target"] = remainder.target;
  if (over.empty()) return;
  counters[remainder.name + " / " + over] = rest / amounts[index_of(comparison.contestants, over)];
}

void count(const std::vector<Contestant> &contestants, const std::vector<double> &amounts,
           benchmark::UserCounters &counters) {
  counters[contestants[0].name] = amounts[0];
  const size_t bound = index_of(contestants, kBound);
  for (size_t i = 1; i < contestants.size(); ++i) {
    const std::string &name = contestants[i].name;
    counters[name] = amounts[i];
    counters[contestants[0].name + " / " + name] = amounts[0] / amounts[i];
    if (contestants[i].target == 0) continue;
    counters[name + " target"] = contestants[i].target;
    const bool has_bound = bound != contestants.size() && bound != i;
    if (has_bound) counters[name + " bound"] = amounts[bound] / amounts[i];
  }
}

// What one leaves in the caches, and what is arranged before the first turn, meets each of the
// others as often as any.
std::vector<size_t> order_of(size_t round, size_t num_contestants) {
  std::vector<size_t> order(num_contestants);
  std::iota(order.begin(), order.end(), 0);
  std::ranges::shuffle(order, std::mt19937_64(round));
  return order;
}

void run_round(benchmark::State &state, const Comparison &comparison, size_t round, Gauge gauge) {
  const std::vector<Contestant> &contestants = comparison.contestants;
  const benchmark::IterationCount num_runs = state.max_iterations;
  std::vector<double> amounts(contestants.size());
  while (state.KeepRunningBatch(num_runs)) {
    for (const Contestant &contestant : contestants) {
      if (contestant.before) contestant.before();
    }
    for (const size_t i : order_of(round, contestants.size())) {
      amounts[i] = measure(contestants[i], num_runs, gauge);
      state.SetIterationTime(amounts[i] * static_cast<double>(num_runs));
    }
    for (const Contestant &contestant : contestants) {
      if (contestant.after) contestant.after();
    }
  }
  state.counters = comparison.counters;
  if (comparison.remainder) {
    count(comparison, *comparison.remainder, amounts, state.counters);
  } else {
    count(contestants, amounts, state.counters);
  }
}

template <size_t kPercent>
double quantile(const std::vector<double> &values) {
  std::vector<double> sorted = values;
  std::ranges::sort(sorted);
  return sorted[(sorted.size() - 1) * kPercent / 100];
}

}  // namespace

Suite::Present &Suite::present(const std::string &name, const std::function<Comparison()> &make) {
  if (!present_ || present_->name != name) {
    present_.reset();
    present_.emplace(Present{name, make()});
  }
  return *present_;
}

void Suite::compare(const std::string &name, const std::function<Comparison()> &make,
                    const Plan &plan) {
  benchmark::internal::Benchmark *benchmark =
      benchmark::RegisterBenchmark(name.c_str(), [=, this](benchmark::State &state) {
        const tee::test::TraceSink log;  // nothing that is measured waits for a terminal
        Present &now = present(name, make);
        run_round(state, now.comparison, now.num_rounds++, plan.gauge);
      });
  benchmark->UseManualTime()
      ->Repetitions(quick ? std::min(plan.rounds, 2) : plan.rounds)
      ->ReportAggregatesOnly()
      ->ComputeStatistics("low", quantile<25>)
      ->ComputeStatistics("high", quantile<75>);
  if (plan.batches && !quick) {
    benchmark->MinTime(kShortestRound);
  } else {
    benchmark->Iterations(1);
  }
}

}  // namespace bench
