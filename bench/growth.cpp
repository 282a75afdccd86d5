// SPDX-License-Identifier: BSD-2-Clause
// What a message costs on a device with more and more SDs.
#include "device.h"

namespace bench {
namespace {

constexpr double kLargestFactor = 10;  // from 1 SD to the largest number
constexpr double kLargestStep = 10;    // in the last decade: as much as the number of SDs

Comparison devices(MessageId id, const std::vector<size_t> &sizes) {
  Comparison comparison;
  for (const size_t size : sizes) {
    const std::string name = std::to_string(size) + (size == 1 ? " SD" : " SDs");
    comparison.contestants.push_back(
        contestant(name, std::make_shared<Exchange>(filled_device(size), message_case(id))));
  }
  comparison.contestants[1].target = kLargestStep;
  comparison.contestants.back().target = kLargestFactor;
  return comparison;
}

}  // namespace

void add_growth(Suite &suite) {
  std::vector<size_t> sizes = {10, 1};
  if (!suite.quick) sizes.insert(sizes.begin(), {1000, 100});
  for (const MessageCase &message : message_cases()) {
    suite.compare("growth/" + message.name, [sizes, id = message.id] { return devices(id, sizes); },
                  {.rounds = 21, .batches = false});
  }
}

}  // namespace bench
