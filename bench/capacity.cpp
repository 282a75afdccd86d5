// SPDX-License-Identifier: BSD-2-Clause
// What fits a device whose agent has a heap of 2 MiB.
#include <tee_test.h>

#include "device.h"

namespace bench {
namespace {

constexpr size_t kSmallestImage = 1 << 10;
constexpr size_t kImageAbove = 2 << 20;  // does not fit for certain
constexpr size_t kSdsAbove = 9999;
constexpr double kImageTarget = 1.40 * (1 << 20);
constexpr double kSdsTarget = 1000;

/// The largest number below `above` that works, where all smaller ones do; `below` works.
size_t find_limit(size_t below, size_t above, size_t step,
                  const std::function<bool(size_t)> &works) {
  while (above - below > step) {
    const size_t middle = below + (above - below) / 2;
    (works(middle) ? below : above) = middle;
  }
  return below;
}

bool takes_image(const Scene &first, size_t len) {
  const auto scene = start(first, first.device.snapshot());
  return scene && Exchange(scene, message_case(MessageId::kInstallTa, len)).try_once();
}

// All eight in an order in which each finds what it needs, on one running instance.
bool takes_all_messages(const Scene &first, size_t num_sds) {
  const auto scene = start(first, filled(first.device.snapshot(), num_sds));
  if (!scene) return false;
  const MessageId order[] = {MessageId::kCreateSd,  MessageId::kInstallTa, MessageId::kUpdateTa,
                             MessageId::kGetTaInfo, MessageId::kUpdateSd,  MessageId::kDeleteTa,
                             MessageId::kDeleteSd};
  for (const MessageId id : order) {
    MessageCase message = message_case(id);
    message.arrange = nullptr;
    if (id == MessageId::kUpdateSd) {
      message.options.spcert = "renewed certificate";
      message.options.renew_aik = true;
    }
    if (!Exchange(scene, message).try_once()) return false;
  }
  return true;
}

size_t largest_image(bool quick) {
  Scene first;
  make_first_sd(first);
  return find_limit(kSmallestImage, quick ? 3 * kSmallestImage : kImageAbove, 1024,
                    [&](size_t len) { return takes_image(first, len); });
}

size_t most_sds(bool quick) {
  Scene first;
  make_first_sd(first);
  return find_limit(1, quick ? 4 : kSdsAbove, 1,
                    [&](size_t num_sds) { return takes_all_messages(first, num_sds); });
}

// The peak is counted from the start of an instance, which lists the SDs in their stored order.
benchmark::UserCounters peak_of(MessageCase message, size_t num_sds) {
  const auto scene = filled_device(num_sds);
  if (message.arrange != nullptr) message.arrange(*scene);
  message.arrange = message.restore = nullptr;
  scene->device.restart();
  Exchange(scene, message_case(MessageId::kGetDeviceState)).try_once();
  scene->device.restart();

  Exchange exchange(scene, message);
  exchange.before();
  exchange.run();
  const tee_heap_stats stats = scene->device.stats();
  exchange.after();
  return {{"bytes", static_cast<double>(stats.peak)},
          {"blocks", static_cast<double>(stats.peak_blocks)}};
}

void add(const std::string &name, const std::function<benchmark::UserCounters()> &find) {
  const auto run = [find](benchmark::State &state) {
    const tee::test::TraceSink log;
    while (state.KeepRunning()) state.counters = find();
  };
  benchmark::RegisterBenchmark(name.c_str(), run)->Iterations(1);
}

void add_limit(bool quick, const std::string &name, const std::string &unit,
               size_t (*find)(bool quick), double target) {
  add("capacity/" + name, [=] {
    benchmark::UserCounters counters = {{unit, static_cast<double>(find(quick))}};
    if (!quick) counters[unit + " target"] = target;
    return counters;
  });
}

}  // namespace

void add_capacity(Suite &suite) {
  add_limit(suite.quick, "largest image that InstallTA takes", "bytes", largest_image,
            kImageTarget);
  add_limit(suite.quick, "SDs with two TAs each, all messages working", "SDs", most_sds,
            kSdsTarget);
  for (const size_t num_sds : {10, 100}) {
    if (suite.quick && num_sds > 10) break;
    for (const MessageCase &message : message_cases()) {
      add("heap/" + message.name + ", " + std::to_string(num_sds) + " SDs",
          [message, num_sds] { return peak_of(message, num_sds); });
    }
  }
}

}  // namespace bench
