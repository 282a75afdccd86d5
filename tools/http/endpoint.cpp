// SPDX-License-Identifier: BSD-2-Clause
#include "http/endpoint.h"

#include <algorithm>
#include <charconv>

#include "common/error_line.h"

namespace http {
namespace {

struct Authority {
  std::string_view host;
  std::string_view port;  // with its colon; empty when there is none
};

/// Only an address in brackets has colons of its own.
std::optional<Authority> split(std::string_view text) {
  if (text.starts_with('[')) {
    const size_t end = text.find(']');
    if (end == std::string_view::npos) return std::nullopt;
    return Authority{text.substr(1, end - 1), text.substr(end + 1)};
  }
  const size_t colon = std::min(text.find(':'), text.size());
  return Authority{text.substr(0, colon), text.substr(colon)};
}

std::optional<uint16_t> port_of(std::string_view text) {
  if (!text.starts_with(':')) return std::nullopt;
  uint16_t port = 0;
  const char *end = text.data() + text.size();
  const auto [rest, failure] = std::from_chars(text.data() + 1, end, port);
  if (failure != std::errc() || rest != end) return std::nullopt;
  return port;
}

bool is_host_character(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '.' ||
         c == '-' || c == '_' || c == ':' || c == '%';
}

}  // namespace

Endpoint parse_endpoint(std::string_view text) {
  const std::optional<Authority> authority = split(text);
  const std::optional<uint16_t> port = authority ? port_of(authority->port) : std::nullopt;
  if (!port || authority->host.empty()) {
    throw tools::UsageError("bad address \"" + std::string(text) +
                            "\": expected ADDRESS:PORT or [ADDRESS]:PORT, with a port up to 65535");
  }
  return {std::string(authority->host), *port};
}

std::string endpoint_text(std::string_view address, uint16_t port) {
  const bool is_ipv6 = address.find(':') != std::string_view::npos;
  const std::string host = is_ipv6 ? "[" + std::string(address) + "]" : std::string(address);
  return host + ":" + std::to_string(port);
}

std::optional<std::string> host_of(std::string_view text) {
  const std::optional<Authority> authority = split(text);
  if (!authority || authority->host.empty()) return std::nullopt;
  if (!authority->port.empty() && !port_of(authority->port)) return std::nullopt;
  if (!std::ranges::all_of(authority->host, is_host_character)) return std::nullopt;
  return std::string(authority->host);
}

}  // namespace http
