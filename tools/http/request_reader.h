// SPDX-License-Identifier: BSD-2-Clause
/// The bytes of a connection, taken apart into requests (RFC 9112).
///
/// A request ends where exactly one reading of it ends, or it is refused: two lengths, a length
/// beside chunks, another transfer coding than chunks, folded lines, line feeds of their own,
/// blanks before a colon. What is taken is bounded, however the bytes come in.
#ifndef HTTP_REQUEST_READER_H
#define HTTP_REQUEST_READER_H

#include <cstddef>
#include <memory>
#include <string>
#include <string_view>

#include "http/message.h"

namespace http {

struct RequestLimits {
  size_t max_header_len = 16 << 10;  // of the request line and all headers; of trailers
  size_t max_headers = 100;
  size_t max_body_len = 8 << 20;  // in any transfer coding
};

/// Why a request is refused; nothing of the connection can be read after it.
struct Refusal {
  int status = 400;
  const char *text = "";
};

/// Feed bytes, then advance() until it says kNeedsMore:
///
///     kNeedsMore   with the bytes fed so far it gets no further
///     kHead        request() has its line and headers; advance() goes on to the body
///     kComplete    request() is complete; begin_next() before anything else
///     kRefused     see refusal(); this is the end
class RequestReader {
 public:
  enum class Step { kNeedsMore, kHead, kComplete, kRefused };

  explicit RequestReader(const RequestLimits &limits);
  ~RequestReader();
  RequestReader(const RequestReader &) = delete;
  RequestReader &operator=(const RequestReader &) = delete;

  void feed(std::string_view bytes);
  Step advance();
  void begin_next();

  Request &request();
  const Refusal &refusal() const { return refusal_; }

  bool has_begun() const;           // is there a byte of the next request?
  bool has_body() const;            // after kHead: is a body announced that is not empty?
  bool expects_continue() const;    // after kHead: does the client wait for a status of 100?
  bool keeps_connection() const;    // after kHead: does the client go on after this request?
  bool has_fed_body_bytes() const;  // after kHead: has the client begun with the body?

 private:
  class Parser;

  Step read_head();
  Step take_head(size_t len);
  Step check_head();
  Step read_body();
  Step refuse(int status, const char *text);

  const RequestLimits &limits_;
  std::string in_;                  // fed, and not yet taken
  size_t num_seen_ = 0;             // bytes of in_ that were searched for the end of the head
  bool may_have_line_feed_ = true;  // before the request that comes next
  std::unique_ptr<Parser> parser_;
  Refusal refusal_;
};

/// The bytes that "%41" stands for; false where an escape is none, or stands for NUL.
bool decode_path(std::string_view escaped, std::string &path);

}  // namespace http

#endif
