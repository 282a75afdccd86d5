// SPDX-License-Identifier: BSD-2-Clause
/// A server for HTTP/1.1, on any number of addresses, with or without TLS.
///
///     http::Server server({.name = "otrp-device/0.1.0"});
///     const std::string url = server.listen({"127.0.0.1", 8080}, router);
///     server.run();
///
/// One thread does all that is sent and received, so a slow client costs a socket and the memory of
/// what it has sent; handlers run in workers of their own. What a stranger can take is bounded:
///
/// - Connections, in all and from one address. Where one is too many, the least deserving goes: the
///   one that for longest has been sending a request, or taking an answer, or else been idle. One
///   whose request is at work stays.
/// - The length of heads and bodies, and of all unfinished bodies together. Where these are too
///   long, the longest is refused with 503.
/// - Time: for a request from its first byte (the first one: from the connection) to its last, for
///   an answer to be taken, between requests. What takes longer gets 408, or is closed.
///
/// A connection is kept for the next request, with `Keep-Alive: timeout=` to say how long; it lasts
/// somewhat longer than that. Requests that were sent ahead are answered in their order. A client
/// that closes its sending side gets its answers. After a refusal that leaves a body unread the
/// connection ends.
///
/// A request is refused with 403, before its body is read, when its Host is neither an address that
/// it came to nor allowed by name, or when it has an Origin: a page of another site would have one,
/// and a name that such a site points here would be the Host.
#ifndef HTTP_SERVER_H
#define HTTP_SERVER_H

#include <chrono>
#include <cstddef>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "http/access_log.h"
#include "http/endpoint.h"
#include "http/handler.h"
#include "http/request_reader.h"

namespace http {

struct ServerOptions {
  std::string name = "otrp";  // the Server header
  RequestLimits limits = {};
  size_t max_unfinished_len = 16 << 20;  // of all bodies that are being received
  size_t max_connections = 1000;
  size_t max_connections_per_address = 250;  // of IPv6 the first 64 bits count
  std::chrono::seconds request_time{30};
  std::chrono::seconds answer_time{30};
  std::chrono::seconds idle_time{60};
  size_t num_workers = 1;
  /// Of every answer that has not one of the same name.
  Headers headers = {{"Cache-Control", "no-store"},
                     {"X-Content-Type-Options", "nosniff"},
                     {"Content-Security-Policy", "default-src 'none'"},
                     {"Referrer-Policy", "no-referrer"}};
  std::function<void(const LogEntry &)> log = {};  // by the thread that serves: must not wait
};

struct ListenOptions {
  std::string tls_cert = {};  // PEM file, the server's certificate first; empty: no TLS
  std::string tls_key = {};   // PEM file
  std::vector<std::string> allowed_hosts = {};  // beside "localhost" and the address itself
  bool allows_own_pages = false;                // requests whose Origin is their Host
};

/// Throws tools::UsageError for TLS files that listen() could not use: for whoever does something
/// before that which wrong files should not begin.
void check_tls(const ListenOptions &options);

class Server {
 public:
  explicit Server(ServerOptions options);
  ~Server();
  Server(const Server &) = delete;
  Server &operator=(const Server &) = delete;

  /// From now on clients can connect; run() answers them. The handler must live until run() has
  /// returned. Returns the URL. Throws tools::UsageError for an address that cannot be listened on,
  /// or TLS files that cannot be used.
  std::string listen(const Endpoint &endpoint, Handler &handler, ListenOptions options = {});

  /// Serves until SIGTERM, SIGINT or stop(). Then nothing new is accepted, requests that wait for a
  /// worker get 503, and those at work are finished and, within a second, their answers sent.
  /// Handlers run no more when it returns. Ignores SIGPIPE from here on.
  void run();

  /// From any thread.
  void stop();

 private:
  class Loop;
  std::unique_ptr<Loop> loop_;
};

}  // namespace http

#endif
