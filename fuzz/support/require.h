// SPDX-License-Identifier: BSD-2-Clause
/// What every target defines, and the checks in it. A property that does not hold ends the
/// process, so that the fuzzer keeps the input.
#ifndef FUZZ_REQUIRE_H
#define FUZZ_REQUIRE_H

#include <cstdio>
#include <cstdlib>
#include <string_view>

namespace fuzz {

/// Tries one input.
void check(std::string_view input);

inline void require(bool holds, const char *what) {
  if (holds) return;
  std::fprintf(stderr, "does not hold: %s\n", what);
  std::abort();
}

}  // namespace fuzz

#endif
