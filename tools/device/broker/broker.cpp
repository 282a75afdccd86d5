// SPDX-License-Identifier: BSD-2-Clause
#include "device/broker/broker.h"

#include <algorithm>
#include <random>

namespace broker {

using std::chrono::milliseconds;

milliseconds pause_before(unsigned retry, double chance, std::chrono::seconds wish,
                          const Policy &policy) {
  milliseconds pause = policy.first_pause;
  while (retry-- > 0 && pause < policy.max_pause) pause *= 2;
  const auto longest = static_cast<double>(std::min(pause, policy.max_pause).count());
  const milliseconds granted = std::min<milliseconds>(wish, policy.max_pause);
  return granted + milliseconds(static_cast<milliseconds::rep>((0.5 + 0.5 * chance) * longest));
}

Outcome call(const Ends &ends, const Policy &policy, const Stop &stop,
             const std::function<void(const Outcome &, milliseconds)> &on_retry) {
  std::minstd_rand random(std::random_device{}());
  size_t num_messages = 0;
  for (unsigned retry = 0;; ++retry) {
    Outcome outcome = run_session(ends, policy.max_messages, stop);
    outcome.num_messages = num_messages += outcome.num_messages;
    if (outcome.end != End::kUnreachable || retry == policy.max_retries) return outcome;

    const double chance = std::generate_canonical<double, 32>(random);
    const milliseconds pause = pause_before(retry, chance, outcome.retry_after, policy);
    if (on_retry) on_retry(outcome, pause);
    if (stop.wait_for(pause)) return {End::kStopped, num_messages, "", 0, {}};
  }
}

}  // namespace broker
