// SPDX-License-Identifier: BSD-2-Clause
/// One session of a device with its TSM, over HTTP: the device asks whether there is something to
/// do with an empty POST, is answered with a request, POSTs its response, is answered with the next
/// request, and so on until an answer is empty.
///
///     device                                                   TSM
///     POST, no body                                    ────►
///                                                      ◄────   200, request
///     (carries it out)    POST, response               ────►
///                                                      ◄────   200, request, or 204
///
/// Neither side of the connection is trusted: requests and responses protect themselves. A body is
/// never sent twice. What goes wrong ends the session, and the next one begins with the empty POST,
/// where the TSM learns anew how the device is.
///
/// Sessions of different devices may run at once, each in a thread.
#ifndef DEVICE_BROKER_SESSION_H
#define DEVICE_BROKER_SESSION_H

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <string_view>

#include "device/broker/stop.h"
#include "device/device_client.h"
#include "http/client.h"

namespace broker {

/// What carries messages out: the agent of a device.
class Agent {
 public:
  virtual ~Agent() = default;

  /// A message that failed is an answer. Throws a device::Error where there is none.
  virtual device::Answer send(const tools::Message &message, std::string_view request) = 0;
};

/// A message that was carried out, or that the agent gave no response to.
struct Exchange {
  const tools::Message *message = nullptr;
  std::string verdict;                    // "pass", "fail 0xDEAD0001 OTRP_DSI_MISMATCH"
  std::string image;                      // ID of the TA whose image was kept, if one was
  std::chrono::microseconds tsm_time{0};  // from the POST to the request that answered it
  std::chrono::microseconds agent_time{0};
};

/// What a session is between. Functions may throw other things than these, which end it unheard.
struct Ends {
  std::string url;                                      // see device_url()
  std::function<http::Reply(const http::Call &)> post;  // throws http::ClientError
  std::function<std::unique_ptr<Agent>()> open_agent;   // for the first message
  /// Keeps the image of a TA that was installed or updated; throws tools::UsageError when it
  /// cannot, and the TSM is not told then that it was. Empty: images are dropped.
  std::function<void(const std::string &taid, std::string_view image)> keep_image;
  std::function<void(const Exchange &)> on_exchange;  // may be empty
};

enum class End {
  kDone,         // the TSM has nothing more
  kStopped,      // between two messages
  kUnreachable,  // no connection, no answer in time, a server's failure: try again, later
  kRefused,      // by the TSM, or what it sends is nothing to obey
  kNoResponse,   // the agent gave none, only a code
  kImageNotKept,
  kTooLong,  // more messages than allowed
};

struct Outcome {
  End end = End::kDone;
  size_t num_messages = 0;
  std::string reason;                   // one line; empty where it ended well
  uint32_t code = 0;                    // where the agent gave one
  std::chrono::seconds retry_after{0};  // what the server wishes
};

Outcome run_session(const Ends &ends, size_t max_messages, const Stop &stop);

}  // namespace broker

#endif
