// SPDX-License-Identifier: BSD-2-Clause
/// How the command lines say what went wrong: one line on standard error, and an exit code.
#ifndef COMMON_ERROR_LINE_H
#define COMMON_ERROR_LINE_H

#include <stdexcept>
#include <string_view>

namespace tools {

constexpr int kExitRefused = 1;  // the device answered with a failure
constexpr int kExitUsage = 2;    // wrong input: a bad option, file or value

/// Wrong input. The text says what was wrong and what was expected.
class UsageError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// Prints `program: message` as one line; control characters of the message become spaces.
void print_error_line(std::string_view program, std::string_view message);

}  // namespace tools

#endif
