// SPDX-License-Identifier: BSD-2-Clause
/// What came of a message to one device, as the operator is told.
#ifndef TSM_CLI_OUTCOME_H
#define TSM_CLI_OUTCOME_H

#include <functional>
#include <string>
#include <vector>

#include "tsm/cli/commands.h"
#include "tsm/cli/exchange.h"

namespace tsm {

struct Outcome {
  int exit_code = 0;
  std::string report = {};               // for standard output; JSON where that was asked for
  std::vector<std::string> errors = {};  // a line of standard error each
  std::string log = {};                  // what the device logged
  std::string kind = {};                 // of failure, in a word or two: "refused"
  std::string reason = {};               // name of a result code, where there is one
};

/// Of an answer that is verified and kept.
Outcome outcome_of(const Arguments &arguments, const Exchange &done);

/// Of `step`, also when it throws.
Outcome outcome_of(const std::function<Outcome()> &step);

/// Prints it, with the log when something failed or all of it is wanted; returns the exit code.
int print_outcome(const Outcome &outcome, bool wants_log);

}  // namespace tsm

#endif
