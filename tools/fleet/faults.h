// SPDX-License-Identifier: BSD-2-Clause
/// What goes wrong on the way, on purpose.
#ifndef FLEET_FAULTS_H
#define FLEET_FAULTS_H

#include <functional>
#include <random>
#include <string>
#include <vector>

#include "http/client.h"

namespace fleet {

struct Faults {
  double lost_requests = 0;     // shares, 0 to 1: of the requests
  double lost_answers = 0;      // of the requests, their answers
  double killed_devices = 0;    // of the calls
  unsigned killed_servers = 0;  // how often
};

/// "lost-requests=PERCENT", "lost-answers=PERCENT", "kill-device=PERCENT", "kill-server=COUNT".
/// Throws tools::UsageError.
Faults parse_faults(const std::vector<std::string> &words);

using Random = std::minstd_rand;
bool happens(double share, Random &random);

/// What was lost is a failure with what() beginning so.
constexpr char kLostRequest[] = "lost request";
constexpr char kLostAnswer[] = "lost answer";

/// `post` over a line that loses some. The references must outlive it.
std::function<http::Reply(const http::Call &)> lossy(
    std::function<http::Reply(const http::Call &)> post, const Faults &faults, Random &random);

}  // namespace fleet

#endif
