// SPDX-License-Identifier: BSD-2-Clause
/// What a run measured, as a table and as JSON.
#ifndef FLEET_FIGURES_H
#define FLEET_FIGURES_H

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <vector>

namespace fleet {

class Times {
 public:
  void add(std::chrono::microseconds time) { microseconds_.push_back(time.count()); }
  void add(const Times &others);
  size_t count() const { return microseconds_.size(); }

  /// Milliseconds that `share` of them do not exceed; 0 without any.
  double quantile(double share) const;

 private:
  std::vector<int64_t> microseconds_;
};

struct Figures {
  size_t num_devices = 0;
  size_t num_arrived = 0;  // devices of which a call ended with nothing more to do
  size_t num_calls = 0;
  size_t num_sessions = 0;
  Times exchanges;                         // of the TSM: from a request to its answer
  Times agents;                            // of the device: a message
  Times calls;                             // those that ended so
  std::map<std::string, size_t> messages;  // "create-sd pass"
  std::map<std::string, size_t> failures;  // by reason
  std::chrono::duration<double> time{0};   // of the run

  void add(const Figures &others);  // all but the devices and the time
};

std::string table_of(const Figures &figures);
std::string json_of(const Figures &figures);  // one line

}  // namespace fleet

#endif
