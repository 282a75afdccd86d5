// SPDX-License-Identifier: BSD-2-Clause
// Command 0: the frame of a message, from its first byte on.
#include "support/target_device.h"

void fuzz::check(std::string_view frame) {
  static TargetDevice device(stored_device());
  device.run(kMessageCommand, frame, capacity_of(frame));
  device.restore();
}
