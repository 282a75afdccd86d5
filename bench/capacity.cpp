// SPDX-License-Identifier: BSD-2-Clause
// What fits a device whose agent has a heap of 2 MiB.
#include <tee_test.h>

#include <functional>

#include "device.h"
#include "groups.h"

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

Spread exactly(size_t value) {
  const auto number = static_cast<double>(value);
  return {number, number, number};
}

struct Trial {
  Scene scene;

  Trial(const Scene &first, const Snapshot &snapshot) : scene(first, snapshot) {}
  bool start() { return scene.device.open() && send(message_case(MessageId::kGetDeviceState)); }
  bool send(const MessageCase &message) { return Exchange(scene, message).try_once(); }
};

bool takes_image(const Scene &first, const Snapshot &snapshot, size_t len) {
  Trial trial(first, snapshot);
  return trial.start() && trial.send(message_case(MessageId::kInstallTa, len));
}

// All eight in an order in which each finds what it needs, on one running instance.
bool takes_all_messages(const Scene &first, const Snapshot &snapshot) {
  Trial trial(first, snapshot);
  if (!trial.start()) return false;
  MessageCase renewal = message_case(MessageId::kUpdateSd);
  renewal.options.spcert = "renewed certificate";
  renewal.options.renew_aik = true;
  const MessageId order[] = {MessageId::kCreateSd,  MessageId::kInstallTa, MessageId::kUpdateTa,
                             MessageId::kGetTaInfo, MessageId::kUpdateSd,  MessageId::kDeleteTa,
                             MessageId::kDeleteSd};
  for (const MessageId id : order) {
    MessageCase message = id == MessageId::kUpdateSd ? renewal : message_case(id);
    message.arrange = nullptr;
    if (!trial.send(message)) return false;
  }
  return true;
}

void measure_limits(Bench &bench, const Scene &first, const Snapshot &snapshot) {
  const bool quick = bench.effort.quick;
  const size_t image = find_limit(kSmallestImage, quick ? 3 * kSmallestImage : kImageAbove, 1024,
                                  [&](size_t len) { return takes_image(first, snapshot, len); });
  const size_t num_sds = find_limit(1, quick ? 4 : kSdsAbove, 1, [&](size_t num) {
    return takes_all_messages(first, filled(snapshot, num));
  });
  bench.report.figures.push_back({.group = "capacity",
                                  .name = "largest image that InstallTA takes",
                                  .value = exactly(image),
                                  .unit = "bytes",
                                  .target = quick ? Target{} : at_least(kImageTarget)});
  bench.report.figures.push_back({.group = "capacity",
                                  .name = "SDs with two TAs each, all messages working",
                                  .value = exactly(num_sds),
                                  .unit = "SDs",
                                  .target = quick ? Target{} : at_least(kSdsTarget)});
}

void measure_peak(Bench &bench, Scene &scene, const MessageCase &message, const std::string &name) {
  Exchange exchange(scene, message);
  exchange.before();
  exchange.run();
  const tee_heap_stats stats = scene.device.stats();
  exchange.after();
  bench.report.figures.push_back({.group = "heap peak",
                                  .name = name,
                                  .value = exactly(stats.peak),
                                  .unit = "bytes",
                                  .detail = std::to_string(stats.peak_blocks) + " blocks"});
}

void measure_peaks(Bench &bench, size_t num_sds) {
  for (const MessageCase &message : message_cases()) {
    FilledDevice device(num_sds);
    Scene fresh(device.scene(), device.snapshot());
    if (message.arrange != nullptr) {
      if (!fresh.device.open()) throw std::runtime_error("the device did not start");
      message.arrange(fresh);
    }
    fresh.device.restart();  // the peak is counted from here
    MessageCase alone = message;
    alone.arrange = alone.restore = nullptr;
    // A new instance lists the SDs in their stored order.
    Exchange(fresh, message_case(MessageId::kGetDeviceState)).try_once();
    fresh.device.restart();
    measure_peak(bench, fresh, alone, message.name + ", " + std::to_string(num_sds) + " SDs");
  }
}

}  // namespace

void measure_capacity(Bench &bench) {
  tee::test::reuse_generated_keys(4);
  Scene first;
  make_first_sd(first);
  measure_limits(bench, first, first.device.snapshot());
  tee::test::reuse_generated_keys(0);
  measure_peaks(bench, 10);
  if (!bench.effort.quick) measure_peaks(bench, 100);
}

}  // namespace bench
