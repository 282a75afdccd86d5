// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/cli/operator_input.h"

#include <algorithm>
#include <filesystem>

#include "common/files.h"
#include "tsm/protocol/image.h"

namespace tsm {
namespace {

using tools::UsageError;

bool is_letter(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}

/// A name with a folder before it or an ending behind it, as no certificate's text has.
bool looks_like_file(const std::string &value) {
  constexpr size_t kMaxPathLen = 255;
  constexpr size_t kMaxEndingLen = 5;
  if (value.size() > kMaxPathLen || value.find('\n') != std::string::npos) return false;
  const std::filesystem::path path = value;
  std::error_code ignored;
  if (path.has_parent_path() && std::filesystem::exists(path.parent_path(), ignored)) return true;
  const std::string ending = path.extension();  // with its dot
  return value.starts_with("./") || value.starts_with("../") ||
         (ending.size() > 1 && ending.size() <= 1 + kMaxEndingLen &&
          std::all_of(ending.begin() + 1, ending.end(), is_letter));
}

std::string read_certificate(const std::string &value) {
  constexpr std::string_view kText = "text:";
  if (value.starts_with(kText)) return value.substr(kText.size());
  std::error_code ignored;
  const bool is_file = std::filesystem::exists(value, ignored);
  if (value == "-" || is_file) return tools::read_file(value);
  if (!looks_like_file(value)) return value;
  throw UsageError("--sp-cert: there is no file " + value +
                   ": expected the SP's certificate, or its text as text:" + value);
}

}  // namespace

Order read_order(const Arguments &arguments) {
  Order order = {arguments.message, arguments.request};
  if (!arguments.spcert.empty()) order.options.spcert = read_certificate(arguments.spcert);
  if (!arguments.image_file.empty()) order.options.image = read_image_file(arguments.image_file);
  return order;
}

}  // namespace tsm
