// SPDX-License-Identifier: BSD-2-Clause
#include "http/server.h"

#include <malloc.h>
#include <openssl/ssl.h>
#include <sys/resource.h>

#include <algorithm>
#include <atomic>
#include <boost/asio/io_context.hpp>
#include <boost/asio/post.hpp>
#include <boost/asio/signal_set.hpp>
#include <boost/asio/steady_timer.hpp>
#include <csignal>
#include <ctime>
#include <list>
#include <map>
#include <optional>

#include "common/error_line.h"
#include "http/stream.h"
#include "http/workers.h"

namespace http {
namespace {

namespace asio = boost::asio;
using asio::ip::tcp;
using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;
using std::chrono::seconds;

constexpr milliseconds kTick{100};           // how late a deadline may be noticed
constexpr seconds kIdleMargin{5};            // beyond what the client is told
constexpr milliseconds kFarewell{2'000};     // for a client to take the last answer
constexpr milliseconds kFarewellAtEnd{500};  // when the server ends
constexpr milliseconds kAnswerAtEnd{1'000};  // likewise
constexpr size_t kSpareFiles = 64;           // that the process has open beside connections
constexpr size_t kSmallBodyLen = 16 << 10;   // never refused for what others send
constexpr int kOwnMappingLen = 128 << 10;
constexpr std::string_view kContinue = "HTTP/1.1 100 Continue\r\n\r\n";

// ---- Addresses

/// As clients write it: an IPv4 address is one, however the socket sees it.
asio::ip::address plain_address(const asio::ip::address &address) {
  if (!address.is_v6()) return address;
  asio::ip::address_v6 v6 = address.to_v6();
  if (v6.is_v4_mapped()) return asio::ip::make_address_v4(asio::ip::v4_mapped, v6);
  v6.scope_id(0);
  return v6;
}

/// Whose connections are counted together.
std::string neighbour_of(const asio::ip::address &address) {
  if (!address.is_v6()) return address.to_string();
  const auto bytes = address.to_v6().to_bytes();
  return std::string(bytes.begin(), bytes.begin() + bytes.size() / 2);
}

bool is_text_of(std::string_view host, const asio::ip::address &address) {
  error_code code;
  const asio::ip::address named = asio::ip::make_address(std::string(host), code);
  return !code && plain_address(named) == address;
}

tcp::acceptor bind(asio::io_context &io, const Endpoint &endpoint) {
  error_code code;
  tcp::resolver resolver(io);
  const auto found = resolver.resolve(endpoint.address, std::to_string(endpoint.port),
                                      tcp::resolver::passive, code);
  for (const auto &candidate : found) {
    tcp::acceptor acceptor(io);
    acceptor.open(candidate.endpoint().protocol(), code);
    if (!code) acceptor.set_option(tcp::acceptor::reuse_address(true), code);
    if (!code) acceptor.bind(candidate.endpoint(), code);
    if (!code) acceptor.listen(asio::socket_base::max_listen_connections, code);
    if (!code) return acceptor;
  }
  throw tools::UsageError("cannot listen on " + endpoint_text(endpoint.address, endpoint.port) +
                          ": " + code.message() +
                          ": expected an address of this machine and a free port");
}

// ---- TLS

void require(bool is_good, const char *what, const std::string &file) {
  if (!is_good) {
    throw tools::UsageError("cannot use " + file + ": expected a PEM file with " + what);
  }
}

std::unique_ptr<asio::ssl::context> make_tls(const ListenOptions &options) {
  if (options.tls_cert.empty() && options.tls_key.empty()) return nullptr;
  auto context = std::make_unique<asio::ssl::context>(asio::ssl::context::tls_server);
  SSL_CTX *native = context->native_handle();
  SSL_CTX_set_min_proto_version(native, TLS1_2_VERSION);
  SSL_CTX_set_options(native, SSL_OP_NO_RENEGOTIATION);
  SSL_CTX_set_mode(native, SSL_MODE_RELEASE_BUFFERS);
  error_code code;
  // Nobody sits here to type a password.
  context->set_password_callback([](size_t, auto) { return std::string(); }, code);
  context->use_certificate_chain_file(options.tls_cert, code);
  require(!code, "the server's certificate (--tls-cert)", options.tls_cert);
  context->use_private_key_file(options.tls_key, asio::ssl::context::pem, code);
  require(!code, "the certificate's key (--tls-key)", options.tls_key);
  return context;
}

// ---- Answers as bytes

/// A line feed in a header would begin another header.
std::string one_line(std::string text) {
  std::ranges::replace_if(
      text, [](char c) { return c == '\r' || c == '\n' || c == '\0'; }, ' ');
  return text;
}

std::string date() {
  const time_t now = time(nullptr);
  tm parts{};
  gmtime_r(&now, &parts);
  char text[80];
  return std::string(text, strftime(text, sizeof(text), "%a, %d %b %Y %H:%M:%S GMT", &parts));
}

std::string head_of(const Answer &answer, const ServerOptions &options, bool is_last) {
  std::string head = "HTTP/1.1 " + std::to_string(answer.status) + " " +
                     std::string(reason_of(answer.status)) + "\r\n";
  const auto put = [&](const std::string &name, const std::string &value) {
    head += one_line(name) + ": " + one_line(value) + "\r\n";
  };
  const size_t len = answer.body ? answer.body->size() : 0;
  put("Server", options.name);
  put("Date", date());
  if (len > 0) put("Content-Type", answer.type);
  if (answer.status != 204) put("Content-Length", std::to_string(len));
  put("Connection", is_last ? "close" : "keep-alive");
  if (!is_last) put("Keep-Alive", "timeout=" + std::to_string(options.idle_time.count()));
  for (const Header &header : answer.headers) put(header.name, header.value);
  for (const Header &header : options.headers) {
    if (find_header(answer.headers, header.name) == nullptr) put(header.name, header.value);
  }
  return head + "\r\n";
}

Answer answer_of(Handler &handler, const Request &request) {
  try {
    return handler.answer(request);
  } catch (const std::exception &error) {
    return failure(500, error.what());
  }
}

struct Listener {
  tcp::acceptor acceptor;
  std::string address;  // as it was asked for
  Handler &handler;
  ListenOptions options;
  std::unique_ptr<asio::ssl::context> tls;
  bool is_accepting = false;
};

// ---- A connection

/// What a connection waits for.
enum class Phase {
  kReading,  // a request that has begun, or the first one
  kIdle,     // a next request
  kWorking,  // a worker
  kWriting,  // the client to take the answer
  kEnding,   // the client to close
  kClosed,
};

/// The order in which phases give way to newer connections; those from kWorking on do not.
int precedence(Phase phase) {
  switch (phase) {
    case Phase::kEnding:
      return 0;
    case Phase::kReading:
      return 1;
    case Phase::kWriting:
      return 2;
    case Phase::kIdle:
      return 3;
    case Phase::kWorking:
    case Phase::kClosed:
      return 4;
  }
  return 4;
}

class Connection;

/// What connections need of the server.
class Home {
 public:
  virtual ~Home() = default;
  virtual asio::io_context &io() = 0;
  virtual const ServerOptions &options() const = 0;
  virtual Workers &workers() = 0;
  virtual bool is_ending() const = 0;
  virtual uint64_t next_number() = 0;
  virtual void count_body_bytes(ptrdiff_t change) = 0;
  virtual void forget(Connection &connection) = 0;
};

class Connection : public std::enable_shared_from_this<Connection> {
 public:
  Connection(Home &home, Listener &listener, std::unique_ptr<Stream> stream)
      : home_(home),
        listener_(listener),
        stream_(std::move(stream)),
        reader_(home.options().limits) {}

  void start(const tcp::endpoint &peer) {
    const asio::ip::address address = plain_address(peer.address());
    neighbour = neighbour_of(address);
    peer_ = endpoint_text(address.to_string(), peer.port());
    begin_request();
    stream_->begin(guarded([this](error_code code, size_t) { code ? close() : receive(); }));
  }

  void meet_deadline(Clock::time_point now);
  void refuse(const Refusal &refusal);
  void end(Clock::time_point now);
  void close();

  std::string neighbour;
  Phase phase() const { return phase_; }
  Clock::time_point since() const { return since_; }
  size_t body_len() const { return body_len_; }

 private:
  Stream::Done guarded(std::function<void(error_code, size_t)> step);
  void enter(Phase phase, Clock::duration time);
  void begin_request();
  void receive();
  void take(error_code code, size_t num_bytes);
  void advance();
  bool take_head();
  bool is_for_this_server(const Request &request) const;
  void invite_body();
  void count_body();
  void submit();
  void respond(Answer answer, bool can_go_on);
  void finish_exchange(error_code code);
  void say_goodbye();
  void drain();
  void log(int status, const std::string &note);

  Home &home_;
  Listener &listener_;
  std::unique_ptr<Stream> stream_;
  RequestReader reader_;
  std::array<char, 8192> room_;
  Phase phase_ = Phase::kReading;
  Clock::time_point since_;  // in this phase
  Clock::time_point deadline_;
  size_t body_len_ = 0;  // counted at home
  std::string peer_;

  // The exchange at hand.
  Clock::time_point begun_;
  LogEntry entry_;
  bool is_head_ = false;  // by method
  bool is_logged_ = true;
  bool goes_on_ = false;  // to a next request
  Answer answer_;
  std::string answer_head_;
};

/// A callback that keeps the connection alive, does nothing once it is closed, and whose failure
/// costs no more than this connection.
Stream::Done Connection::guarded(std::function<void(error_code, size_t)> step) {
  return [self = shared_from_this(), step = std::move(step)](error_code code, size_t num_bytes) {
    if (self->phase_ == Phase::kClosed) return;
    try {
      step(code, num_bytes);
    } catch (const std::exception &) {
      self->close();
    }
  };
}

void Connection::enter(Phase phase, Clock::duration time) {
  phase_ = phase;
  since_ = Clock::now();
  deadline_ = time == Clock::duration::max() ? Clock::time_point::max() : since_ + time;
}

/// The clock of the request to come runs from here.
void Connection::begin_request() {
  enter(Phase::kReading, home_.options().request_time);
  begun_ = since_;
  entry_ = {.time = std::chrono::system_clock::now(), .peer = peer_, .method = "-", .target = "-"};
  is_head_ = false;
  is_logged_ = false;
}

void Connection::receive() {
  stream_->read_some(asio::buffer(room_),
                     guarded([this](error_code code, size_t num_bytes) { take(code, num_bytes); }));
}

void Connection::take(error_code code, size_t num_bytes) {
  if (phase_ != Phase::kReading && phase_ != Phase::kIdle) return;  // it was refused meanwhile
  if (code) {
    const bool is_half_closed = code == asio::error::eof && reader_.has_begun();
    return is_half_closed ? refuse({400, "it ends before its end"}) : close();
  }
  // A connection that is silent at first has the time of a request, and then no more.
  if (phase_ == Phase::kIdle) begin_request();
  reader_.feed({room_.data(), num_bytes});
  advance();
}

void Connection::advance() {
  for (;;) {
    switch (reader_.advance()) {
      case RequestReader::Step::kNeedsMore:
        count_body();
        if (phase_ == Phase::kReading) receive();
        return;
      case RequestReader::Step::kHead:
        if (!take_head()) return;
        break;
      case RequestReader::Step::kComplete:
        count_body();
        if (phase_ == Phase::kReading) submit();
        return;
      case RequestReader::Step::kRefused:
        return refuse(reader_.refusal());
    }
  }
}

/// Returns whether the body comes next.
bool Connection::take_head() {
  Request &request = reader_.request();
  request.peer = peer_;
  request.number = entry_.number = home_.next_number();
  entry_.method = request.method;
  entry_.target = request.target;
  is_head_ = request.method == "HEAD";
  if (!is_for_this_server(request)) {
    respond(failure(403,
                    "expected no Origin, and a Host that is an address of this server or "
                    "allowed by --allow-host"),
            !reader_.has_body());
    return false;
  }
  if (std::optional<Answer> early = listener_.handler.answer_early(request)) {
    respond(std::move(*early), !reader_.has_body());
    return false;
  }
  if (reader_.expects_continue() && reader_.has_body() && !reader_.has_fed_body_bytes()) {
    invite_body();
    return false;
  }
  return true;
}

bool Connection::is_for_this_server(const Request &request) const {
  const std::string *host = find_header(request.headers, "Host");
  const std::string *origin = find_header(request.headers, "Origin");
  if (origin != nullptr) {
    const std::string own = (listener_.tls ? "https://" : "http://") + (host ? *host : "");
    if (!listener_.options.allows_own_pages || !same_word(*origin, own)) return false;
  }
  if (host == nullptr) return true;  // HTTP/1.0: no page can ask so
  const std::optional<std::string> name = host_of(*host);
  if (!name) return false;
  const auto is_it = [&](const std::string &allowed) { return same_word(*name, allowed); };
  if (is_it("localhost") || is_it(listener_.address)) return true;
  if (std::ranges::any_of(listener_.options.allowed_hosts, is_it)) return true;
  error_code code;
  const tcp::endpoint local = stream_->socket().local_endpoint(code);
  return !code && is_text_of(*name, plain_address(local.address()));
}

void Connection::invite_body() {
  stream_->write({asio::buffer(kContinue), {}}, guarded([this](error_code code, size_t) {
                   if (phase_ != Phase::kReading) return;
                   code ? close() : advance();
                 }));
}

/// May come back with this connection refused.
void Connection::count_body() {
  const size_t len = reader_.request().body.size();
  const auto change = static_cast<ptrdiff_t>(len) - static_cast<ptrdiff_t>(body_len_);
  body_len_ = len;
  home_.count_body_bytes(change);
}

void Connection::submit() {
  enter(Phase::kWorking, Clock::duration::max());
  auto request = std::make_shared<Request>(std::move(reader_.request()));
  const auto done = guarded([this](error_code, size_t) { respond(std::move(answer_), true); });
  home_.workers().submit([self = shared_from_this(), request, done] {
    // Nobody else touches the answer before `done` runs.
    self->answer_ = self->home_.is_ending() ? failure(503, "the server is ending")
                                            : answer_of(self->listener_.handler, *request);
    asio::post(self->home_.io(), [done] { done({}, 0); });
  });
}

void Connection::refuse(const Refusal &refusal) {
  if (phase_ == Phase::kReading && entry_.number == 0) entry_.number = home_.next_number();
  error_code ignored;
  stream_->socket().cancel(ignored);
  respond(failure(refusal.status, refusal.text), false);
}

void Connection::respond(Answer answer, bool can_go_on) {
  home_.count_body_bytes(-static_cast<ptrdiff_t>(std::exchange(body_len_, 0)));
  goes_on_ = can_go_on && reader_.keeps_connection() && !home_.is_ending();
  enter(Phase::kWriting,
        home_.is_ending() ? Clock::duration(kAnswerAtEnd) : home_.options().answer_time);
  answer_ = std::move(answer);
  answer_head_ = head_of(answer_, home_.options(), !goes_on_);
  const bool has_body = answer_.body && !is_head_;
  stream_->write(
      {asio::buffer(answer_head_), has_body ? asio::buffer(*answer_.body) : asio::const_buffer()},
      guarded([this](error_code code, size_t) { finish_exchange(code); }));
}

void Connection::finish_exchange(error_code code) {
  log(answer_.status, answer_.note);
  answer_ = {};
  if (code) return close();
  if (!goes_on_ || home_.is_ending()) return say_goodbye();
  reader_.begin_next();
  if (reader_.has_begun()) {
    begin_request();
    return advance();
  }
  enter(Phase::kIdle, home_.options().idle_time + kIdleMargin);
  receive();
}

/// What is unread when a socket is closed would take the answer with it.
void Connection::say_goodbye() {
  enter(Phase::kEnding, home_.is_ending() ? kFarewellAtEnd : kFarewell);
  stream_->say_goodbye(guarded([this](error_code, size_t) {
    error_code ignored;
    stream_->socket().shutdown(tcp::socket::shutdown_send, ignored);
    drain();
  }));
}

void Connection::drain() {
  stream_->socket().async_read_some(
      asio::buffer(room_), guarded([this](error_code code, size_t) { code ? close() : drain(); }));
}

void Connection::close() {
  if (phase_ == Phase::kClosed) return;
  if (phase_ == Phase::kWriting) log(answer_.status, "the answer was not taken");
  if (phase_ == Phase::kReading && reader_.has_begun()) log(0, "the request did not end");
  phase_ = Phase::kClosed;
  home_.count_body_bytes(-static_cast<ptrdiff_t>(std::exchange(body_len_, 0)));
  error_code ignored;
  stream_->socket().close(ignored);
  home_.forget(*this);
}

void Connection::meet_deadline(Clock::time_point now) {
  if (now < deadline_) return;
  if (phase_ == Phase::kReading && reader_.has_begun()) {
    refuse({408, "the request took longer than --request-time allows"});
  } else if (phase_ == Phase::kIdle) {
    error_code ignored;
    stream_->socket().cancel(ignored);
    say_goodbye();
  } else {
    close();
  }
}

/// The server ends: nothing more is read, and what is at work has its time.
void Connection::end(Clock::time_point now) {
  if (phase_ == Phase::kReading || phase_ == Phase::kIdle || phase_ == Phase::kEnding) close();
  if (phase_ == Phase::kWriting) deadline_ = std::min(deadline_, now + kAnswerAtEnd);
}

void Connection::log(int status, const std::string &note) {
  if (std::exchange(is_logged_, true) || !home_.options().log) return;
  entry_.status = status;
  entry_.duration = std::chrono::duration_cast<std::chrono::microseconds>(Clock::now() - begun_);
  entry_.note = note;
  home_.options().log(entry_);
}

}  // namespace

// ---- The server

class Server::Loop : public Home {
 public:
  explicit Loop(ServerOptions options);
  ~Loop() override;
  std::string listen(const Endpoint &endpoint, Handler &handler, ListenOptions options);
  void run();
  void stop();

  asio::io_context &io() override { return io_; }
  const ServerOptions &options() const override { return options_; }
  Workers &workers() override { return workers_; }
  bool is_ending() const override { return is_ending_; }
  uint64_t next_number() override { return ++num_requests_; }
  void count_body_bytes(ptrdiff_t change) override;
  void forget(Connection &connection) override;

 private:
  void accept(Listener &listener);
  void admit(Listener &listener, tcp::socket socket);
  bool make_room(const std::string &neighbour);
  bool close_least_deserving(const std::string *neighbour);
  void tick();
  void end();
  std::vector<std::shared_ptr<Connection>> connections() const;

  ServerOptions options_;
  asio::io_context io_{1};
  asio::steady_timer timer_{io_};
  asio::signal_set signals_{io_};
  std::list<Listener> listeners_;
  std::map<const Connection *, std::shared_ptr<Connection>> connections_;
  std::map<std::string, size_t> num_of_neighbour_;
  ptrdiff_t unfinished_len_ = 0;
  uint64_t num_requests_ = 0;
  std::atomic<bool> is_ending_ = false;
  Workers workers_;
};

/// As many connections as the system leaves room for.
static size_t allow_files(size_t num_connections) {
  rlimit limit{};
  getrlimit(RLIMIT_NOFILE, &limit);
  limit.rlim_cur =
      std::max(limit.rlim_cur, std::min<rlim_t>(limit.rlim_max, num_connections + kSpareFiles));
  setrlimit(RLIMIT_NOFILE, &limit);
  const size_t num_files = limit.rlim_cur;
  return std::min(num_connections, num_files - std::min(num_files - 1, kSpareFiles));
}

Server::Loop::Loop(ServerOptions options)
    : options_(std::move(options)), workers_(options_.num_workers) {
  // Bodies come in all lengths: as mappings of their own they leave no holes when they go.
  mallopt(M_MMAP_THRESHOLD, kOwnMappingLen);
  options_.max_connections = allow_files(options_.max_connections);
}

Server::Loop::~Loop() {
  workers_.finish();
}

std::string Server::Loop::listen(const Endpoint &endpoint, Handler &handler,
                                 ListenOptions options) {
  std::unique_ptr<asio::ssl::context> tls = make_tls(options);
  const char *scheme = tls ? "https://" : "http://";
  Listener &listener = listeners_.emplace_back(
      Listener{bind(io_, endpoint), endpoint.address, handler, std::move(options), std::move(tls)});
  accept(listener);
  return scheme + endpoint_text(endpoint.address, listener.acceptor.local_endpoint().port());
}

void Server::Loop::accept(Listener &listener) {
  listener.is_accepting = true;
  listener.acceptor.async_accept([this, &listener](error_code code, tcp::socket socket) {
    listener.is_accepting = false;
    if (is_ending_) return;
    if (code == asio::error::no_descriptors) {
      close_least_deserving(nullptr);
      return;  // the next tick accepts again
    }
    if (!code) admit(listener, std::move(socket));
    accept(listener);
  });
}

void Server::Loop::admit(Listener &listener, tcp::socket socket) {
  error_code code;
  const tcp::endpoint peer = socket.remote_endpoint(code);
  if (code || !make_room(neighbour_of(plain_address(peer.address())))) return;
  socket.set_option(tcp::no_delay(true), code);
  std::unique_ptr<Stream> stream;
  if (listener.tls) {
    stream = std::make_unique<TlsStream>(std::move(socket), *listener.tls);
  } else {
    stream = std::make_unique<PlainStream>(std::move(socket));
  }
  const auto connection = std::make_shared<Connection>(*this, listener, std::move(stream));
  connection->start(peer);
  connections_[connection.get()] = connection;
  ++num_of_neighbour_[connection->neighbour];
}

bool Server::Loop::make_room(const std::string &neighbour) {
  const auto found = num_of_neighbour_.find(neighbour);
  const size_t num_of_neighbour = found == num_of_neighbour_.end() ? 0 : found->second;
  if (num_of_neighbour >= options_.max_connections_per_address) {
    return close_least_deserving(&neighbour);
  }
  return connections_.size() < options_.max_connections || close_least_deserving(nullptr);
}

bool Server::Loop::close_least_deserving(const std::string *neighbour) {
  Connection *least = nullptr;
  const auto rank = [](const Connection *c) {
    return std::pair(precedence(c->phase()), c->since());
  };
  for (const auto &[address, connection] : connections_) {
    if (neighbour != nullptr && connection->neighbour != *neighbour) continue;
    if (connection->phase() == Phase::kWorking) continue;
    if (least == nullptr || rank(connection.get()) < rank(least)) least = connection.get();
  }
  if (least != nullptr) least->close();
  return least != nullptr;
}

void Server::Loop::count_body_bytes(ptrdiff_t change) {
  unfinished_len_ += change;
  while (change > 0 && unfinished_len_ > static_cast<ptrdiff_t>(options_.max_unfinished_len)) {
    Connection *longest = nullptr;
    for (const auto &[address, connection] : connections_) {
      if (connection->phase() != Phase::kReading || connection->body_len() <= kSmallBodyLen)
        continue;
      if (longest == nullptr || connection->body_len() > longest->body_len()) {
        longest = connection.get();
      }
    }
    if (longest == nullptr) return;
    longest->refuse({503, "too many long requests at once"});
  }
}

void Server::Loop::forget(Connection &connection) {
  const auto count = num_of_neighbour_.find(connection.neighbour);
  if (count != num_of_neighbour_.end() && --count->second == 0) num_of_neighbour_.erase(count);
  connections_.erase(&connection);
}

std::vector<std::shared_ptr<Connection>> Server::Loop::connections() const {
  std::vector<std::shared_ptr<Connection>> all;
  for (const auto &[address, connection] : connections_) all.push_back(connection);
  return all;
}

void Server::Loop::tick() {
  const Clock::time_point now = Clock::now();
  for (const auto &connection : connections()) connection->meet_deadline(now);
  if (is_ending_ && connections_.empty()) return;
  for (Listener &listener : listeners_) {
    if (!listener.is_accepting && !is_ending_) accept(listener);
  }
  timer_.expires_after(kTick);
  timer_.async_wait([this](error_code) { tick(); });
}

void Server::Loop::end() {
  if (is_ending_.exchange(true)) return;
  signals_.cancel();
  for (Listener &listener : listeners_) {
    error_code ignored;
    listener.acceptor.close(ignored);
  }
  const Clock::time_point now = Clock::now();
  for (const auto &connection : connections()) connection->end(now);
}

void Server::Loop::run() {
  signal(SIGPIPE, SIG_IGN);
  signals_.add(SIGTERM);
  signals_.add(SIGINT);
  signals_.async_wait([this](error_code code, int) {
    if (!code) end();
  });
  tick();
  io_.run();
  workers_.finish();
}

void Server::Loop::stop() {
  asio::post(io_, [this] { end(); });
}

void check_tls(const ListenOptions &options) {
  (void)make_tls(options);
}

Server::Server(ServerOptions options) : loop_(std::make_unique<Loop>(std::move(options))) {}
Server::~Server() = default;

std::string Server::listen(const Endpoint &endpoint, Handler &handler, ListenOptions options) {
  return loop_->listen(endpoint, handler, std::move(options));
}

void Server::run() {
  loop_->run();
}

void Server::stop() {
  loop_->stop();
}

}  // namespace http
