// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/server/metrics.h"

#include <algorithm>
#include <cstdio>

namespace tsm {
namespace {

std::string number_text(double value) {
  char text[40];
  snprintf(text, sizeof(text), "%.9g", value);
  return text;
}

void put_head(std::string *text, const char *name, const char *type, const char *help) {
  *text += std::string("# HELP ") + name + " " + help + "\n# TYPE " + name + " " + type + "\n";
}

/// Labels are words of this program, which need no escapes.
void put(std::string *text, const std::string &name, const std::string &labels,
         const std::string &value) {
  *text += name + (labels.empty() ? "" : "{" + labels + "}") + " " + value + "\n";
}

std::string label(const char *name, const std::string &value) {
  return std::string(name) + "=\"" + value + "\"";
}

std::string message_label(const std::string &message) {
  return label("message", message.empty() ? "none" : message);
}

}  // namespace

FleetCounts count_fleet(Store *store) {
  return {.devices = store->count_devices(), .num_open = store->count_open(seconds_now())};
}

void Metrics::count_exchange(const DoorAnswer &answer, std::chrono::duration<double> time) {
  const std::lock_guard guard(lock_);
  ++exchanges_[{answer.message, answer.outcome}];
  if (!answer.lost.empty()) ++lost_[answer.lost];
  Histogram &histogram = seconds_[answer.message];
  histogram.sum += time.count();
  const auto bound = std::ranges::lower_bound(kBounds, time.count());
  ++histogram.counts[static_cast<size_t>(bound - kBounds.begin())];
}

void Metrics::count_failure() {
  const std::lock_guard guard(lock_);
  ++exchanges_[{"", "store"}];
}

void Metrics::count_status(int status) {
  const std::lock_guard guard(lock_);
  ++statuses_[status];
}

std::string Metrics::text(const FleetCounts &fleet) const {
  const std::lock_guard guard(lock_);
  std::string text;
  put_head(&text, "otrp_exchanges_total", "counter",
           "POSTs of devices, by the message that they answer.");
  for (const auto &[key, count] : exchanges_) {
    put(&text, "otrp_exchanges_total",
        message_label(key.first) + "," + label("outcome", key.second), std::to_string(count));
  }
  put_head(&text, "otrp_messages_lost_total", "counter", "Messages that were given up.");
  for (const auto &[message, count] : lost_) {
    put(&text, "otrp_messages_lost_total", message_label(message), std::to_string(count));
  }
  put_head(&text, "otrp_exchange_seconds", "histogram", "Time to answer POSTs of devices.");
  for (const auto &[message, histogram] : seconds_) {
    uint64_t total = 0;
    for (size_t i = 0; i <= kBounds.size(); ++i) {
      total += histogram.counts[i];
      const std::string bound = i == kBounds.size() ? "+Inf" : number_text(kBounds[i]);
      put(&text, "otrp_exchange_seconds_bucket", message_label(message) + "," + label("le", bound),
          std::to_string(total));
    }
    put(&text, "otrp_exchange_seconds_sum", message_label(message), number_text(histogram.sum));
    put(&text, "otrp_exchange_seconds_count", message_label(message), std::to_string(total));
  }
  put_head(&text, "otrp_http_answers_total", "counter", "Answers of the server, by their status.");
  for (const auto &[status, count] : statuses_) {
    put(&text, "otrp_http_answers_total", label("status", std::to_string(status)),
        std::to_string(count));
  }
  put_head(&text, "otrp_devices", "gauge", "Enrolled devices, by where they are.");
  for (size_t i = 0; i < kStandings.size(); ++i) {
    put(&text, "otrp_devices", label("state", kStandings[i]), std::to_string(fleet.devices[i]));
  }
  put_head(&text, "otrp_open_transactions", "gauge", "Messages that wait for their answers.");
  put(&text, "otrp_open_transactions", "", std::to_string(fleet.num_open));
  return text;
}

}  // namespace tsm
