// SPDX-License-Identifier: BSD-2-Clause
#include "http/message.h"

#include <algorithm>
#include <nlohmann/json.hpp>

namespace http {
namespace {

char lower(char c) {
  return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
}

struct Reason {
  int status;
  std::string_view text;
};

constexpr Reason kReasons[] = {
    {200, "OK"},
    {202, "Accepted"},
    {204, "No Content"},
    {400, "Bad Request"},
    {401, "Unauthorized"},
    {403, "Forbidden"},
    {404, "Not Found"},
    {405, "Method Not Allowed"},
    {408, "Request Timeout"},
    {409, "Conflict"},
    {413, "Content Too Large"},
    {414, "URI Too Long"},
    {415, "Unsupported Media Type"},
    {417, "Expectation Failed"},
    {422, "Unprocessable Content"},
    {429, "Too Many Requests"},
    {431, "Request Header Fields Too Large"},
    {500, "Internal Server Error"},
    {501, "Not Implemented"},
    {503, "Service Unavailable"},
    {505, "HTTP Version Not Supported"},
    {507, "Insufficient Storage"},
};

}  // namespace

bool same_word(std::string_view a, std::string_view b) {
  return std::ranges::equal(a, b, {}, lower, lower);
}

const std::string *find_header(const Headers &headers, std::string_view name) {
  const auto found = std::ranges::find_if(
      headers, [&](const Header &header) { return same_word(header.name, name); });
  return found == headers.end() ? nullptr : &found->value;
}

Answer text_answer(int status, std::string_view type, std::string body) {
  return {.status = status,
          .type = std::string(type),
          .body = std::make_shared<const std::string>(std::move(body))};
}

Answer failure(int status, std::string_view message) {
  const nlohmann::json document = {{"message", message}};
  const auto replace = nlohmann::json::error_handler_t::replace;
  return text_answer(status, "application/json", document.dump(-1, ' ', false, replace) + "\n");
}

std::string_view reason_of(int status) {
  const auto found = std::ranges::find(kReasons, status, &Reason::status);
  return found == std::end(kReasons) ? "Unnamed" : found->text;
}

}  // namespace http
