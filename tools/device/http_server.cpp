// SPDX-License-Identifier: BSD-2-Clause
#include "device/http_server.h"

#include <httplib.h>
#include <pthread.h>

#include <algorithm>
#include <atomic>
#include <cctype>
#include <csignal>
#include <thread>

#include "common/error_line.h"
#include "common/files.h"
#include "device/commands.h"
#include "device/http_service.h"
#include "device/raw_session.h"

namespace device {
namespace {

constexpr size_t kNumThreads = 4;
constexpr time_t kKeepAlive = 1;  // seconds; an idle connection holds up the end for as long
constexpr size_t kMaxLoggedPathLen = 100;
constexpr char kImageHeader[] = "OTrP-TA-Image";

/// Two servers must not share a port unnoticed, as the library's own options would let them.
void set_socket_options(socket_t socket) {
  const int yes = 1;
  setsockopt(socket, SOL_SOCKET, SO_REUSEADDR, &yes, sizeof(yes));
}

void write_answer(const HttpAnswer &answer, httplib::Response &response) {
  response.status = answer.status;
  if (!answer.image_path.empty()) response.set_header(kImageHeader, answer.image_path);
  response.set_content(answer.body, answer.type);
}

/// Other types are those that a web page may send to any address without being asked. What is
/// compressed would not tell its length before it is read.
bool is_plain_json(const httplib::Request &request) {
  std::string type = request.get_header_value("Content-Type");
  type = type.substr(0, type.find_first_of("; "));
  std::ranges::transform(type, type.begin(), [](unsigned char c) { return std::tolower(c); });
  return (type == kOtrpType || type == "application/json") &&
         !request.has_header("Content-Encoding");
}

void answer_message(HttpService &service, const httplib::Request &request,
                    httplib::Response &response, const httplib::ContentReader &read_content) {
  if (!is_plain_json(request)) {
    return write_answer(http_failure(415, "expected a Content-Type of " + std::string(kOtrpType) +
                                              " and no Content-Encoding"),
                        response);
  }
  std::string body;
  const bool is_read = read_content([&](const char *bytes, size_t len) {
    body.append(bytes, len);
    return true;
  });
  if (is_read) write_answer(service.message(request.matches[1], body), response);
}

const char *text_of_status(int status) {
  switch (status) {
    case 400:
      return "not a request that this server can read";
    case 404:
      return "expected POST /otrp/MESSAGE, GET /info, GET /query/TAID or GET /images/NUMBER";
    case 413:
      return "the request is longer than --max-body allows";
    case 414:
      return "the path is too long";
    default:
      return "the request cannot be answered";
  }
}

/// Failures that the library finds have no body yet.
httplib::Server::HandlerResponse explain(const httplib::Request &, httplib::Response &response) {
  if (response.body.empty()) {
    write_answer(http_failure(response.status, text_of_status(response.status)), response);
  }
  return httplib::Server::HandlerResponse::Handled;
}

void log_request(const httplib::Request &request, const httplib::Response &response) {
  tools::print_error_line(kProgram, request.method + " " +
                                        request.path.substr(0, kMaxLoggedPathLen) + " " +
                                        std::to_string(response.status));
}

void add_routes(httplib::Server &server, HttpService &service) {
  using httplib::Request;
  using httplib::Response;
  server.Get("/info",
             [&](const Request &, Response &response) { write_answer(service.info(), response); });
  server.Get("/query/(.+)", [&](const Request &request, Response &response) {
    write_answer(service.query(request.matches[1]), response);
  });
  server.Get("/images/([0-9]+)", [&](const Request &request, Response &response) {
    write_answer(service.image(request.matches[1].str()), response);
  });
  server.Post("/otrp/([a-z-]+)",
              [&](const Request &request, Response &response, const httplib::ContentReader &read) {
                answer_message(service, request, response, read);
              });
}

void configure(httplib::Server &server, size_t max_body_len) {
  server.new_task_queue = [] { return new httplib::ThreadPool(kNumThreads); };
  server.set_socket_options(set_socket_options);
  server.set_keep_alive_timeout(kKeepAlive);
  server.set_payload_max_length(max_body_len);
  server.set_tcp_nodelay(true);
  server.set_error_handler(httplib::Server::HandlerWithResponse(explain));
  server.set_logger(log_request);
}

void listen(httplib::Server &server, const Endpoint &endpoint) {
  int port = endpoint.port;
  if (port == 0) {
    port = server.bind_to_any_port(endpoint.address);
  } else if (!server.bind_to_port(endpoint.address, port)) {
    port = -1;
  }
  const bool is_ipv6 = endpoint.address.find(':') != std::string::npos;
  const std::string host = is_ipv6 ? "[" + endpoint.address + "]" : endpoint.address;
  if (port < 0) {
    throw tools::UsageError("cannot listen on " + host + ":" + std::to_string(endpoint.port) +
                            ": expected an address of this machine and a free port");
  }
  tools::write_file("-", "http://" + host + ":" + std::to_string(port) + "\n");
}

/// Signals that end the server; all threads leave them to the one that waits.
sigset_t block_end_signals() {
  sigset_t signals;
  sigemptyset(&signals);
  sigaddset(&signals, SIGTERM);
  sigaddset(&signals, SIGINT);
  pthread_sigmask(SIG_BLOCK, &signals, nullptr);
  return signals;
}

}  // namespace

Endpoint parse_endpoint(std::string_view text) {
  const size_t colon = text.rfind(':');
  std::string_view address = text.substr(0, colon);
  if (address.size() > 2 && address.front() == '[' && address.back() == ']') {
    address = address.substr(1, address.size() - 2);
  } else if (colon == std::string_view::npos || address.find(':') != std::string_view::npos) {
    address = {};
  }
  if (address.empty()) {
    throw tools::UsageError("bad address \"" + std::string(text) +
                            "\": expected ADDRESS:PORT or [ADDRESS]:PORT");
  }
  return {std::string(address),
          static_cast<int>(parse_number("the port", text.substr(colon + 1), 65535))};
}

void run_http_server(Device &device, const Endpoint &endpoint, size_t max_body_len) {
  const sigset_t signals = block_end_signals();
  HttpService service(device);
  httplib::Server server;
  configure(server, max_body_len);
  add_routes(server, service);
  listen(server, endpoint);

  const pthread_t waiting = pthread_self();
  std::atomic<bool> has_ended = false;
  std::jthread serving([&] {
    server.listen_after_bind();
    has_ended = true;
    pthread_kill(waiting, SIGTERM);
  });
  int signal = 0;
  sigwait(&signals, &signal);
  const bool was_stopped = !has_ended;
  // A server that does not run yet would not notice.
  while (!server.is_running() && !has_ended) std::this_thread::yield();
  server.stop();
  serving.join();
  if (!was_stopped) throw std::runtime_error("the server stopped listening");
}

}  // namespace device
