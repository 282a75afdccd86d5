// SPDX-License-Identifier: BSD-2-Clause
#include "device/raw_session.h"

#include <algorithm>
#include <charconv>
#include <cstdio>
#include <vector>

#include "common/files.h"

namespace device {
namespace {

using tools::UsageError;

constexpr std::string_view kGaps = " \t\r";  // a carriage return ends lines of other systems

std::vector<std::string_view> split(std::string_view line) {
  std::vector<std::string_view> fields;
  for (;;) {
    line.remove_prefix(std::min(line.find_first_not_of(kGaps), line.size()));
    if (line.empty()) return fields;
    fields.push_back(line.substr(0, line.find_first_of(kGaps)));
    line.remove_prefix(fields.back().size());
  }
}

void reopen(Device &device, std::optional<Session> &agent) {
  agent.reset();
  try {
    agent.emplace(device, kAgentUuid);
  } catch (const Error &error) {
    tools::write_file("-", reply_line(error.code(), 0));
    throw;
  }
  tools::write_file("-", reply_line(TEEC_SUCCESS, 0));
}

void obey(Device &device, std::string_view line, std::optional<Session> &agent) {
  const std::optional<Invocation> invocation = parse_session_line(line);
  if (!invocation) return reopen(device, agent);
  const Reply reply = run_invocation(*agent, *invocation);
  tools::write_file("-", reply_line(reply.result, reply.size));
}

}  // namespace

uint32_t parse_number(std::string_view name, std::string_view text, uint32_t max) {
  const bool is_hexadecimal = text.starts_with("0x") || text.starts_with("0X");
  const std::string_view digits = text.substr(is_hexadecimal ? 2 : 0);
  const char *end = digits.data() + digits.size();
  uint32_t number = 0;
  const auto [stop, failure] =
      std::from_chars(digits.data(), end, number, is_hexadecimal ? 16 : 10);
  if (failure != std::errc() || stop != end || number > max) {
    throw UsageError("bad " + std::string(name) + " \"" + std::string(text) +
                     "\": expected a number from 0 to " + std::to_string(max) +
                     ", decimal or hexadecimal after 0x");
  }
  return number;
}

uint16_t parse_types(std::string_view text) {
  return static_cast<uint16_t>(parse_number("TYPES", text, std::numeric_limits<uint16_t>::max()));
}

std::optional<Invocation> parse_session_line(std::string_view line) {
  const std::vector<std::string_view> fields = split(line);
  const bool is_reopen = fields.size() == 1 && fields[0] == "reopen";
  if (is_reopen) return std::nullopt;
  const bool is_invoke = (fields.size() == 5 || fields.size() == 6) && fields[0] == "invoke";
  if (!is_invoke) {
    throw UsageError("bad line \"" + std::string(line) +
                     "\": expected \"invoke COMMAND_ID INPUT OUTPUT CAPACITY [TYPES]\" or "
                     "\"reopen\"");
  }
  Invocation invocation = {.command_id = parse_number("COMMAND_ID", fields[1]),
                           .input = std::string(fields[2]),
                           .output = std::string(fields[3]),
                           .capacity = parse_number("CAPACITY", fields[4])};
  if (fields.size() == 6) invocation.types = parse_types(fields[5]);
  return invocation;
}

Reply run_invocation(Session &agent, const Invocation &invocation) {
  Call call = {.command_id = invocation.command_id,
               .input = {},
               .capacity = invocation.capacity,
               .types = invocation.types};
  if (invocation.input != "-") call.input = Buffer(tools::read_file(invocation.input));
  Reply reply = agent.invoke(std::move(call));
  tools::write_file(invocation.output, reply.output.bytes());
  return reply;
}

std::string reply_line(TEEC_Result result, size_t size) {
  char line[sizeof("0x00000000 18446744073709551615\n")];
  snprintf(line, sizeof(line), "0x%08x %zu\n", result, size);
  return line;
}

void run_session(Device &device, std::istream &lines, std::optional<Session> &agent) {
  agent.emplace(device, kAgentUuid);
  size_t number = 0;
  for (std::string line; std::getline(lines, line);) {
    ++number;
    if (split(line).empty()) continue;
    try {
      obey(device, line, agent);
    } catch (const UsageError &error) {
      throw UsageError("line " + std::to_string(number) + ": " + error.what());
    }
  }
}

}  // namespace device
