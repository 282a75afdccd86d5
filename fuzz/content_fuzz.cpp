// SPDX-License-Identifier: BSD-2-Clause
// What a message has inside: the input is encrypted and signed into an otherwise good request.
//
//     message ID (one digit) | content, up to a NUL | TA image, for InstallTA and UpdateTA
#include "support/sealed_request.h"
#include "support/target_device.h"

void fuzz::check(std::string_view input) {
  static TargetDevice device(stored_device());
  const std::string_view content = input.substr(0, input.find('\0'));
  if (content.empty()) return;
  const auto id =
      static_cast<tsm::MessageId>(1 + (uint32_t{static_cast<uint8_t>(content[0])} - '1') % 8);
  const std::string_view image = input.substr(std::min(input.size(), content.size() + 1));
  device.run(kMessageCommand, frame_around(id, content.substr(1), image));
  device.restore();
}
