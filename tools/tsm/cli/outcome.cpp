// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/cli/outcome.h"

#include <cstdio>

#include "common/files.h"
#include "common/result_names.h"
#include "tsm/cli/report.h"

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
  if (outcome.errors.empty()) return outcome;
  outcome.exit_code = tools::kExitRefused;
  outcome.kind = refusal.empty() ? "incomplete" : "refused";
  if (done.response.error_code) outcome.reason = tools::code_name(*done.response.error_code);
  return outcome;
}

Outcome outcome_of(const std::function<Outcome()> &step) {
  const auto failed = [](int exit_code, const char *kind, const std::exception &error) {
    return Outcome{.exit_code = exit_code, .errors = {error.what()}, .kind = kind};
  };
  try {
    return step();
  } catch (const NotVerified &error) {
    return failed(kExitNotVerified, "not verified", error);
  } catch (const NoAnswer &error) {
    return failed(tools::kExitRefused, "without an answer", error);
  } catch (const ChannelError &error) {
    Outcome outcome = failed(tools::kExitRefused, "refused", error);
    if (error.code() != 0) outcome.reason = tools::code_name(error.code());
    return outcome;
  } catch (const std::exception &error) {
    return failed(tools::kExitUsage, "not asked", error);
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
