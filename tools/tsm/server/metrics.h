// SPDX-License-Identifier: BSD-2-Clause
/// What a server counts of itself, in the text format that Prometheus reads. A restart begins anew,
/// which whoever reads it expects.
#ifndef TSM_SERVER_METRICS_H
#define TSM_SERVER_METRICS_H

#include <array>
#include <chrono>
#include <cstdint>
#include <map>
#include <mutex>
#include <string>
#include <utility>

#include "tsm/server/door.h"

namespace tsm {

/// What the store counts, for all servers together.
struct FleetCounts {
  StandingCounts devices = {};
  uint64_t num_open = 0;
};

FleetCounts count_fleet(Store *store);

/// For any number of threads.
class Metrics {
 public:
  void count_exchange(const DoorAnswer &answer, std::chrono::duration<double> time);
  void count_failure();           // of the store
  void count_status(int status);  // of HTTP, of all that is answered

  std::string text(const FleetCounts &fleet) const;

 private:
  static constexpr std::array<double, 11> kBounds = {.001, .0025, .005, .01, .025, .05,
                                                     .1,   .25,   .5,   1,   2.5};
  struct Histogram {
    std::array<uint64_t, kBounds.size() + 1> counts = {};
    double sum = 0;
  };

  mutable std::mutex lock_;  // of all below
  std::map<std::pair<std::string, std::string>, uint64_t> exchanges_;
  std::map<std::string, Histogram> seconds_;
  std::map<std::string, uint64_t> lost_;
  std::map<int, uint64_t> statuses_;
};

}  // namespace tsm

#endif
