// SPDX-License-Identifier: BSD-2-Clause
/// Timing by turns. Machines differ and drift, so no time stands alone: whatever is compared runs
/// alternately, round after round, and a figure is the median of the rounds' ratios.
#ifndef BENCH_HARNESS_H
#define BENCH_HARNESS_H

#include <functional>
#include <string>
#include <vector>

namespace bench {

/// Processor time leaves out what other processes take; what waits for a disk needs the wall clock.
enum class Clock { kProcessor, kWall };

/// Something whose runs are timed. What it does before and after a run is not.
struct Contestant {
  std::function<void()> run;
  std::function<void()> before = {};
  std::function<void()> after = {};
};

/// The median, and the quartiles around it.
struct Spread {
  double median = 0;
  double low = 0;
  double high = 0;
};
Spread spread_of(std::vector<double> values);

struct Effort {
  double seconds = 1.5;  // for one comparison, after which no new round begins
  size_t min_rounds = 11;
  size_t max_rounds = 301;
  bool quick = false;  // a smoke run: proves that everything runs, measures nothing
};
constexpr Effort kQuick = {.seconds = 0, .min_rounds = 2, .max_rounds = 2, .quick = true};

/// Seconds per run of every contestant, round by round.
class Rounds {
 public:
  explicit Rounds(size_t num_contestants) : seconds_(num_contestants) {}
  void add(size_t contestant, double seconds) { seconds_[contestant].push_back(seconds); }

  Spread seconds(size_t contestant) const { return spread_of(seconds_[contestant]); }
  Spread ratio(size_t subject, size_t reference) const;
  /// The base 10 logarithms of the ratios.
  Spread decades(size_t subject, size_t reference) const;

 private:
  std::vector<double> ratios(size_t subject, size_t reference) const;

  std::vector<std::vector<double>> seconds_;
};

/// Short runs are timed in batches, unless there is something to do before or after each.
Rounds compare(const std::vector<Contestant> &contestants, const Effort &effort,
               Clock clock = Clock::kProcessor);

/// The compiler has to make the value.
template <class T>
void keep(T &&value) {
  __asm__ __volatile__("" : : "g"(&value) : "memory");
}

}  // namespace bench

#endif
