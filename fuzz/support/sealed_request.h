// SPDX-License-Identifier: BSD-2-Clause
/// Good requests of the stored device's TSM with something inside changed.
#ifndef FUZZ_SEALED_REQUEST_H
#define FUZZ_SEALED_REQUEST_H

#include <string>
#include <string_view>

#include "support/stored_device.h"
#include "tsm/protocol/request.h"

namespace fuzz {

/// The frame of a request around a content that is given as it goes into the encryption: for
/// GetDeviceState the text of its key chain, and for GetTAInfo the whole message. `image` is what
/// InstallTA and UpdateTA bring, for the SP "bank".
std::string frame_around(tsm::MessageId id, std::string_view content, std::string_view image = "");

/// The "taid" in the text of a content; empty when there is none.
std::string taid_of(std::string_view content);

/// Signs `payload`, and for a message with an image everything that its second signature covers.
std::string seal_payload(const tsm::Message &message, std::string_view payload,
                         std::string_view taid);

}  // namespace fuzz

#endif
