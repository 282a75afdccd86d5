// SPDX-License-Identifier: BSD-2-Clause
/// A device that answers over HTTP, without the HTTP: what each request gets, as status, content
/// and headers.
///
/// A message that the device answers with a signed response is a success, whatever the response
/// says. Any other outcome has a JSON body: "message", and where the device gave a code, "code"
/// and "name".
#ifndef DEVICE_HTTP_SERVICE_H
#define DEVICE_HTTP_SERVICE_H

#include <deque>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>

#include "device/device_client.h"

namespace device {

constexpr std::string_view kOtrpType = "application/otrp+json";  // of requests and responses

struct HttpAnswer {
  int status = 200;
  std::string type = "application/json";
  std::string body = {};
  std::string image_path = {};  // where the TA image of a response is found; empty without one
};

/// The answer when HTTP itself is the matter, or a body that says more than its status.
HttpAnswer http_failure(int status, std::string_view message);

/// Any thread may call; the device serves one request at a time. Between requests the session with
/// the agent stays open, so that a TSM finds the device state as its last response described it.
class HttpService {
 public:
  explicit HttpService(Device &device) : device_(device) {}

  HttpAnswer info();
  HttpAnswer query(const std::string &taid);
  HttpAnswer message(const std::string &name, const std::string &request);

  /// The TA image number `number`; only the latest few are kept.
  HttpAnswer image(std::string_view number);

 private:
  struct KeptImage {
    std::string number;
    std::string bytes;
  };

  template <class Answering>
  HttpAnswer exclusively(Answering &&answering);
  Session &agent();
  std::string keep_image(std::string bytes);  // its path

  Device &device_;
  std::mutex lock_;  // of all below
  std::optional<Session> agent_;
  std::deque<KeptImage> images_;
  uint64_t num_images_ = 0;
};

}  // namespace device

#endif
