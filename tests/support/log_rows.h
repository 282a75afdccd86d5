// SPDX-License-Identifier: BSD-2-Clause
/// What the agent's log must say: tests/support/log_rows.txt.
#ifndef SUPPORT_LOG_ROWS_H
#define SUPPORT_LOG_ROWS_H

#include <tee_test.h>

#include <map>
#include <string>

namespace otrp_test {

/// Name of a case to its lines, "FUNCTION: TEXT" each.
using LogRows = std::map<std::string, std::string>;
LogRows read_log_rows();

/// Fails the test when there is no such row.
std::string row_of(const LogRows &rows, const std::string &name);

/// What has been said since this was last asked, in the form of a row. Addresses are all the same.
std::string said(tee::test::TraceSink &log);

}  // namespace otrp_test

#endif
