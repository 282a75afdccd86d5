// SPDX-License-Identifier: BSD-2-Clause
#include "common/error_line.h"

#include <cstdio>
#include <string>

namespace tools {

void print_error_line(std::string_view program, std::string_view message) {
  std::string line = std::string(program) + ": " + std::string(message);
  while (!line.empty() && line.back() == '\n') line.pop_back();
  for (char &c : line) {
    const bool is_control = static_cast<unsigned char>(c) < 0x20 || c == 0x7F;
    if (is_control) c = ' ';
  }
  line += '\n';
  fwrite(line.data(), 1, line.size(), stderr);
}

}  // namespace tools
