// SPDX-License-Identifier: BSD-2-Clause
// Command 0: the frame of a message, from its first byte on.
#include "support/require.h"
#include "support/target_device.h"

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  const fuzz::StoredDevice &stored = fuzz::stored_device();
  static fuzz::TargetDevice device(stored.agent, stored.key_service);
  const std::string_view frame = fuzz::as_view(data, size);
  device.run(fuzz::kMessageCommand, frame, fuzz::capacity_of(frame));
  device.restore();
  return 0;
}
