// SPDX-License-Identifier: BSD-2-Clause
/// The result codes that a device answers with: their names, and what an operator can do.
#ifndef COMMON_RESULT_NAMES_H
#define COMMON_RESULT_NAMES_H

#include <cstdint>
#include <string>

namespace tools {

struct ResultName {
  uint32_t code;
  const char *name;
  const char *hint;  // empty when there is nothing to advise
};

/// NULL for a code that has no name here.
const ResultName *find_result(uint32_t code);

/// `0xdead0002 (OTRP_SD_EXISTS): hint`; name and hint only where there is one.
std::string describe_result(uint32_t code);

}  // namespace tools

#endif
