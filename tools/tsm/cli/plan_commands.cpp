// SPDX-License-Identifier: BSD-2-Clause
// `plan` says which messages would bring devices to a plan, `apply` sends them.

#include <sstream>

#include "common/error_line.h"
#include "common/files.h"
#include "tsm/cli/commands.h"
#include "tsm/cli/exchange.h"
#include "tsm/cli/jobs.h"
#include "tsm/cli/outcome.h"
#include "tsm/cli/target.h"
#include "tsm/home/home.h"
#include "tsm/plan/decision.h"

namespace tsm {
namespace {

/// What is known of the device on its way: a file of its record, which is held meanwhile.
class KeptProgress {
 public:
  explicit KeptProgress(const DeviceRecord &record) : file_(record.folder() + "/plan.json") {}

  /// What cannot be read is asked for again.
  Progress load() const {
    if (!tools::file_exists(file_)) return {};
    return parse_progress(parse_json(tools::read_file(file_)).value_or(Json()));
  }
  void save(const Progress &progress) const {
    tools::write_file(file_, progress_json(progress).dump(2) + "\n");
  }

 private:
  std::string file_;
};

struct PlanWish {
  const Arguments &arguments;
  const Home &home;
  const Identity &tsm;
  const Plan &plan;
  bool only_tells;
};

/// One device on its way.
class Walk {
 public:
  Walk(const PlanWish &wish, Channel *channel, DeviceRecord *record)
      : wish_(wish), channel_(channel), record_(record), kept_(*record), progress_(kept_.load()) {}

  Outcome go() {
    begin_session(&progress_);
    for (;;) {
      const Decision decision = decide(wish_.plan, progress_);
      if (!decision.order) return end(decision.obstacles);
      const bool is_told = wish_.only_tells && changes_device(*decision.order);
      const std::string came = is_told ? "" : ask(*decision.order);
      if (is_told) imagine(*decision.order, &progress_);
      if (changes_device(*decision.order)) note(decision, came);
    }
  }

 private:
  /// Returns what came of it. Until that is known, it is in doubt, also for a next process.
  std::string ask(const Order &order) {
    Progress in_doubt = progress_;
    learn_nothing(order, "", &in_doubt);
    if (changes_device(order)) kept_.save(in_doubt);
    std::string came = "pass";
    try {
      const Exchange done = exchange(order, wish_.tsm, channel_, record_);
      const std::string refusal = refusal_of(done.response);
      if (!refusal.empty()) came = refusal;
      learn(order, done.response, refusal, &progress_);
    } catch (const NoAnswer &) {
      throw;
    } catch (const ChannelError &error) {
      came = error.what();
      learn_nothing(order, came, &progress_);
    }
    kept_.save(progress_);
    return came;
  }

  void note(const Decision &decision, const std::string &came) {
    const RequestOptions &options = decision.order->options;
    Json step = {{"message", message_of(decision.order->message).command},
                 {"sd", options.sdname},
                 {"reason", decision.reason}};
    if (!options.taid.empty()) step["taid"] = options.taid;
    if (!came.empty()) step["outcome"] = came;
    steps_.push_back(step);
    lines_ += order_text(*decision.order) + " (" + decision.reason + ")" +
              (came.empty() ? "" : ": " + came) + "\n";
  }

  Outcome end(const std::vector<std::string> &obstacles) {
    Outcome outcome;
    if (!obstacles.empty()) {
      outcome = {.exit_code = tools::kExitRefused, .errors = obstacles, .kind = "in the way"};
    } else if (!wish_.only_tells) {
      settle(&progress_);
      kept_.save(progress_);
    }
    if (wish_.arguments.json) {
      outcome.report = Json{{"messages", steps_}, {"obstacles", obstacles}}.dump(2) + "\n";
    } else {
      const bool is_met = obstacles.empty() && (lines_.empty() || !wish_.only_tells);
      outcome.report = lines_ + (is_met ? "as planned\n" : "");
    }
    return outcome;
  }

  const PlanWish &wish_;
  Channel *channel_;
  DeviceRecord *record_;
  KeptProgress kept_;
  Progress progress_;
  Json steps_ = Json::array();
  std::string lines_;
};

Outcome walk(const PlanWish &wish, const Target &target) {
  std::unique_ptr<Channel> channel;
  Outcome outcome = outcome_of([&] {
    channel = open_channel(target);
    DeviceRecord record = wish.home.open_record(identify(target, wish.home, channel.get()));
    return Walk(wish, channel.get(), &record).go();
  });
  if (channel) outcome.log = channel->take_log();
  return outcome;
}

void print_reports(const std::vector<std::string> &names, const std::vector<Outcome> &outcomes,
                   bool as_json) {
  Json list = Json::array();
  std::string lines;
  for (size_t i = 0; i < names.size(); ++i) {
    if (as_json) {
      list.push_back({{"device", names[i]}, {"exit", outcomes[i].exit_code}});
      if (!outcomes[i].report.empty()) list.back().update(Json::parse(outcomes[i].report));
      if (!outcomes[i].errors.empty()) list.back()["errors"] = outcomes[i].errors;
      continue;
    }
    std::istringstream report(outcomes[i].report);
    for (std::string line; std::getline(report, line);) lines += names[i] + ": " + line + "\n";
  }
  tools::write_file("-", as_json ? list.dump(2) + "\n" : lines);
}

int run(const Arguments &arguments, bool only_tells) {
  const Plan plan = read_plan(arguments.plan_file);
  const Home home(arguments.home);
  const Identity tsm = home.load_identity();
  const std::vector<Target> targets = targets_of(arguments, home);
  const PlanWish wish = {arguments, home, tsm, plan, only_tells};
  if (!names_several(arguments)) {
    return print_outcome(walk(wish, targets.front()), arguments.trace);
  }
  Jobs jobs = {.names = {},
               .work = [&](size_t i) { return walk(wish, targets[i]); },
               .num_at_once = arguments.num_jobs,
               .wants_logs = arguments.trace};
  for (const Target &target : targets) jobs.names.push_back(target.name);
  const std::vector<Outcome> outcomes = run_jobs(jobs);
  if (only_tells || arguments.json) print_reports(jobs.names, outcomes, arguments.json);
  if (!only_tells && !arguments.json) {
    tools::write_file("-", summary_of(jobs.names, outcomes, "as planned") + "\n");
  }
  return exit_code_of(outcomes);
}

}  // namespace

int run_plan(const Arguments &arguments) {
  return run(arguments, true);
}

int run_apply(const Arguments &arguments) {
  return run(arguments, false);
}

}  // namespace tsm
