// SPDX-License-Identifier: BSD-2-Clause
/// Addresses and ports as people and clients write them.
#ifndef HTTP_ENDPOINT_H
#define HTTP_ENDPOINT_H

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace http {

struct Endpoint {
  std::string address;  // or a name; an IPv6 address without its brackets
  uint16_t port = 0;    // to listen on 0: any that is free

  bool operator==(const Endpoint &) const = default;
};

/// "127.0.0.1:8080", "[::1]:8080"; throws tools::UsageError.
Endpoint parse_endpoint(std::string_view text);

/// "[::1]:8080"
std::string endpoint_text(std::string_view address, uint16_t port);

/// The host of a Host header or of an Origin behind its scheme: what stands before the port. An
/// IPv6 address loses its brackets. Nothing when it is no host.
std::optional<std::string> host_of(std::string_view authority);

}  // namespace http

#endif
