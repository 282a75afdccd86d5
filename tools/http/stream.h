// SPDX-License-Identifier: BSD-2-Clause
/// A connection's bytes, behind TLS or not. Only for server.cpp, which knows Boost.Asio.
#ifndef HTTP_STREAM_H
#define HTTP_STREAM_H

#include <array>
#include <boost/asio/buffer.hpp>
#include <boost/asio/ip/tcp.hpp>
#include <boost/asio/ssl/context.hpp>
#include <boost/asio/ssl/stream.hpp>
#include <boost/asio/write.hpp>
#include <functional>
#include <memory>
#include <string>
#include <utility>

namespace http {

using boost::system::error_code;

/// Each operation calls `done` later, never at once. One reading and one writing operation may be
/// under way together; cancel() and close() of the socket end both.
class Stream {
 public:
  using Done = std::function<void(error_code, size_t)>;
  using Pieces = std::array<boost::asio::const_buffer, 2>;

  virtual ~Stream() = default;
  virtual boost::asio::ip::tcp::socket &socket() = 0;
  virtual void begin(Done done) = 0;
  virtual void read_some(boost::asio::mutable_buffer room, Done done) = 0;
  virtual void write(const Pieces &pieces, Done done) = 0;  // all of them
  virtual void say_goodbye(Done done) = 0;                  // before the socket is shut down
};

class PlainStream : public Stream {
 public:
  explicit PlainStream(boost::asio::ip::tcp::socket socket) : socket_(std::move(socket)) {}
  boost::asio::ip::tcp::socket &socket() override { return socket_; }
  void begin(Done done) override { call_later(std::move(done)); }
  void read_some(boost::asio::mutable_buffer room, Done done) override {
    socket_.async_read_some(room, std::move(done));
  }
  void write(const Pieces &pieces, Done done) override {
    boost::asio::async_write(socket_, pieces, std::move(done));
  }
  void say_goodbye(Done done) override { call_later(std::move(done)); }

 private:
  void call_later(Done done) {
    boost::asio::post(socket_.get_executor(), [done = std::move(done)] { done({}, 0); });
  }

  boost::asio::ip::tcp::socket socket_;
};

class TlsStream : public Stream {
 public:
  TlsStream(boost::asio::ip::tcp::socket socket, boost::asio::ssl::context &context)
      : stream_(std::move(socket), context) {}
  boost::asio::ip::tcp::socket &socket() override { return stream_.next_layer(); }
  void begin(Done done) override {
    stream_.async_handshake(boost::asio::ssl::stream_base::server,
                            [done = std::move(done)](error_code code) { done(code, 0); });
  }
  void read_some(boost::asio::mutable_buffer room, Done done) override {
    stream_.async_read_some(room, std::move(done));
  }
  void write(const Pieces &pieces, Done done) override {
    boost::asio::async_write(stream_, pieces, std::move(done));
  }
  void say_goodbye(Done done) override {
    stream_.async_shutdown([done = std::move(done)](error_code code) { done(code, 0); });
  }

 private:
  boost::asio::ssl::stream<boost::asio::ip::tcp::socket> stream_;
};

}  // namespace http

#endif
