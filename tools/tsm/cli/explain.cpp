// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/cli/explain.h"

#include "common/files.h"
#include "common/near_miss.h"
#include "common/result_names.h"
#include "tsm/protocol/json.h"

namespace tsm {
namespace {

using tools::ResultName;

const ResultName &find_code(const std::string &text) {
  const ResultName *result = tools::find_result_by_text(text);
  if (result != nullptr) return *result;
  std::vector<std::string> names;
  for (const ResultName &known : tools::result_names()) names.emplace_back(known.name);
  throw tools::UsageError(
      "no result code is called \"" + text + "\": " +
      tools::suggestion(text, names,
                        "expected a number such as 0xdead0001 or 3735879681, a name such as "
                        "OTRP_DSI_MISMATCH, or all"));
}

std::vector<ResultName> find_codes(const std::vector<std::string> &texts) {
  std::vector<ResultName> results;
  for (const std::string &text : texts) {
    if (text == "all") {
      results.insert(results.end(), tools::result_names().begin(), tools::result_names().end());
    } else {
      results.push_back(find_code(text));
    }
  }
  return results;
}

std::string explain_lines(const ResultName &result) {
  const std::string next =
      *result.hint == '\0' ? "" : "  next   " + std::string(result.hint) + "\n";
  return std::string(result.name) + "  " + tools::code_text(result.code) + "  " +
         std::to_string(result.code) + "\n  means  " + result.meaning + "\n" + next;
}

Json explain_json(const ResultName &result) {
  return {{"code", tools::code_text(result.code)},
          {"error_code", result.code},
          {"name", result.name},
          {"meaning", result.meaning},
          {"next", result.hint}};
}

}  // namespace

int run_explain(const Arguments &arguments) {
  std::string lines;
  Json list = Json::array();
  for (const ResultName &result : find_codes(arguments.codes)) {
    lines += explain_lines(result);
    list.push_back(explain_json(result));
  }
  tools::write_file("-", arguments.json ? list.dump(2) + "\n" : lines);
  return 0;
}

}  // namespace tsm
