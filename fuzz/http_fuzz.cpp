// SPDX-License-Identifier: BSD-2-Clause
// Bytes of a connection: however they come in, they are the same requests; a request that is
// written anew is read as the same one; what is routed and logged is what was read. The first byte
// says in what pieces they come.
#include <algorithm>
#include <nlohmann/json.hpp>

#include "http/access_log.h"
#include "http/endpoint.h"
#include "http/request_reader.h"
#include "http/router.h"
#include "support/require.h"

namespace fuzz {

using http::Headers;
using http::Request;
using Step = http::RequestReader::Step;

static const http::RequestLimits kLimits = {
    .max_header_len = 300, .max_headers = 8, .max_body_len = 200};

struct Outcome {
  std::vector<Request> requests;
  int status = 0;  // of a refusal
};

static bool same(const Request &a, const Request &b) {
  const auto same_header = [](const http::Header &x, const http::Header &y) {
    return x.name == y.name && x.value == y.value;
  };
  return a.method == b.method && a.target == b.target && a.path == b.path && a.query == b.query &&
         a.body == b.body && std::ranges::equal(a.headers, b.headers, same_header);
}

static Outcome read(std::string_view bytes, size_t piece_len) {
  http::RequestReader reader(kLimits);
  Outcome outcome;
  for (size_t at = 0; at <= bytes.size(); at += piece_len) {
    reader.feed(bytes.substr(at, piece_len));
    for (Step step; (step = reader.advance()) != Step::kNeedsMore;) {
      if (step == Step::kRefused) {
        outcome.status = reader.refusal().status;
        return outcome;
      }
      if (step != Step::kComplete) continue;
      outcome.requests.push_back(reader.request());
      reader.begin_next();
    }
  }
  return outcome;
}

static void check_bounds(const Request &request) {
  require(request.body.size() <= kLimits.max_body_len, "a body is as long as it may be");
  require(request.headers.size() <= kLimits.max_headers, "there are as many headers as may be");
  require(request.path.starts_with('/') || request.path == "*", "a path is one");
  for (const http::Header &header : request.headers) {
    for (const std::string &text : {header.name, header.value}) {
      require(text.find_first_of(std::string_view("\r\n\0", 3)) == text.npos, "a header is a line");
    }
  }
  const std::string *len = http::find_header(request.headers, "Content-Length");
  require(len == nullptr || std::stoul(*len) == request.body.size(), "a length is the body's");
}

static std::string written(const Request &request) {
  std::string text = request.method + " " + request.target + " HTTP/1.1\r\n";
  for (const http::Header &header : request.headers) {
    text += header.name + ": " + header.value + "\r\n";
  }
  const bool has_chunks = http::find_header(request.headers, "Transfer-Encoding") != nullptr;
  if (!has_chunks) return text + "\r\n" + request.body;
  text += "\r\n";
  for (const char c : request.body) text += std::string("1\r\n") + c + "\r\n";
  return text + "0\r\n\r\n";
}

static void check_routes(const Request &request) {
  http::Captures captures;
  http::Router router;
  const auto answer = [&](const Request &, const http::Captures &found) {
    captures = found;
    return http::Answer{};
  };
  router.add({.method = "POST", .path = "/otrp/*", .types = {"a/b"}, .answer = answer});
  router.add({.method = "GET", .path = "/devices/*/otrp/*", .is_early = true, .answer = answer});
  const std::optional<http::Answer> early = router.answer_early(request);
  const int status = early ? early->status : router.answer(request).status;
  require(status != 200 || captures.size() == (request.method == "POST" ? 1 : 2), "what matched");
  std::string rest = request.path;
  for (const std::string &capture : captures) {
    const size_t at = rest.find(capture);
    require(!capture.empty() && at != rest.npos, "a capture is of the path, in its order");
    rest = rest.substr(at + capture.size());
  }
  require((status == 405) == (early && http::find_header(early->headers, "Allow")), "405 allows");
}

static void check_log(const Request &request) {
  const http::LogEntry entry = {
      .time = {}, .peer = "a", .method = request.method, .target = request.target, .status = 200};
  const auto is_odd = [](char c) { return c < ' ' || c > '~'; };
  require(std::ranges::none_of(http::log_text(entry), is_odd), "a log line is a line of text");
  require(nlohmann::json::accept(http::log_json(entry)), "in JSON, too");
}

void check(std::string_view input) {
  if (input.empty()) return;
  const std::string_view bytes = input.substr(1);
  const Outcome whole = read(bytes, bytes.size() + 1);
  const Outcome pieces = read(bytes, 1 + static_cast<uint8_t>(input[0]) % 16);
  // Of a chunk's extension with an open quote it depends on the pieces when it is given up.
  const auto is_given_up = [](int status) {
    return status == 0 || status == 400 || status == 413 || status == 431;
  };
  const bool may_be_quoted = bytes.find('"') != bytes.npos;
  require(whole.status == pieces.status ||
              (may_be_quoted && is_given_up(whole.status) && is_given_up(pieces.status)),
          "pieces are refused as the whole is");
  require(std::ranges::equal(whole.requests, pieces.requests, same),
          "pieces are the same requests");
  for (const Request &request : whole.requests) {
    check_bounds(request);
    check_routes(request);
    check_log(request);
    const std::string *host = http::find_header(request.headers, "Host");
    if (host == nullptr) continue;
    http::host_of(*host);
    if (request.target.front() != '/' || written(request).size() > kLimits.max_header_len) continue;
    const Outcome again = read(written(request), 7);
    require(again.requests.size() == 1 && same(again.requests[0], request),
            "what is written is read");
  }
}

}  // namespace fuzz
