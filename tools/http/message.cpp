// SPDX-License-Identifier: BSD-2-Clause
#include "http/message.h"

#include <algorithm>

namespace http {
namespace {

char lower(char c) {
  return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
}

}  // namespace

bool same_word(std::string_view a, std::string_view b) {
  return std::ranges::equal(a, b, {}, lower, lower);
}

const std::string *find_header(const Headers &headers, std::string_view name) {
  const auto found = std::ranges::find_if(
      headers, [&](const Header &header) { return same_word(header.name, name); });
  return found == headers.end() ? nullptr : &found->value;
}

}  // namespace http
