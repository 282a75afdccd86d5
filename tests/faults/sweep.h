// SPDX-License-Identifier: BSD-2-Clause
/// One driver for all fault sweeps: a scenario is run with the first call of a kind failing, then
/// with the second, and so on, until a run is not hit any more. Of a full heap every size is tried
/// that makes a difference, down from the one that suffices. After each run everything is checked
/// that must hold whatever failed.
#ifndef FAULTS_SWEEP_H
#define FAULTS_SWEEP_H

#include <tee_test.h>

#include <memory>
#include <ostream>
#include <set>
#include <string>

#include "support/scene.h"

namespace otrp_test {

/// What the device is asked while calls fail.
enum class Ask { kMessage, kCreation, kStatusQuery, kDeviceId };

struct Scenario {
  const char *name;
  void (*prepare)(Scene &scene);  // brings the device to the state before
  MessageId id = MessageId::kGetDeviceState;
  /// What such a request never does: a sweep of that has no points.
  std::set<tee::test::Fault> never = {};
  void (*change)(tsm::RequestOptions &) = nullptr;  // of the usual request
  /// Codes with which a repeated request may be refused, because it has been carried out.
  std::set<uint32_t> done_codes = {};
  /// Records that a failure may leave behind, outside the order of writes.
  std::set<std::string> may_stay = {};
  Ask ask = Ask::kMessage;

  friend std::ostream &operator<<(std::ostream &out, const Scenario &scenario) {
    return out << scenario.name;
  }
};

struct FaultKind {
  const char *name;
  tee::test::Fault fault;
  bool and_after = false;
  bool create_at_once = false;  // on storage that makes each creation durable in its own call
  TEE_Result code = 0;          // in place of the natural one
  unsigned step = 1;            // from one point to the next
  /// Records whose ID begins with this are so long that nothing takes more memory than to read one.
  const char *long_records = nullptr;
};

/// The TSM manages the device as ever, and ends with one that holds nothing.
void live_on(Scene &scene);

class Sweep {
 public:
  explicit Sweep(const Scenario &scenario);
  ~Sweep();

  /// Returns the number of points tried, and fails the test that calls it.
  unsigned run(const FaultKind &kind);

  /// What the log said at one point or another, as rows of log_rows.txt.
  const std::set<std::string> &log_rows() const;

 private:
  class Driver;
  std::unique_ptr<Driver> driver_;
};

}  // namespace otrp_test

#endif
