// SPDX-License-Identifier: BSD-2-Clause
/// What the benchmark found: figures with their targets, and the curves of the growth chart.
#ifndef BENCH_REPORT_H
#define BENCH_REPORT_H

#include <optional>
#include <string>
#include <vector>

#include "harness.h"

namespace bench {

enum class Bound { kNone, kAtMost, kAtLeast };

struct Target {
  Bound bound = Bound::kNone;
  double value = 0;
};
constexpr Target at_most(double value) {
  return {Bound::kAtMost, value};
}
constexpr Target at_least(double value) {
  return {Bound::kAtLeast, value};
}

struct Figure {
  std::string group;
  std::string name;
  Spread value;
  std::string unit;  // "x" for a ratio
  Target target = {};
  std::string detail = {};  // what the ratio is made of
};

struct Curve {
  std::string name;
  struct Point {
    double num_sds;
    double seconds;
  };
  std::vector<Point> points;
};

struct Report {
  std::vector<Figure> figures;
  std::vector<Curve> growth;

  std::string json(bool quick) const;
};

/// "1.24 ms".
std::string time_text(double seconds);

}  // namespace bench

#endif
