// SPDX-License-Identifier: BSD-2-Clause
// Whole exchanges against the cryptography that they cannot do without, and against the same in
// other libraries.
#include "device.h"
#include "floor.h"
#include "rivals.h"

namespace bench {
namespace {

constexpr size_t kNumSds = 10;
constexpr int kNumRounds = 301;  // a hundredth is less than one round differs from the next

constexpr double kTargetWithImage = 2.2;
constexpr double kTargetWithLargeImage = 1.7;
constexpr double kTargetOverBound = 1.10;

constexpr size_t kSmallImage = 4 << 10;
constexpr size_t kLargeImage = 1 << 20;
constexpr double kRestOfImageTarget = 0.5e-3;

double target_of(MessageId id) {
  switch (id) {
    case MessageId::kGetDeviceState:
      return 2.5;
    case MessageId::kGetTaInfo:
      return 2.0;
    default:
      return 2.2;
  }
}

// An exchange that took place once: what it consists of is known.
struct Sample {
  explicit Sample(MessageCase of)
      : message(std::move(of)),
        exchange(std::make_shared<Exchange>(filled_device(kNumSds), message)),
        dsi_len(exchange->scene().dsi_text.size()) {
    exchange->before();
    exchange->run();
    exchange->after();
  }

  Work work(Depth depth) const {
    return work_of(message, exchange->request(), exchange->response(), dsi_len, depth);
  }
  JoseParts parts() const { return jose_parts_of(exchange->request(), exchange->response()); }

  const MessageCase message;
  const std::shared_ptr<Exchange> exchange;
  const size_t dsi_len;
};

bool has_rivals(MessageId id) {
  return id == MessageId::kCreateSd || id == MessageId::kGetDeviceState;
}

Comparison exchange_and_floor(const MessageCase &message, double target) {
  const Sample sample(message);
  Comparison comparison = {
      {contestant("exchange", sample.exchange),
       {.name = "floor", .run = sample.work(Depth::kCryptography), .target = target},
       {.name = kBound, .run = sample.work(Depth::kWithRules), .target = kTargetOverBound}}};
  if (!has_rivals(message.id)) return comparison;
  for (const JoseLibrary &library : known<JoseLibrary>()) {
    comparison.contestants.push_back({.name = std::string("the same with ") + library.name,
                                      .run = same_work(library, sample.parts()),
                                      .target = library.exchange_target});
  }
  return comparison;
}

// What a large image takes more than a small one, less the cryptography, base64 and copies of
// both: for each MiB.
Comparison rest_of_image(MessageId id) {
  const Sample large(message_case(id, kLargeImage));
  const Sample small(message_case(id, kSmallImage));
  return {{contestant("exchange", large.exchange),
           contestant("exchange with a small image", small.exchange),
           {"its bytes", large.work(Depth::kWithCopies)},
           {"bytes of a small image", small.work(Depth::kWithCopies)}},
          {},
          Remainder{.name = "rest",
                    .of =
                        [](const std::vector<double> &seconds) {
                          const double rest = (seconds[0] - seconds[1]) - (seconds[2] - seconds[3]);
                          return rest * (1 << 20) / (kLargeImage - kSmallImage);
                        },
                    .target = kRestOfImageTarget}};
}

bool has_image(const MessageCase &message) {
  return !tsm::image_member(message.id).empty();
}

void add(Suite &suite, const std::string &name, const MessageCase &message, double target) {
  suite.compare("exchanges/" + name, [=] { return exchange_and_floor(message, target); },
                {.rounds = kNumRounds, .batches = false});
}

}  // namespace

void add_exchanges(Suite &suite) {
  for (const MessageCase &message : message_cases()) {
    if (!has_image(message)) add(suite, message.name, message, target_of(message.id));
  }
  const struct {
    size_t len;
    const char *text;
    double target;
  } images[] = {{kSmallImage, "4 KiB", kTargetWithImage},
                {64 << 10, "64 KiB", kTargetWithImage},
                {kLargeImage, "1 MiB", kTargetWithLargeImage}};
  for (const auto &image : images) {
    for (const MessageCase &message : message_cases(image.len)) {
      if (!has_image(message)) continue;
      add(suite, message.name + ", " + image.text, message, image.target);
    }
  }
  for (const MessageId id : {MessageId::kInstallTa, MessageId::kUpdateTa}) {
    suite.compare("image/" + message_case(id).name, [id] { return rest_of_image(id); },
                  {.batches = false});
  }
}

}  // namespace bench
