// SPDX-License-Identifier: BSD-2-Clause
// Whole exchanges against the cryptography that they cannot do without.
#include "device.h"
#include "floor.h"

namespace bench {
namespace {

constexpr size_t kNumSds = 10;

constexpr double kTargetWithoutImage = 1.10;
constexpr double kTargetWithImage = 1.15;
constexpr double kTargetWithLargeImage = 1.5;

Comparison exchange_and_floor(const MessageCase &message, double target) {
  const auto exchange = std::make_shared<Exchange>(filled_device(kNumSds), message);
  const size_t dsi_len = exchange->scene().dsi_text.size();
  exchange->before();
  exchange->run();
  exchange->after();
  const auto work = [&](Depth depth) {
    return work_of(message, exchange->request(), exchange->response(), dsi_len, depth);
  };
  return {{contestant("exchange", exchange),
           {.name = "floor", .run = work(Depth::kCryptography), .target = target},
           {.name = kBound, .run = work(Depth::kWithRules)}}};
}

bool has_image(const MessageCase &message) {
  return !tsm::image_member(message.id).empty();
}

void add(Suite &suite, const std::string &name, const MessageCase &message, double target) {
  suite.compare("exchanges/" + name, [=] { return exchange_and_floor(message, target); },
                {.batches = false});
}

}  // namespace

void add_exchanges(Suite &suite) {
  for (const MessageCase &message : message_cases()) {
    if (!has_image(message)) add(suite, message.name, message, kTargetWithoutImage);
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
      add(suite, message.name + ", " + image.text, message, image.target);
    }
  }
}

}  // namespace bench
