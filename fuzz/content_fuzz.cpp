// SPDX-License-Identifier: BSD-2-Clause
// What a message has inside: the input is encrypted and signed into an otherwise good request.
//
//     message ID (one digit) | content, up to a NUL | TA image, for InstallTA and UpdateTA
#include "support/require.h"
#include "support/sealed_request.h"
#include "support/target_device.h"

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  if (size == 0) return 0;
  const fuzz::StoredDevice &stored = fuzz::stored_device();
  static fuzz::TargetDevice device(stored.agent, stored.key_service);

  const uint32_t id = 1 + (data[0] - uint32_t{'1'}) % 8;
  const std::string_view rest = fuzz::as_view(data + 1, size - 1);
  const std::string_view content = rest.substr(0, rest.find('\0'));
  const std::string_view image = rest.substr(std::min(rest.size(), content.size() + 1));
  const std::string text = fuzz::request_around(static_cast<tsm::MessageId>(id), content, image);
  device.run(fuzz::kMessageCommand, device::build_frame(id, text));
  device.restore();
  return 0;
}
