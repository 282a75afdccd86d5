// SPDX-License-Identifier: BSD-2-Clause
#include "fleet/figures.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <nlohmann/json.hpp>

namespace fleet {
namespace {

struct Quantile {
  const char *name;
  double share;
};
constexpr Quantile kQuantiles[] = {{"p50", 0.50}, {"p95", 0.95}, {"p99", 0.99}};

void add_counts(std::map<std::string, size_t> &to, const std::map<std::string, size_t> &from) {
  for (const auto &[name, count] : from) to[name] += count;
}

double a_second(size_t count, const Figures &figures) {
  return figures.time.count() > 0 ? static_cast<double>(count) / figures.time.count() : 0;
}

std::string line(const char *format, auto... values) {
  char text[200];
  snprintf(text, sizeof(text), format, values...);
  return text;
}

std::string times_line(const char *name, const Times &times) {
  std::string text = line("%-22s %9zu", name, times.count());
  for (const Quantile &quantile : kQuantiles)
    text += line(" %9.1f", times.quantile(quantile.share));
  return text + "\n";
}

std::string counts_lines(const char *title, const std::map<std::string, size_t> &counts) {
  std::string text = counts.empty() ? "" : line("%s\n", title);
  for (const auto &[name, count] : counts) text += line("  %-48.48s %9zu\n", name.c_str(), count);
  return text;
}

nlohmann::ordered_json times_json(const Times &times) {
  nlohmann::ordered_json document = {{"count", times.count()}};
  for (const Quantile &quantile : kQuantiles) {
    document[quantile.name] = times.quantile(quantile.share);
  }
  return document;
}

}  // namespace

void Times::add(const Times &others) {
  microseconds_.insert(microseconds_.end(), others.microseconds_.begin(),
                       others.microseconds_.end());
}

double Times::quantile(double share) const {
  if (microseconds_.empty()) return 0;
  std::vector<int64_t> sorted = microseconds_;
  const double rank = std::ceil(share * static_cast<double>(sorted.size()));
  const auto at = sorted.begin() + static_cast<std::ptrdiff_t>(std::max(rank, 1.0)) - 1;
  std::ranges::nth_element(sorted, at);
  return static_cast<double>(*at) / 1000;
}

void Figures::add(const Figures &others) {
  num_arrived += others.num_arrived;
  num_calls += others.num_calls;
  num_sessions += others.num_sessions;
  exchanges.add(others.exchanges);
  agents.add(others.agents);
  calls.add(others.calls);
  add_counts(messages, others.messages);
  add_counts(failures, others.failures);
}

std::string table_of(const Figures &figures) {
  const size_t num_exchanges = figures.exchanges.count();
  return line("%zu of %zu devices arrived in %.1f s, with %zu calls\n", figures.num_arrived,
              figures.num_devices, figures.time.count(), figures.num_calls) +
         line("sessions  %9zu  %9.1f/s\n", figures.num_sessions,
              a_second(figures.num_sessions, figures)) +
         line("exchanges %9zu  %9.1f/s\n\n", num_exchanges, a_second(num_exchanges, figures)) +
         line("%-22s %9s %9s %9s %9s\n", "milliseconds", "count", "p50", "p95", "p99") +
         times_line("an exchange, the TSM", figures.exchanges) +
         times_line("a message, the device", figures.agents) +
         times_line("a call, both", figures.calls) + counts_lines("messages", figures.messages) +
         counts_lines("failures", figures.failures);
}

std::string json_of(const Figures &figures) {
  const nlohmann::ordered_json document = {
      {"devices", figures.num_devices},
      {"arrived", figures.num_arrived},
      {"seconds", figures.time.count()},
      {"calls", figures.num_calls},
      {"sessions", figures.num_sessions},
      {"exchanges", figures.exchanges.count()},
      {"sessions_per_second", a_second(figures.num_sessions, figures)},
      {"exchanges_per_second", a_second(figures.exchanges.count(), figures)},
      {"exchange_ms", times_json(figures.exchanges)},
      {"device_ms", times_json(figures.agents)},
      {"call_ms", times_json(figures.calls)},
      {"messages", figures.messages},
      {"failures", figures.failures}};
  return document.dump() + "\n";
}

}  // namespace fleet
