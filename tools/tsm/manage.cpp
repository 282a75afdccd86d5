// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/commands.h"
#include "tsm/exchange.h"
#include "tsm/home.h"
#include "tsm/operator_input.h"
#include "tsm/outcome.h"
#include "tsm/target.h"

namespace tsm {
namespace {

/// What an operator wants of any device.
struct Job {
  const Arguments &arguments;
  const Home &home;
  const Identity &tsm;
  const Order &order;
};

Outcome talk(const Job &job, const Target &target, Channel *channel) {
  DeviceRecord record = job.home.open_record(identify(target, job.home, channel));
  const OutputNames outputs = {job.arguments.dsi_out_file, job.arguments.image_out_file};
  return outcome_of(job.arguments, exchange(job.order, job.tsm, channel, &record, outputs));
}

Outcome manage(const Job &job, const Target &target) {
  std::unique_ptr<Channel> channel;
  Outcome outcome = outcome_of([&] {
    channel = open_channel(target);
    return talk(job, target, channel.get());
  });
  if (channel) outcome.log = channel->take_log();
  return outcome;
}

}  // namespace

int run_manage(const Arguments &arguments) {
  const Home home(arguments.home);
  const Identity tsm = home.load_identity();
  const Target target = target_of(arguments);
  const Order order = read_order(arguments);
  return print_outcome(manage({arguments, home, tsm, order}, target), arguments.trace);
}

}  // namespace tsm
