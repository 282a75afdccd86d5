// SPDX-License-Identifier: BSD-2-Clause
/// The only things that touch bytes of frames, records and encodings: a cursor that never reads
/// past what is left, and one that never writes past it. Numbers are little-endian.
#ifndef CURSOR_H
#define CURSOR_H

#include <stdint.h>

#include "data_part.h"
#include "platform.h"

// ---- Reading. A read that fails leaves the cursor unusable.

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
  *value = static_cast<uint16_t>(bytes[0] | (bytes[1] << 8));
  return true;
}

/// The next four bytes as a number; false when they are not there.
[[nodiscard]] inline bool take_u32(reader *in, uint32_t *value) {
  const uint8_t *bytes = nullptr;
  if (!take(in, sizeof *value, &bytes)) return false;
  *value = 0;
  for (uint32_t i = sizeof *value; i-- > 0;) *value = *value << 8 | bytes[i];
  return true;
}

// ---- Writing. What does not fit is not written, and nothing after it: `ok` is looked at once, at
// the end.

/// What is left to write to. The bytes stay their owner's.
struct writer {
  uint8_t *at;    // the next byte
  uint32_t left;  // bytes
  bool ok = true;
};

/// The bytes as they are.
inline void put(writer *out, const data_part &bytes) {
  if (bytes.len > out->left) *out = {nullptr, 0, false};
  if (!out->ok || bytes.len == 0) return;
  memcpy(out->at, bytes.data, bytes.len);
  out->at += bytes.len;
  out->left -= bytes.len;
}

/// The low `n` bytes of a number.
inline void put_number(writer *out, uint32_t value, uint32_t n) {
  for (; n != 0; --n, value >>= 8) {
    const auto low = static_cast<uint8_t>(value);
    put(out, {&low, 1});
  }
}

/// A number as two bytes, or as four.
inline void put_u16(writer *out, uint16_t value) {
  put_number(out, value, sizeof value);
}
inline void put_u32(writer *out, uint32_t value) {
  put_number(out, value, sizeof value);
}

/// The number of bytes, as four, and the bytes.
inline void put_block(writer *out, const data_part &bytes) {
  put_u32(out, bytes.len);
  put(out, bytes);
}

#endif
