// SPDX-License-Identifier: BSD-2-Clause
/// Comparisons as benchmarks. Machines differ and drift, so nothing is measured alone: what is
/// compared runs by turns, and a figure is the median of the rounds' ratios.
///
/// A repetition of a benchmark is one round; its iterations are the runs that each contestant makes
/// in one go. bench/report reads the counters:
///
///     NAME           seconds, or bytes, that one run of NAME takes
///     FIRST / NAME   what the first contestant takes as a part of that
///     NAME target    what this ratio is held to
///     NAME bound     what it would be if nothing were left but the contestant kBound
///
/// A remainder takes the place of the first contestant.
#ifndef BENCH_SUITE_H
#define BENCH_SUITE_H

#include <benchmark/benchmark.h>

#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace bench {

/// Something whose runs are measured. What it does before and after them is not.
struct Contestant {
  std::string name;
  std::function<void()> run;
  std::function<void()> before = {};
  std::function<void()> after = {};
  double target = 0;  // the first contestant takes at most so many times as much; 0: no target
};

/// Name of the contestant that has to do what the first one cannot avoid, and nothing else.
inline constexpr char kBound[] = "bound";

/// What is judged where no contestant is judged as a whole.
struct Remainder {
  std::string name;
  std::function<double(const std::vector<double> &amounts)> of;  // of the contestants, in order
  std::string over = {};  // name of the contestant that it is a multiple of; empty: none
  double target = 0;      // of this multiple; without one, of the remainder itself
};

struct Comparison {
  std::vector<Contestant> contestants;
  benchmark::UserCounters counters = {};  // what else is to be told
  std::optional<Remainder> remainder = {};
};

enum class Gauge {
  kProcessor,  // seconds of this process: others on the machine count little
  kWall,       // seconds, for what waits for a disk
  kHeap,       // bytes that the C library has handed out
};

struct Plan {
  Gauge gauge = Gauge::kProcessor;
  int rounds = 101;     // whole quarters and one, so that quartiles are values of rounds
  bool batches = true;  // short runs in batches; not with something to do before or after each
};

class Suite {
 public:
  bool quick = false;          // a smoke run: proves that everything runs, measures nothing
  std::string work_directory;  // on a disk, for what is durable

  /// Registers the benchmark `name` ("group/case"). When its turn comes, `make` makes what is
  /// compared, which is gone before the next comparison is made.
  void compare(const std::string &name, const std::function<Comparison()> &make,
               const Plan &plan = {});

 private:
  struct Present {
    std::string name;
    Comparison comparison;
    size_t num_rounds = 0;
  };
  Present &present(const std::string &name, const std::function<Comparison()> &make);

  std::optional<Present> present_;
};

// The groups of benchmarks.
void add_exchanges(Suite &suite);
void add_growth(Suite &suite);
void add_capacity(Suite &suite);
void add_base64(Suite &suite);
void add_json(Suite &suite);
void add_tokens(Suite &suite);
void add_signatures(Suite &suite);
void add_storage(Suite &suite);

}  // namespace bench

#endif
