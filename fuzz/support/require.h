// SPDX-License-Identifier: BSD-2-Clause
/// The checks of the fuzz targets. A property that does not hold ends the process, so that the
/// fuzzer keeps the input.
#ifndef FUZZ_REQUIRE_H
#define FUZZ_REQUIRE_H

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string_view>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size);

namespace fuzz {

inline void require(bool holds, const char *what) {
  if (holds) return;
  std::fprintf(stderr, "does not hold: %s\n", what);
  std::abort();
}

inline std::string_view as_view(const uint8_t *data, size_t size) {
  return {reinterpret_cast<const char *>(data), size};
}

}  // namespace fuzz

#endif
