// SPDX-License-Identifier: BSD-2-Clause
/// Requests of the stored device's TSM: good ones, and good ones with something inside changed.
#ifndef FUZZ_SEALED_REQUEST_H
#define FUZZ_SEALED_REQUEST_H

#include <optional>
#include <string>
#include <string_view>

#include "support/stored_device.h"
#include "tsm/request.h"

namespace fuzz {

/// Same in every run: what is found once can be run again.
constexpr char kRid[] = "0123456789abcdef";
constexpr char kTid[] = "fedcba9876543210";

/// The request around a content that is given as it goes into the encryption: for GetDeviceState
/// the text of its key chain, and for GetTAInfo the whole message. `image` is what InstallTA and
/// UpdateTA bring, for the SP "bank".
std::string request_around(tsm::MessageId id, std::string_view content, std::string_view image);

/// The message of a frame opened, down to what is encrypted in it.
struct OpenedRequest {
  const tsm::Message *message;
  std::string payload;
  tsm::Json tbs;  // the payload; null when it is no JSON
  std::optional<std::string> content;

  /// The members of the request in `tbs`, or NULL.
  tsm::Json *members();
};

/// Nothing when the text is no signed message.
std::optional<OpenedRequest> open_request(std::string_view text);

/// Signs `payload`, and for a message with an image everything that its second signature covers.
std::string seal_payload(const tsm::Message &message, std::string_view payload,
                         std::string_view taid);

/// A frame taken apart. The blocks in front of the message stay as they are.
struct Frame {
  std::string head;  // all that precedes the message ID
  uint32_t message_id;
  std::string text;
};
std::optional<Frame> parse_frame(std::string_view bytes);
std::string serialize_frame(const Frame &frame);

}  // namespace fuzz

#endif
