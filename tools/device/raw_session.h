// SPDX-License-Identifier: BSD-2-Clause
/// Raw invocations of the agent, as the commands `invoke` and `session` take them.
///
/// A session reads lines, whose fields are separated by blanks or tabs (so paths hold neither):
///
///     invoke COMMAND_ID INPUT OUTPUT CAPACITY [TYPES]      answered by "0xRESULT SIZE"
///     reopen                                               answered by "0xRESULT 0"
#ifndef DEVICE_RAW_SESSION_H
#define DEVICE_RAW_SESSION_H

#include <cstdint>
#include <istream>
#include <limits>
#include <optional>
#include <string>
#include <string_view>

#include "device/device_client.h"

namespace device {

struct Invocation {
  uint32_t command_id = 0;
  std::string input;   // a file, or "-": no input buffer
  std::string output;  // a file that receives the whole output buffer, or "-": standard output
  uint32_t capacity = 0;
  uint16_t types = kMessageTypes;

  bool operator==(const Invocation &) const = default;
};

/// Decimal, or hexadecimal after "0x". Throws tools::UsageError, which calls the number `name`, for
/// anything else and for numbers above `max`.
uint32_t parse_number(std::string_view name, std::string_view text,
                      uint32_t max = std::numeric_limits<uint32_t>::max());

uint16_t parse_types(std::string_view text);  // likewise, one nibble per parameter

/// What a line of a session asks for; nothing means "reopen". Throws tools::UsageError.
std::optional<Invocation> parse_session_line(std::string_view line);

/// Invokes, and writes the output file whatever the result.
Reply run_invocation(Session &agent, const Invocation &invocation);

/// "0xRESULT SIZE" and a line feed.
std::string reply_line(TEEC_Result result, size_t size);

/// Obeys lines until they end; each answer is on standard output before the next line is read.
/// Throws an Error when the agent cannot be opened, tools::UsageError for a line that cannot be
/// obeyed. `agent` must be empty; it is open afterwards unless an opening failed.
void run_session(Device &device, std::istream &lines, std::optional<Session> &agent);

}  // namespace device

#endif
