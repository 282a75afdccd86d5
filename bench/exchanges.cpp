// SPDX-License-Identifier: BSD-2-Clause
// Whole exchanges against the cryptography that they cannot do without.
#include "device.h"
#include "floor.h"
#include "groups.h"

namespace bench {
namespace {

constexpr size_t kNumSds = 10;

constexpr double kTargetWithoutImage = 1.10;
constexpr double kTargetWithImage = 1.15;
constexpr double kTargetWithLargeImage = 1.5;

void measure(Bench &bench, Scene &scene, const MessageCase &message, const std::string &name,
             double target) {
  Exchange exchange(scene, message);
  const size_t dsi_len = scene.dsi_text.size();
  exchange.before();
  exchange.run();
  exchange.after();
  const auto floor = [&](Keys keys) -> Contestant {
    const auto works = work_of(message, exchange.request(), exchange.response(), dsi_len, keys);
    return {[works] {
      for (const auto &work : works) work();
    }};
  };
  const Rounds rounds =
      compare({exchange.contestant(), floor(Keys::kAtHand), floor(Keys::kNew)}, bench.effort);
  const auto add = [&](size_t reference, const std::string &row, Target limit) {
    bench.report.figures.push_back({.group = "exchange / floor",
                                    .name = row,
                                    .value = rounds.ratio(0, reference),
                                    .unit = "x",
                                    .target = limit,
                                    .detail = time_text(rounds.seconds(0).median) + " / " +
                                              time_text(rounds.seconds(reference).median)});
  };
  add(1, name, at_most(target));
  add(2, name + ", floor with new keys", {});
}

}  // namespace

void measure_exchanges(Bench &bench) {
  FilledDevice device(kNumSds);
  const auto has_image = [](const MessageCase &message) {
    return !tsm::image_member(message.id).empty();
  };
  for (const MessageCase &message : message_cases()) {
    if (has_image(message)) continue;
    measure(bench, device.scene(), message, message.name, kTargetWithoutImage);
  }
  const struct {
    size_t len;
    const char *text;
    double target;
  } images[] = {{4 << 10, "4 KiB", kTargetWithImage},
                {64 << 10, "64 KiB", kTargetWithImage},
                {1 << 20, "1 MiB", kTargetWithLargeImage}};
  for (const auto &image : images) {
    for (const MessageCase &message : message_cases(image.len)) {
      if (!has_image(message)) continue;
      measure(bench, device.scene(), message, message.name + ", " + image.text, image.target);
    }
  }
}

}  // namespace bench
