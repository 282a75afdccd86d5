// SPDX-License-Identifier: BSD-2-Clause
/// Numbers of JSON texts as doubles.
#ifndef JSON_NUMBER_H
#define JSON_NUMBER_H

#include "platform.h"

/// Sets `*value` to the double that is nearest to the digits from `at` to `end`, which may have a
/// point among them, times 10^`exponent`; of two that are equally near, to the even one (IEEE 754,
/// round to nearest). False when it is too large for a double, or memory ran out.
[[nodiscard]] bool nearest_double(const char *at, const char *end, int64_t exponent, double *value);

#endif
