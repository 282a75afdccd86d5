// SPDX-License-Identifier: BSD-2-Clause
/// Comparison that takes the same time wherever its operands differ.
#ifndef CONSTANT_TIME_H
#define CONSTANT_TIME_H

#include <stdint.h>

inline bool equal_in_constant_time(const void *a, const void *b, uint32_t len) {
  const auto *left = static_cast<const volatile uint8_t *>(a);
  const auto *right = static_cast<const volatile uint8_t *>(b);
  uint8_t difference = 0;
  for (uint32_t i = 0; i < len; ++i) {
    difference = static_cast<uint8_t>(difference | (left[i] ^ right[i]));
  }
  return difference == 0;
}

#endif
