// SPDX-License-Identifier: BSD-2-Clause
#include "support/log_rows.h"

#include <gtest/gtest.h>

#include <regex>
#include <sstream>

#include "common/files.h"

namespace otrp_test {

LogRows read_log_rows() {
  LogRows rows;
  std::istringstream in(tools::read_file(OTRP_LOG_ROWS));
  std::string name;
  for (std::string line; std::getline(in, line);) {
    if (line.starts_with("  ")) {
      rows[name] += line.substr(2) + "\n";
    } else if (!line.empty() && line[0] != '#') {
      rows[name = line];
    }
  }
  return rows;
}

std::string row_of(const LogRows &rows, const std::string &name) {
  EXPECT_TRUE(rows.contains(name)) << "log_rows.txt has no row " << name;
  return rows.contains(name) ? rows.at(name) : "";
}

std::string said(tee::test::TraceSink &log) {
  std::string text;
  for (const auto &line : log.lines()) text += line.function + ": " + line.message + "\n";
  log.clear();
  static const std::regex address("(data_buf|length|_value|_object) 0x[0-9a-f]+");
  return std::regex_replace(text, address, "$1 ADDRESS");
}

}  // namespace otrp_test
