// SPDX-License-Identifier: BSD-2-Clause
#include <cstddef>
#include <cstdint>

#include "support/require.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  fuzz::check({reinterpret_cast<const char *>(data), size});
  return 0;
}
