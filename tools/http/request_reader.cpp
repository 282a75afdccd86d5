// SPDX-License-Identifier: BSD-2-Clause
#include "http/request_reader.h"

// One of the library's own assertions is too strict: the last chunk may come in a byte at a time.
#define BOOST_DISABLE_ASSERTS

#include <algorithm>
#include <boost/asio/buffer.hpp>
#include <boost/beast/http/basic_parser.hpp>
#include <boost/beast/http/error.hpp>
#include <limits>

namespace http {
namespace {

namespace beast = boost::beast;
using beast::http::error;

constexpr size_t kGrowthDivisor = 8;  // room beyond what a body needs, as a part of it
constexpr std::string_view kEndOfHead = "\r\n\r\n";
constexpr char kTooManyHeaders[] = "the headers are more than --max-header and --max-headers allow";
constexpr char kBodyTooLong[] = "the request is longer than --max-body allows";

size_t count_headers(const Headers &headers, std::string_view name) {
  return static_cast<size_t>(std::ranges::count_if(
      headers, [&](const Header &header) { return same_word(header.name, name); }));
}

/// Does a line feed stand where no carriage return is before it?
bool has_bare_line_feed(std::string_view text, size_t from) {
  for (size_t at = text.find('\n', from); at != text.npos; at = text.find('\n', at + 1)) {
    if (at == 0 || text[at - 1] != '\r') return true;
  }
  return false;
}

bool is_folded(std::string_view head) {
  return head.find("\r\n ") != head.npos || head.find("\r\n\t") != head.npos;
}

bool is_number(std::string_view text) {
  return !text.empty() && std::ranges::all_of(text, [](char c) { return c >= '0' && c <= '9'; });
}

bool is_visible_ascii(std::string_view text) {
  return std::ranges::all_of(text, [](char c) { return c > ' ' && c < 0x7F; });
}

int hex_value(char c) {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

/// Puts the target's parts where they belong. A target may be a whole URL; what stands for the
/// host then counts instead of the Host header.
bool split_target(Request &request) {
  std::string_view rest = request.target;
  if (!is_visible_ascii(rest)) return false;
  for (const std::string_view scheme : {"http://", "https://"}) {
    if (!same_word(rest.substr(0, scheme.size()), scheme)) continue;
    rest.remove_prefix(scheme.size());
    const size_t end = std::min(rest.find_first_of("/?"), rest.size());
    for (Header &header : request.headers) {
      if (same_word(header.name, "Host")) header.value = rest.substr(0, end);
    }
    rest.remove_prefix(end);
    if (!rest.starts_with('/')) return false;
    break;
  }
  const size_t mark = std::min(rest.find('?'), rest.size());
  if (mark < rest.size()) request.query = rest.substr(mark + 1);
  rest = rest.substr(0, mark);
  return (rest.starts_with('/') || rest == "*") && decode_path(rest, request.path);
}

}  // namespace

bool decode_path(std::string_view escaped, std::string &path) {
  path.clear();
  for (size_t i = 0; i < escaped.size(); ++i) {
    if (escaped[i] != '%') {
      path += escaped[i];
      continue;
    }
    if (escaped.size() - i < 3) return false;
    const int high = hex_value(escaped[i + 1]);
    const int low = hex_value(escaped[i + 2]);
    if (high < 0 || low < 0 || (high | low) == 0) return false;
    path += static_cast<char>(high << 4 | low);
    i += 2;
  }
  return true;
}

/// Collects what the library has recognised.
class RequestReader::Parser : public beast::http::basic_parser<true> {
 public:
  explicit Parser(const RequestLimits &limits) : max_headers_(limits.max_headers) {
    header_limit(std::numeric_limits<uint32_t>::max());  // looked at before
    body_limit(limits.max_body_len);
  }

  Request request;
  size_t num_headers = 0;  // trailers included
  bool is_http_1_0 = false;

 private:
  using Code = beast::error_code;
  using View = beast::string_view;

  void on_request_impl(beast::http::verb, View method, View target, int version, Code &) override {
    request.method = std::string(method);
    request.target = std::string(target);
    is_http_1_0 = version == 10;
  }
  void on_field_impl(beast::http::field, View name, View value, Code &code) override {
    if (++num_headers > max_headers_) code = error::header_limit;
    if (!is_header_done()) request.headers.push_back({std::string(name), std::string(value)});
  }
  size_t on_body_impl(View bytes, Code &) override {
    // What doubled each time would be held to twice its length, by each of many connections.
    const size_t len = request.body.size() + bytes.size();
    if (len > request.body.capacity()) {
      std::string roomier;
      roomier.reserve(len + len / kGrowthDivisor);
      request.body.swap(roomier.append(request.body));
    }
    request.body.append(bytes.data(), bytes.size());
    return bytes.size();
  }
  size_t on_chunk_body_impl(uint64_t, View bytes, Code &code) override {
    return on_body_impl(bytes, code);
  }
  void on_response_impl(int, View, int, Code &) override {}
  void on_header_impl(Code &) override {}
  void on_body_init_impl(const boost::optional<uint64_t> &, Code &) override {}
  void on_chunk_header_impl(uint64_t, View, Code &) override {}
  void on_finish_impl(Code &) override {}

  size_t max_headers_;
};

RequestReader::RequestReader(const RequestLimits &limits) : limits_(limits) {
  begin_next();
}

RequestReader::~RequestReader() = default;

void RequestReader::begin_next() {
  parser_ = std::make_unique<Parser>(limits_);
  num_seen_ = 0;
  may_have_line_feed_ = true;
}

void RequestReader::feed(std::string_view bytes) {
  in_ += bytes;
}

Request &RequestReader::request() {
  return parser_->request;
}

bool RequestReader::has_begun() const {
  return !in_.empty() || parser_->got_some();
}

bool RequestReader::has_body() const {
  return !parser_->is_done();
}

bool RequestReader::expects_continue() const {
  return find_header(parser_->request.headers, "Expect") != nullptr;
}

bool RequestReader::keeps_connection() const {
  return parser_->keep_alive();
}

bool RequestReader::has_fed_body_bytes() const {
  return !in_.empty();
}

RequestReader::Step RequestReader::refuse(int status, const char *text) {
  refusal_ = {status, text};
  return Step::kRefused;
}

RequestReader::Step RequestReader::advance() {
  return parser_->is_header_done() ? read_body() : read_head();
}

/// The whole head is looked at before the library gets it: the library would take folded lines, and
/// lengths and transfer codings that are said twice.
RequestReader::Step RequestReader::read_head() {
  if (may_have_line_feed_ && in_.starts_with("\r\n")) {  // left behind by an older client
    in_.erase(0, 2);
    may_have_line_feed_ = false;
  }
  if (in_.empty() || (may_have_line_feed_ && in_ == "\r")) return Step::kNeedsMore;
  may_have_line_feed_ = false;
  if (in_.front() <= ' ' || in_.front() == 0x7F) return refuse(400, "this is not HTTP");

  const size_t from = num_seen_ - std::min(num_seen_, kEndOfHead.size());
  const size_t end = in_.find(kEndOfHead, from);
  const size_t max_len = limits_.max_header_len + kEndOfHead.size();
  const size_t len = end == in_.npos ? in_.size() : end + kEndOfHead.size();
  if (has_bare_line_feed(std::string_view(in_).substr(0, std::min(len, max_len)), from)) {
    return refuse(400, "a line ends without CR");
  }
  num_seen_ = in_.size();
  if (len > max_len || (end == in_.npos && len == max_len)) {
    return in_.find('\n') >= max_len ? refuse(414, "the path is too long")
                                     : refuse(431, kTooManyHeaders);
  }
  return end == in_.npos ? Step::kNeedsMore : take_head(len);
}

RequestReader::Step RequestReader::take_head(size_t len) {
  if (is_folded(std::string_view(in_).substr(0, len))) {
    return refuse(400, "a header is folded over several lines");
  }
  beast::error_code code;
  const size_t num_taken = parser_->put(boost::asio::buffer(in_.data(), len), code);
  in_.erase(0, num_taken);
  if (code == error::header_limit) return refuse(431, kTooManyHeaders);
  if (code == error::body_limit) return refuse(413, kBodyTooLong);
  if (code == error::bad_version) return refuse(505, "expected HTTP/1.1");
  if (code || num_taken != len) return refuse(400, "this is not HTTP");
  return check_head();
}

RequestReader::Step RequestReader::check_head() {
  Request &request = parser_->request;
  const size_t num_lengths = count_headers(request.headers, "Content-Length");
  const size_t num_codings = count_headers(request.headers, "Transfer-Encoding");
  const size_t num_hosts = count_headers(request.headers, "Host");
  if (num_lengths + num_codings > 1) return refuse(400, "its length is said twice");
  if (num_lengths == 1 && !is_number(*find_header(request.headers, "Content-Length"))) {
    return refuse(400, "its length is no number");
  }
  if (num_codings == 1 && parser_->is_http_1_0) return refuse(400, "HTTP/1.0 has no chunks");
  if (num_codings == 1 &&
      !same_word(*find_header(request.headers, "Transfer-Encoding"), "chunked")) {
    return refuse(501, "expected no other transfer coding than chunked");
  }
  if (num_hosts > 1 || (num_hosts == 0 && !parser_->is_http_1_0)) {
    return refuse(400, "expected one Host header");
  }
  const std::string *expectation = find_header(request.headers, "Expect");
  if (expectation != nullptr && !same_word(*expectation, "100-continue")) {
    return refuse(417, "expected no other expectation than 100-continue");
  }
  if (!split_target(request)) return refuse(400, "expected a path, with %-escapes for odd bytes");
  return Step::kHead;
}

/// The line of a chunk, and trailers, must fit into what the library gets at once, however it came.
RequestReader::Step RequestReader::read_body() {
  while (!parser_->is_done()) {
    if (in_.empty()) return Step::kNeedsMore;
    const size_t len = std::min(in_.size(), limits_.max_header_len);
    beast::error_code code;
    const size_t num_taken = parser_->put(boost::asio::buffer(in_.data(), len), code);
    in_.erase(0, num_taken);
    if (code == error::header_limit) return refuse(431, kTooManyHeaders);
    if (code == error::body_limit) return refuse(413, kBodyTooLong);
    if (code && code != error::need_more) return refuse(400, "its chunks are malformed");
    if (num_taken > 0) continue;
    return len == limits_.max_header_len ? refuse(431, kTooManyHeaders) : Step::kNeedsMore;
  }
  return Step::kComplete;
}

}  // namespace http
