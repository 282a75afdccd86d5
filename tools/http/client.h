// SPDX-License-Identifier: BSD-2-Clause
/// A client for http:// and https:// that bounds what it waits for and what it takes.
///
///     http::Client client({.ca_file = "tsm-ca.pem"});
///     const http::Reply reply = client.send({.method = "POST",
///                                            .url = "https://tsm.example/tam/7",
///                                            .headers = {{"Content-Type",
///                                            "application/otrp+json"}}, .body = response});
///     if (reply.status == 200) ...
///
/// Any answer of a server is a Reply, whatever its status; what keeps an answer from coming is
/// thrown as a ClientError that says which kind it is. A request is sent once: where a connection
/// breaks after a body was sent, nobody knows whether it was obeyed, and the caller decides.
#ifndef HTTP_CLIENT_H
#define HTTP_CLIENT_H

#include <chrono>
#include <cstddef>
#include <memory>
#include <stdexcept>
#include <string>

#include "http/message.h"

namespace http {

enum class Failure {
  kNoConnection,  // no such host, or nobody listens there: the request was not sent
  kTls,           // no TLS, or a certificate that the roots do not vouch for: it was not sent
  kTimeout,       // it may have been obeyed
  kLost,          // the connection ended before the answer did, or what came is no HTTP: likewise
  kTooLarge,      // the answer is longer than the options allow: likewise
  kRedirect,      // sent elsewhere too often, to no http URL, or from https to http
};

/// what() is one line: the URL, what happened, and the reason.
class ClientError : public std::runtime_error {
 public:
  ClientError(Failure failure, const std::string &text)
      : std::runtime_error(text), failure_(failure) {}
  Failure failure() const { return failure_; }

 private:
  Failure failure_;
};

struct ClientOptions {
  std::string ca_file = {};  // PEM file with the only roots to trust; empty: those of the system
  std::string user_agent = "otrp";
  std::chrono::milliseconds connect_time{10'000};  // for a connection, TLS included
  std::chrono::milliseconds total_time{60'000};    // for one send(), redirects included
  size_t max_header_len = 64 << 10;                // of one answer, all its headers
  size_t max_body_len = 8 << 20;                   // however it is transferred
  int max_redirects = 5;
};

struct Call {
  std::string method = "GET";
  std::string url;
  Headers headers = {};  // beside Host, Content-Length and User-Agent, which are made
  std::string body = {};
};

struct Reply {
  int status = 0;
  Headers headers;
  std::string body;
  std::string url;  // that answered: another one than asked after a redirect
};

/// Keeps its connection from one call to the next. An object is for one thread at a time; any
/// number may be used at once. A proxy is used as the environment says ($https_proxy, $no_proxy),
/// but never to reach this machine itself.
class Client {
 public:
  explicit Client(ClientOptions options = {});
  ~Client();
  Client(Client &&other) noexcept;
  Client &operator=(Client &&other) noexcept;

  /// Redirects are followed: 307 and 308 with method and body, 301, 302 and 303 with a GET (a HEAD
  /// stays one). Authorization and Cookie headers stay with the host that they were meant for.
  ///
  /// Throws a ClientError, or a tools::UsageError for what cannot be sent: a URL that is none, a
  /// header with a line feed, a CA file that cannot be read.
  Reply send(const Call &call);

 private:
  struct Handle;
  std::unique_ptr<Handle> handle_;
  ClientOptions options_;
};

}  // namespace http

#endif
