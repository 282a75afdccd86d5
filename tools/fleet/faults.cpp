// SPDX-License-Identifier: BSD-2-Clause
#include "fleet/faults.h"

#include <charconv>

#include "common/error_line.h"

namespace fleet {
namespace {

struct Kind {
  std::string_view name;
  double Faults::*share;  // NULL: a count
};

constexpr Kind kKinds[] = {{"lost-requests", &Faults::lost_requests},
                           {"lost-answers", &Faults::lost_answers},
                           {"kill-device", &Faults::killed_devices},
                           {"kill-server", nullptr}};

tools::UsageError bad_fault(const std::string &word) {
  return tools::UsageError("bad fault \"" + word +
                           "\": expected lost-requests=PERCENT, lost-answers=PERCENT, "
                           "kill-device=PERCENT or kill-server=COUNT");
}

double number_in(std::string_view text, double max, const std::string &word) {
  double number = 0;
  const auto [end, failure] = std::from_chars(text.data(), text.data() + text.size(), number);
  const bool is_number = failure == std::errc() && end == text.data() + text.size();
  if (!is_number || !(number >= 0 && number <= max)) throw bad_fault(word);
  return number;
}

}  // namespace

Faults parse_faults(const std::vector<std::string> &words) {
  constexpr double kMaxKills = 1000;
  Faults faults;
  for (const std::string &word : words) {
    const size_t equals = word.find('=');
    const std::string_view name = std::string_view(word).substr(0, equals);
    const Kind *kind = nullptr;
    for (const Kind &known : kKinds) kind = known.name == name ? &known : kind;
    if (kind == nullptr || equals == word.npos) throw bad_fault(word);
    const std::string_view value = std::string_view(word).substr(equals + 1);
    if (kind->share != nullptr) {
      faults.*kind->share = number_in(value, 100, word) / 100;
    } else {
      faults.killed_servers = static_cast<unsigned>(number_in(value, kMaxKills, word));
    }
  }
  return faults;
}

bool happens(double share, Random &random) {
  return share > 0 && std::generate_canonical<double, 32>(random) < share;
}

std::function<http::Reply(const http::Call &)> lossy(
    std::function<http::Reply(const http::Call &)> post, const Faults &faults, Random &random) {
  return [post = std::move(post), &faults, &random](const http::Call &call) {
    if (happens(faults.lost_requests, random)) {
      throw http::ClientError(http::Failure::kTimeout, kLostRequest);
    }
    http::Reply reply = post(call);
    if (happens(faults.lost_answers, random)) {
      throw http::ClientError(http::Failure::kTimeout, kLostAnswer);
    }
    return reply;
  };
}

}  // namespace fleet
