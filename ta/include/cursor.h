// SPDX-License-Identifier: BSD-2-Clause
/// The only thing that touches bytes from outside: a cursor that never goes past what is left.
/// A read that fails leaves the cursor unusable.
#ifndef CURSOR_H
#define CURSOR_H

#include <stdint.h>

#include "little_endian.h"

/// What is left to read. The bytes stay their owner's.
struct reader {
  const uint8_t *at;  // the next byte
  uint32_t left;      // bytes
};

/// `*bytes` points at the next `n` bytes; false when n is 0 or more than is left.
[[nodiscard]] inline bool take(reader *in, uint32_t n, const uint8_t **bytes) {
  if (n == 0 || n > in->left) return false;
  *bytes = in->at;
  in->at += n;
  in->left -= n;
  return true;
}

/// The next two bytes as a number; false when they are not there.
[[nodiscard]] inline bool take_u16(reader *in, uint16_t *value) {
  const uint8_t *bytes = nullptr;
  if (!take(in, sizeof *value, &bytes)) return false;
  *value = get_u16(bytes);
  return true;
}

/// The next four bytes as a number; false when they are not there.
[[nodiscard]] inline bool take_u32(reader *in, uint32_t *value) {
  const uint8_t *bytes = nullptr;
  if (!take(in, sizeof *value, &bytes)) return false;
  *value = get_u32(bytes);
  return true;
}

#endif
