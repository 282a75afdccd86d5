// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/outcome.h"

#include <cstdio>

#include "common/files.h"
#include "tsm/report.h"

namespace tsm {

Outcome outcome_of(const Arguments &arguments, const Exchange &done) {
  Outcome outcome;
  std::string refusal = refusal_of(done.response);
  if (!refusal.empty() && done.tie != Tie::kIds) {
    refusal += "; tied by " + std::string(tie_text(done.tie));
  }
  if (arguments.json) {
    outcome.report = report_json(done.response, done.tie).dump(2) + "\n";
  } else if (refusal.empty() && arguments.dsi_out_file != "-") {
    outcome.report = report_lines(done.response, done.tie);
  }
  for (const std::string &failure : {refusal, done.failure}) {
    if (!failure.empty()) outcome.errors.push_back(failure);
  }
  outcome.exit_code = outcome.errors.empty() ? 0 : tools::kExitRefused;
  return outcome;
}

Outcome outcome_of(const std::function<Outcome()> &step) {
  const auto failed = [](int exit_code, const std::exception &error) {
    return Outcome{.exit_code = exit_code, .errors = {error.what()}};
  };
  try {
    return step();
  } catch (const NotVerified &error) {
    return failed(kExitNotVerified, error);
  } catch (const ChannelError &error) {
    return failed(tools::kExitRefused, error);
  } catch (const std::exception &error) {
    return failed(tools::kExitUsage, error);
  }
}

int print_outcome(const Outcome &outcome, bool wants_log) {
  if (wants_log || outcome.exit_code != 0) {
    fwrite(outcome.log.data(), 1, outcome.log.size(), stderr);
  }
  if (!outcome.report.empty()) tools::write_file("-", outcome.report);
  for (const std::string &error : outcome.errors) tools::print_error_line("otrp-tsm", error);
  return outcome.exit_code;
}

}  // namespace tsm
