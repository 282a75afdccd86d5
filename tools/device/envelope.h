// SPDX-License-Identifier: BSD-2-Clause
/// What the messages that pass by say of themselves, as far as it can be read without a key. The
/// agent alone decides about them; this is for those who carry them, and for those who ask why.
#ifndef DEVICE_ENVELOPE_H
#define DEVICE_ENVELOPE_H

#include <cstdint>
#include <string>
#include <string_view>

#include "common/messages.h"

namespace device {

/// The message that `request` is by its outer member ("CreateSDRequest"). `expected` is the one
/// that the caller was told; NULL: none. Where it was told one, an object without any member
/// passes.
///
/// Throws tools::UsageError, in a sentence, for a text that is no JSON object, is another message
/// than the expected one, or names none.
const tools::Message &message_in(std::string_view request, const tools::Message *expected);

/// "pass", or "fail 0xDEAD0001 OTRP_DSI_MISMATCH": what a signed response says, or a code.
std::string verdict_of_response(std::string_view response);
std::string verdict_of_code(uint32_t code);

/// ID of the TA whose image belongs to this signed response: its message installed or updated it,
/// and passed. Empty for any other response. Beside one that says "fail" there can be an image,
/// too, and it is not to be loaded.
std::string installed_ta(std::string_view response);

/// What `request` has that no device can take: it is cut, or a public key is not encoded as devices
/// read it. A sentence, or nothing where nothing of the kind is to be seen.
std::string flaw_of_request(std::string_view request);

}  // namespace device

#endif
