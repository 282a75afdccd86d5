// SPDX-License-Identifier: BSD-2-Clause
/// What requests and answers of both sides of HTTP are made of.
#ifndef HTTP_MESSAGE_H
#define HTTP_MESSAGE_H

#include <cstdint>
#include <memory>
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

/// A request as a server has read it. The numbers are the server's.
struct Request {
  std::string method;
  std::string target;  // as it was sent: for a log
  std::string path;    // of the target, without its escapes; begins with a slash, but for "*"
  std::string query;   // what followed the "?", as it was sent
  Headers headers;
  std::string body;
  std::string peer;     // "ADDRESS:PORT" of the client
  uint64_t number = 0;  // counts the requests of a server, from 1
};

/// What a server says. A body may be shared by any number of answers, and is not copied.
struct Answer {
  int status = 200;
  std::string type = "application/json";  // of the body, where there is one
  std::shared_ptr<const std::string> body = {};
  Headers headers = {};
  std::string note = {};  // for the log alone
};

Answer text_answer(int status, std::string_view type, std::string body);

/// {"message": ...}, which says what was wrong and what was expected.
Answer failure(int status, std::string_view message);

/// "Not Found"
std::string_view reason_of(int status);

}  // namespace http

#endif
