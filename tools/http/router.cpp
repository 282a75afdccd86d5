// SPDX-License-Identifier: BSD-2-Clause
#include "http/router.h"

#include <algorithm>

#include "http/request_reader.h"

namespace http {
namespace {

bool answers_method(const Route &route, std::string_view method) {
  return method == route.method || (method == "HEAD" && route.method == "GET");
}

/// "application/json; charset=utf-8" is an application/json.
bool has_type(const Request &request, const std::vector<std::string> &types) {
  const std::string *type = find_header(request.headers, "Content-Type");
  if (type == nullptr) return false;
  const std::string_view name = std::string_view(*type).substr(0, type->find_first_of("; \t"));
  return std::ranges::any_of(types, [&](const std::string &t) { return same_word(t, name); });
}

bool is_empty(const Request &request) {
  const std::string *len = find_header(request.headers, "Content-Length");
  const bool has_len = len != nullptr && len->find_first_not_of('0') != len->npos;
  return !has_len && find_header(request.headers, "Transfer-Encoding") == nullptr;
}

/// What is compressed would not tell its length before it is read.
bool is_plain(const Request &request) {
  const std::string *coding = find_header(request.headers, "Content-Encoding");
  return coding == nullptr || same_word(*coding, "identity");
}

Answer wrong_type(const Route &route) {
  return failure(415,
                 "expected a Content-Type of " + route.types.front() + " and no Content-Encoding");
}

}  // namespace

bool match_path(std::string_view pattern, std::string_view path, Captures &captures) {
  captures.clear();
  for (;;) {
    const size_t star = pattern.find('*');
    if (path.substr(0, star) != pattern.substr(0, star)) return false;
    if (star == pattern.npos) return true;
    path.remove_prefix(star);
    pattern.remove_prefix(star + 1);
    const size_t len = pattern.empty() ? path.size() : std::min(path.find('/'), path.size());
    if (len == 0) return false;
    captures.emplace_back(path.substr(0, len));
    path.remove_prefix(len);
  }
}

std::optional<std::map<std::string, std::string>> parse_query(std::string_view query) {
  std::map<std::string, std::string> values;
  while (!query.empty()) {
    std::string part(query.substr(0, query.find('&')));
    query.remove_prefix(std::min(part.size() + 1, query.size()));
    std::ranges::replace(part, '+', ' ');
    const size_t end = std::min(part.find('='), part.size());
    std::string name, value;
    if (!decode_path(part.substr(0, end), name)) return std::nullopt;
    if (end < part.size() && !decode_path(part.substr(end + 1), value)) return std::nullopt;
    if (!values.emplace(name, value).second) return std::nullopt;
  }
  return values;
}

void Router::add(Route route) {
  routes_.push_back(std::move(route));
}

const Route *Router::find(const Request &request, Captures &captures) const {
  const auto found = std::ranges::find_if(routes_, [&](const Route &route) {
    return answers_method(route, request.method) && match_path(route.path, request.path, captures);
  });
  return found == routes_.end() ? nullptr : &*found;
}

Answer Router::unknown(const Request &request) const {
  std::string allowed, known;
  Captures captures;
  for (const Route &route : routes_) {
    known += (known.empty() ? "" : ", ") + route.method + " " + route.path;
    if (!match_path(route.path, request.path, captures)) continue;
    allowed += (allowed.empty() ? "" : ", ") + route.method;
    if (route.method == "GET") allowed += ", HEAD";
  }
  if (allowed.empty()) return failure(404, "no such path: expected " + known);
  Answer answer = failure(405, "expected " + allowed);
  answer.headers.push_back({"Allow", allowed});
  return answer;
}

std::optional<Answer> Router::answer_early(const Request &head) {
  Captures captures;
  const Route *route = find(head, captures);
  if (route == nullptr) return unknown(head);
  const bool needs_type = !route->types.empty() && !(route->may_be_empty && is_empty(head));
  if (needs_type && !(has_type(head, route->types) && is_plain(head))) {
    return wrong_type(*route);
  }
  if (route->is_early) return route->answer(head, captures);
  return std::nullopt;
}

Answer Router::answer(const Request &request) {
  Captures captures;
  const Route *route = find(request, captures);
  return route == nullptr ? unknown(request) : route->answer(request, captures);
}

}  // namespace http
