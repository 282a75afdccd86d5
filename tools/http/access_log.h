// SPDX-License-Identifier: BSD-2-Clause
/// A line for each exchange.
#ifndef HTTP_ACCESS_LOG_H
#define HTTP_ACCESS_LOG_H

#include <chrono>
#include <cstdint>
#include <string>

namespace http {

/// An exchange that has ended, whichever way. What the client chose may hold any bytes.
struct LogEntry {
  std::chrono::system_clock::time_point time;  // of the request's first byte
  uint64_t number = 0;
  std::string peer = {};
  std::string method;                     // "-" where none could be read
  std::string target;                     // likewise
  int status = 0;                         // 0: the client went without an answer
  std::chrono::microseconds duration{0};  // from the first byte to the last of the answer
  std::string note = {};
};

/// 2026-11-25T09:30:00.123Z
std::string time_text(std::chrono::system_clock::time_point time);

/// 2026-11-25T09:30:00.123Z #12 127.0.0.1:40312 POST /otrp/create-sd 200 14.2 ms pass
///
/// Bytes that are not printable ASCII, and the backslash, are \xNN; long targets are cut.
std::string log_text(const LogEntry &entry);

/// {"time","number","peer","method","target","status","ms"[,"note"]}, escaped likewise.
std::string log_json(const LogEntry &entry);

}  // namespace http

#endif
