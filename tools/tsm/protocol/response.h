// SPDX-License-Identifier: BSD-2-Clause
/// Responses: envelope, signature, decrypted content. What has not been verified is handed to no
/// one as if it were true: open_response() gives a verified response or throws NotVerified.
#ifndef TSM_PROTOCOL_RESPONSE_H
#define TSM_PROTOCOL_RESPONSE_H

#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>

#include "tsm/protocol/crypto.h"
#include "tsm/protocol/json.h"
#include "tsm/protocol/messages.h"

namespace tsm {

/// The response is malformed, does not verify or does not decrypt.
class NotVerified : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// A response taken apart; nothing in it has been verified yet.
struct Envelope {
  const Message *message;
  std::string signing_input;
  Bytes signature;
  std::string payload_text;
  Json payload;
  Json header;  // unprotected
};

/// Throws NotVerified for a text that is no RS256 response to one of the eight messages.
Envelope parse_envelope(std::string_view text);

bool signature_verifies(const Envelope &envelope, const RsaKey &key);

struct ResponseKeys {
  RsaKey tee_key;             // the device's: signs all responses but GetTAInfo's
  RsaKey tsm_key;             // this TSM's private key: opens contents
  const Json *dsi = nullptr;  // lists the AIKs, which sign GetTAInfo's
};

struct Response {
  const Message *message;
  std::string payload_text;
  Json header;
  Json members;                             // of the payload, without its outer name
  std::string status = {};                  // "pass", "fail", or empty where the message has none
  std::optional<uint32_t> error_code = {};  // with "fail"
  std::optional<std::string> content_text = {};  // decrypted "content" or "edsi"
  Json content = nullptr;                        // the same, parsed
  std::optional<std::string> dsi_text = {};      // the state document, as its hash covers it
};

/// Throws tools::UsageError when a GetTAInfo response comes without a state to verify it with.
Response open_response(std::string_view text, const ResponseKeys &keys);
Response open_response(Envelope envelope, const ResponseKeys &keys);

/// Why a verified response is a refusal, with its code; empty when it is none.
std::string refusal_of(const Response &response);

}  // namespace tsm

#endif
