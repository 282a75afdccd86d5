// SPDX-License-Identifier: BSD-2-Clause
/// What requests and answers of both sides of HTTP are made of.
#ifndef HTTP_MESSAGE_H
#define HTTP_MESSAGE_H

#include <string>
#include <string_view>
#include <vector>

namespace http {

struct Header {
  std::string name;
  std::string value;  // without blanks around it
};
using Headers = std::vector<Header>;

/// Names of headers, and other words of HTTP, are the same in upper and in lower case.
bool same_word(std::string_view a, std::string_view b);

/// The value of the first header of this name; NULL when there is none.
const std::string *find_header(const Headers &headers, std::string_view name);

}  // namespace http

#endif
