// SPDX-License-Identifier: BSD-2-Clause
// Command 1: is a TA recorded?
#include "support/target_device.h"

void fuzz::check(std::string_view query) {
  static TargetDevice device(stored_device());
  device.run(kQueryCommand, query, capacity_of(query));
}
