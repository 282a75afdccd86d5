// SPDX-License-Identifier: BSD-2-Clause
/// JSON that a person wrote: each value knows its line, and members of one name are all kept, so
/// that whoever checks it can say where what is wrong.
#ifndef TSM_PLAN_LOCATED_JSON_H
#define TSM_PLAN_LOCATED_JSON_H

#include <cstddef>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "common/error_line.h"

namespace tsm {

struct LocatedJson {
  enum class Kind { kObject, kArray, kText, kOther };

  Kind kind = Kind::kOther;
  size_t line = 0;                                                // counts from 1
  std::string text = {};                                          // of kText
  std::vector<std::pair<std::string, LocatedJson>> members = {};  // of kObject, as they stand
  std::vector<LocatedJson> elements = {};                         // of kArray
};

/// A tools::UsageError that begins with "FILE:LINE: ".
tools::UsageError error_at(const std::string &file, size_t line, const std::string &what);

/// `file` is only for messages. Throws error_at() for what is no JSON, or nested too deep.
LocatedJson parse_located_json(std::string_view text, const std::string &file);

}  // namespace tsm

#endif
