// SPDX-License-Identifier: BSD-2-Clause
// Command 1: is a TA recorded?
#include "support/require.h"
#include "support/target_device.h"

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  const fuzz::StoredDevice &stored = fuzz::stored_device();
  static fuzz::TargetDevice device(stored.agent, stored.key_service);
  const std::string_view query = fuzz::as_view(data, size);
  device.run(fuzz::kQueryCommand, query, fuzz::capacity_of(query));
  return 0;
}
