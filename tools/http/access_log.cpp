// SPDX-License-Identifier: BSD-2-Clause
#include "http/access_log.h"

#include <cstdio>
#include <ctime>
#include <nlohmann/json.hpp>

namespace http {
namespace {

constexpr size_t kMaxShownLen = 200;

std::string shown(std::string_view text) {
  std::string line;
  for (const char c : text.substr(0, kMaxShownLen)) {
    if (c >= ' ' && c < 0x7F && c != '\\') {
      line += c;
    } else {
      char escape[sizeof("\\xNN")];
      snprintf(escape, sizeof(escape), "\\x%02x", static_cast<unsigned char>(c));
      line += escape;
    }
  }
  return text.size() > kMaxShownLen ? line + "..." : line;
}

double milliseconds_of(const LogEntry &entry) {
  return static_cast<double>(entry.duration.count() / 100) / 10;
}

}  // namespace

std::string time_text(std::chrono::system_clock::time_point time) {
  using namespace std::chrono;
  const auto milli = duration_cast<milliseconds>(time.time_since_epoch()).count();
  const time_t seconds = static_cast<time_t>(milli / 1000);
  tm parts{};
  gmtime_r(&seconds, &parts);
  char text[80];
  const size_t len = strftime(text, sizeof(text), "%Y-%m-%dT%H:%M:%S", &parts);
  snprintf(text + len, sizeof(text) - len, ".%03dZ", static_cast<int>(milli % 1000));
  return text;
}

std::string log_text(const LogEntry &entry) {
  char duration[40];
  snprintf(duration, sizeof(duration), "%.1f ms", milliseconds_of(entry));
  std::string line = time_text(entry.time) + " #" + std::to_string(entry.number) + " " +
                     entry.peer + " " + shown(entry.method) + " " + shown(entry.target) + " " +
                     (entry.status == 0 ? "-" : std::to_string(entry.status)) + " " + duration;
  return entry.note.empty() ? line : line + " " + shown(entry.note);
}

std::string log_json(const LogEntry &entry) {
  nlohmann::ordered_json document = {
      {"time", time_text(entry.time)}, {"number", entry.number},        {"peer", entry.peer},
      {"method", shown(entry.method)}, {"target", shown(entry.target)}, {"status", entry.status},
      {"ms", milliseconds_of(entry)}};
  if (!entry.note.empty()) document["note"] = shown(entry.note);
  return document.dump();
}

}  // namespace http
