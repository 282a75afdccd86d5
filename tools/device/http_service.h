// SPDX-License-Identifier: BSD-2-Clause
/// The device end of OTrP over HTTP, for TSMs that bring their own transport.
///
///     POST /otrp             the signed response to the request; its outer member says which it is
///     POST /otrp/MESSAGE     the same, for this message alone
///     GET /images/NUMBER     the TA image that a response came with (header OTrP-TA-Image)
///     GET /info              device ID and TEE public key
///     GET /query/TAID        whether a TA is recorded
///     GET /healthz           whether the device can be used
///
/// A message that the device answers with a signed response is a success, whatever the response
/// says; the header OTrP-Status tells. Any other outcome has a JSON body: "message", and where the
/// device gave a code, "code" and "name".
#ifndef DEVICE_HTTP_SERVICE_H
#define DEVICE_HTTP_SERVICE_H

#include <deque>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "device/device_client.h"
#include "device/state_watch.h"
#include "http/router.h"

namespace device {

/// For one worker: the device serves one request at a time. Between requests the session with the
/// agent stays open, so that a TSM finds the device state as its last response described it.
class HttpService {
 public:
  /// With `traces` all that the agent logs is printed, else what it logs of a failure.
  HttpService(Device &device, const std::string &state_directory, bool traces);

  http::Handler &handler() { return router_; }

 private:
  struct KeptImage {
    std::string number;
    std::shared_ptr<const std::string> bytes;
  };

  void add_routes();
  template <class Answering>
  http::Answer use_device(Answering &&answering);
  http::Answer info();
  http::Answer query(const std::string &taid);
  http::Answer message(const Message *expected, std::string_view request);
  http::Answer signed_response(Answer answer);
  http::Answer image(std::string_view number) const;
  http::Answer health() const;
  Session &agent();
  std::string keep_image(std::string bytes);  // its path

  Device &device_;
  StateWatch state_;
  http::Router router_;
  std::optional<Session> agent_;
  std::deque<KeptImage> images_;
  uint64_t num_images_ = 0;
  bool traces_;
};

}  // namespace device

#endif
