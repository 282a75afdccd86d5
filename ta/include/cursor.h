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
  *value = bytes[0] | static_cast<uint32_t>(bytes[1]) << 8 | static_cast<uint32_t>(bytes[2]) << 16 |
           static_cast<uint32_t>(bytes[3]) << 24;
  return true;
}

// ---- Writing. What does not fit is not written, and nothing after it: `ok` is looked at once, at
// the end.

/// What is left to write to. The bytes stay their owner's.
struct writer {
  uint8_t *at;     // the next byte
  uint32_t left;   // bytes
  bool ok = true;  // nothing was left out so far
};

/// The bytes as they are.
inline void put(writer *out, data_part bytes) {
  if (bytes.len == 0) return;
  if (bytes.len > out->left) {
    *out = {nullptr, 0, false};  // nor will anything fit that comes after it
    return;
  }
  memcpy(out->at, bytes.data, bytes.len);
  out->at += bytes.len;
  out->left -= bytes.len;
}

/// A number as two bytes.
inline void put_u16(writer *out, uint16_t value) {
  const uint8_t bytes[] = {static_cast<uint8_t>(value), static_cast<uint8_t>(value >> 8)};
  put(out, {bytes, sizeof bytes});
}

/// A number as four bytes.
inline void put_u32(writer *out, uint32_t value) {
  const uint8_t bytes[] = {static_cast<uint8_t>(value), static_cast<uint8_t>(value >> 8),
                           static_cast<uint8_t>(value >> 16), static_cast<uint8_t>(value >> 24)};
  put(out, {bytes, sizeof bytes});
}

/// The number of bytes, as four, and the bytes.
inline void put_block(writer *out, data_part bytes) {
  put_u32(out, bytes.len);
  put(out, bytes);
}

#endif
