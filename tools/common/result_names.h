// SPDX-License-Identifier: BSD-2-Clause
/// The result codes that a device answers with: their names, what they mean, and what an operator
/// does next. docs/protocol.md has the same table; a check compares them.
#ifndef COMMON_RESULT_NAMES_H
#define COMMON_RESULT_NAMES_H

#include <cstdint>
#include <span>
#include <string>
#include <string_view>

namespace tools {

struct ResultName {
  uint32_t code;
  const char *name;
  const char *meaning;
  const char *hint;  // what to do next; empty when there is nothing to advise
};

/// All of them: the agent's own first, then the TEE's.
std::span<const ResultName> result_names();

/// NULL for a code that has no name here.
const ResultName *find_result(uint32_t code);

/// The code that an operator means by `text`: hexadecimal ("0xdead0001", "DEAD0001"), decimal as
/// "error_code" carries it, or a name, in any case, with or without its prefix ("sd_exists"). NULL
/// for none of these, and for a number without a name.
const ResultName *find_result_by_text(std::string_view text);

/// `0xdead0002`.
std::string code_text(uint32_t code);

/// Its name, or `0xdead0002` for a code without one.
std::string code_name(uint32_t code);

/// `meaning; hint`.
std::string advice(const ResultName &result);

/// `0xdead0002 (OTRP_SD_EXISTS): meaning; hint`, or the number alone.
std::string describe_result(uint32_t code);

}  // namespace tools

#endif
