// SPDX-License-Identifier: BSD-2-Clause
#include "device/object_id.h"

#include <algorithm>
#include <optional>

#include "common/encoding.h"
#include "common/error_line.h"

namespace device {
namespace {

constexpr std::string_view kEscape = "\\x";

bool stands_for_itself(char c) {
  return c >= ' ' && c <= '~' && c != '\\';
}

}  // namespace

std::string show_object_id(std::string_view id) {
  std::string text;
  for (const char &c : id) {
    if (stands_for_itself(c)) {
      text += c;
    } else {
      text += std::string(kEscape) + tools::hex_encode({&c, 1});
    }
  }
  return text;
}

std::string parse_object_id(std::string_view text) {
  std::string id;
  while (!text.empty()) {
    if (text.front() != '\\') {
      id += text.front();
      text.remove_prefix(1);
      continue;
    }
    const std::string_view digits = text.substr(std::min(kEscape.size(), text.size())).substr(0, 2);
    const std::optional<std::string> byte = tools::hex_decode(digits);
    if (!text.starts_with(kEscape) || !byte || byte->empty()) {
      throw tools::UsageError("bad object ID: expected \\xNN (two hexadecimal digits) at \"" +
                              std::string(text) + "\"");
    }
    id += *byte;
    text.remove_prefix(kEscape.size() + digits.size());
  }
  return id;
}

}  // namespace device
