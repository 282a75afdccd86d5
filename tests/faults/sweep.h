// SPDX-License-Identifier: BSD-2-Clause
/// One driver for all fault sweeps: a scenario is run with the first call of a kind failing, then
/// with the second, and so on, until a run is not hit any more; after each run everything is
/// checked that must hold whatever failed.
#ifndef FAULTS_SWEEP_H
#define FAULTS_SWEEP_H

#include <set>
#include <string>
#include <vector>

#include "support/scene.h"

namespace otrp_test {

/// What the device is asked while calls fail.
enum class Ask { kMessage, kCreation, kStatusQuery, kDeviceId };

struct Scenario {
  const char *name;
  void (*prepare)(Scene &scene);  // brings the device to the state before
  Ask ask = Ask::kMessage;
  MessageId id = MessageId::kGetDeviceState;
  tsm::RequestOptions options = {};
  /// Codes with which a repeated request may be refused, because it has been carried out.
  std::set<uint32_t> done_codes = {};
  /// Records that a failure may leave behind, outside the order of writes.
  std::set<std::string> may_stay = {};
};

struct FaultKind {
  const char *name;
  tee::test::Fault fault;
  bool and_after;
};

/// Runs the whole sweep. Returns the number of points tried, and fails the test that calls it.
unsigned sweep(const Scenario &scenario, const FaultKind &kind);

/// The scenarios that the sweeps go through, by name.
const std::vector<Scenario> &scenarios();

}  // namespace otrp_test

#endif
