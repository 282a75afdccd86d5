// SPDX-License-Identifier: BSD-2-Clause
/// A handler made of a table of routes.
///
///     router.add({.method = "POST", .path = "/otrp/*", .types = {"application/otrp+json"},
///                 .answer = [&](const Request &request, const Captures &captures) { ... }});
///
/// A path that no route has gets 404, a method that none of its routes has 405 with `Allow`, a body
/// of another type, or compressed, 415: each before the body is read. HEAD goes where GET does.
#ifndef HTTP_ROUTER_H
#define HTTP_ROUTER_H

#include <functional>
#include <map>
#include <string>
#include <vector>

#include "http/handler.h"

namespace http {

using Captures = std::vector<std::string>;  // what stood for each "*" of a path

struct Route {
  std::string method;
  /// Each "*" stands for one character or more, of which none is a slash unless the "*" is the end.
  std::string path;
  /// Media types of the body. Without any, a body is not read. Those that a web page can send to
  /// any address without being asked (text/plain, forms) should not be among them.
  std::vector<std::string> types = {};
  bool may_be_empty = false;  // no body needs no type
  /// Answers as Handler::answer_early does, not by a worker.
  bool is_early = false;
  std::function<Answer(const Request &, const Captures &)> answer;
};

class Router : public Handler {
 public:
  void add(Route route);

  std::optional<Answer> answer_early(const Request &head) override;
  Answer answer(const Request &request) override;

 private:
  const Route *find(const Request &request, Captures &captures) const;
  Answer unknown(const Request &request) const;

  std::vector<Route> routes_;
};

/// "a=b&c=%64" by name; "+" stands for a blank. Nothing for bad escapes or a name that is there
/// twice.
std::optional<std::map<std::string, std::string>> parse_query(std::string_view query);

/// Public for tests.
bool match_path(std::string_view pattern, std::string_view path, Captures &captures);

}  // namespace http

#endif
