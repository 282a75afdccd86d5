// SPDX-License-Identifier: BSD-2-Clause
/// Work for several devices at once, and what the operator sees of it.
#ifndef TSM_CLI_JOBS_H
#define TSM_CLI_JOBS_H

#include <functional>
#include <string>
#include <vector>

#include "tsm/cli/outcome.h"

namespace tsm {

struct Jobs {
  std::vector<std::string> names;       // of the devices
  std::function<Outcome(size_t)> work;  // on the device of this index; from any thread
  unsigned num_at_once = 1;
  bool wants_logs = false;
};

/// Does it. While it goes on, what fails is told on standard error, behind the device's name, and
/// on a terminal how far it is. The outcomes are in the order of the names.
std::vector<Outcome> run_jobs(const Jobs &jobs);

/// `48 pass, 2 refused: OTRP_SD_EXISTS (d07, d31)`; `success` is what "pass" is called.
std::string summary_of(const std::vector<std::string> &names, const std::vector<Outcome> &outcomes,
                       const std::string &success);

/// `d01, d02, d03 and 40 more`
std::string some_names(const std::vector<std::string> &names);

/// The worst of the exit codes.
int exit_code_of(const std::vector<Outcome> &outcomes);

}  // namespace tsm

#endif
