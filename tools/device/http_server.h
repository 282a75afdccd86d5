// SPDX-License-Identifier: BSD-2-Clause
/// The device end of OTrP over HTTP, for TSMs that bring their own transport.
///
///     POST /otrp/MESSAGE    the signed response; header OTrP-TA-Image names the path of a TA image
///     GET /images/NUMBER    that image
///     GET /info             device ID and TEE public key
///     GET /query/TAID       whether a TA is recorded
#ifndef DEVICE_HTTP_SERVER_H
#define DEVICE_HTTP_SERVER_H

#include <cstddef>
#include <string>
#include <string_view>

#include "device/device_client.h"

namespace device {

struct Endpoint {
  std::string address;
  int port = 0;  // 0: any that is free

  bool operator==(const Endpoint &) const = default;
};

/// "127.0.0.1:8080", "[::1]:8080"; throws tools::UsageError.
Endpoint parse_endpoint(std::string_view text);

/// Serves until SIGTERM or SIGINT, which end it once the requests at work are answered. When it
/// listens, its URL is on standard output; each request is a line on standard error. The caller
/// runs no other threads. Throws tools::UsageError when it cannot listen there.
void run_http_server(Device &device, const Endpoint &endpoint, size_t max_body_len);

}  // namespace device

#endif
