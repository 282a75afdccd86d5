// SPDX-License-Identifier: BSD-2-Clause
// What a message costs on a device with more and more SDs.
#include <cmath>
#include <memory>

#include "device.h"
#include "groups.h"

namespace bench {
namespace {

constexpr double kLargestExponent = 1.0;
constexpr double kLargestFactor = 10;

using Devices = std::vector<std::unique_ptr<FilledDevice>>;

void measure(Bench &bench, Devices &devices, const std::vector<size_t> &sizes, MessageId id) {
  std::vector<std::unique_ptr<Exchange>> exchanges;
  std::vector<Contestant> contestants;
  for (const auto &device : devices) {
    exchanges.push_back(std::make_unique<Exchange>(device->scene(), message_case(id)));
    contestants.push_back(exchanges.back()->contestant());
  }
  const Rounds rounds = compare(contestants, bench.effort);

  Curve curve = {message_case(id).name, {}};
  for (size_t i = 0; i < sizes.size(); ++i) {
    curve.points.push_back({static_cast<double>(sizes[i]), rounds.seconds(i).median});
  }
  const size_t last = sizes.size() - 1;
  const std::string most = std::to_string(sizes[last]);
  const std::string times = time_text(curve.points.front().seconds) + " with 1, " +
                            time_text(curve.points[last].seconds) + " with " + most;
  bench.report.figures.push_back({.group = "growth",
                                  .name = curve.name + ", exponent up to " + most + " SDs",
                                  .value = rounds.decades(last, last - 1),
                                  .unit = "",
                                  .target = at_most(kLargestExponent),
                                  .detail = times});
  bench.report.figures.push_back({.group = "growth",
                                  .name = curve.name + ", " + most + " SDs / 1 SD",
                                  .value = rounds.ratio(last, 0),
                                  .unit = "x",
                                  .target = at_most(kLargestFactor),
                                  .detail = times});
  bench.report.growth.push_back(std::move(curve));
}

}  // namespace

// The exponent is that of the last decade: before it, what every message costs hides the growth.
void measure_growth(Bench &bench) {
  std::vector<size_t> sizes = {1, 10};
  if (!bench.effort.quick) sizes.insert(sizes.end(), {100, 1000});
  Devices devices;
  for (const size_t size : sizes) devices.push_back(std::make_unique<FilledDevice>(size));
  for (const MessageCase &message : message_cases()) measure(bench, devices, sizes, message.id);
}

}  // namespace bench
