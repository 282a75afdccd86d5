// SPDX-License-Identifier: BSD-2-Clause
#include "common/files.h"
#include "tsm/cli/commands.h"
#include "tsm/cli/exchange.h"
#include "tsm/cli/jobs.h"
#include "tsm/cli/operator_input.h"
#include "tsm/cli/outcome.h"
#include "tsm/cli/target.h"
#include "tsm/home/home.h"

namespace tsm {
namespace {

/// What an operator wants of any device.
struct Wish {
  const Arguments &arguments;
  const Home &home;
  const Identity &tsm;
  const Order &order;
};

Outcome talk(const Wish &wish, const Target &target, Channel *channel) {
  DeviceRecord record = wish.home.open_record(identify(target, wish.home, channel));
  const OutputNames outputs = {wish.arguments.dsi_out_file, wish.arguments.image_out_file};
  return outcome_of(wish.arguments, exchange(wish.order, wish.tsm, channel, &record, outputs));
}

Outcome manage(const Wish &wish, const Target &target) {
  std::unique_ptr<Channel> channel;
  Outcome outcome = outcome_of([&] {
    channel = open_channel(target);
    return talk(wish, target, channel.get());
  });
  if (channel) outcome.log = channel->take_log();
  return outcome;
}

Json device_outcome(const std::string &name, const Outcome &outcome) {
  Json value = {{"device", name}, {"exit", outcome.exit_code}};
  if (!outcome.kind.empty()) value["outcome"] = outcome.kind;
  if (!outcome.reason.empty()) value["reason"] = outcome.reason;
  if (!outcome.errors.empty()) value["errors"] = outcome.errors;
  if (!outcome.report.empty()) value["answer"] = Json::parse(outcome.report);
  return value;
}

int manage_several(const Wish &wish, const std::vector<Target> &targets) {
  if (!wish.arguments.dsi_out_file.empty() || !wish.arguments.image_out_file.empty()) {
    throw tools::UsageError("--dsi-out and --image-out are for one device: expected --on NAME");
  }
  Jobs jobs = {.names = {},
               .work = [&](size_t i) { return manage(wish, targets[i]); },
               .num_at_once = wish.arguments.num_jobs,
               .wants_logs = wish.arguments.trace};
  for (const Target &target : targets) jobs.names.push_back(target.name);
  const std::vector<Outcome> outcomes = run_jobs(jobs);
  Json list = Json::array();
  for (size_t i = 0; wish.arguments.json && i < outcomes.size(); ++i) {
    list.push_back(device_outcome(jobs.names[i], outcomes[i]));
  }
  tools::write_file("-", wish.arguments.json ? list.dump(2) + "\n"
                                             : summary_of(jobs.names, outcomes, "pass") + "\n");
  return exit_code_of(outcomes);
}

}  // namespace

int run_manage(const Arguments &arguments) {
  const Home home(arguments.home);
  const Identity tsm = home.load_identity();
  const std::vector<Target> targets = targets_of(arguments, home);
  const Order order = read_order(arguments);
  const Wish wish = {arguments, home, tsm, order};
  if (names_several(arguments)) return manage_several(wish, targets);
  return print_outcome(manage(wish, targets.front()), arguments.trace);
}

}  // namespace tsm
