// SPDX-License-Identifier: BSD-2-Clause
/// Integers of frames, records and encodings: little-endian, assembled from bytes.
#ifndef LITTLE_ENDIAN_H
#define LITTLE_ENDIAN_H

#include <stdint.h>

/// Writes the low 16 bits of a number as two bytes.
inline void put_u16(uint8_t *bytes, uint32_t value) {
  bytes[0] = static_cast<uint8_t>(value);
  bytes[1] = static_cast<uint8_t>(value >> 8);
}

/// Writes a number as four bytes.
inline void put_u32(uint8_t *bytes, uint32_t value) {
  put_u16(bytes, value);
  put_u16(bytes + 2, value >> 16);
}

/// Reads two bytes as a number.
inline uint16_t get_u16(const uint8_t *bytes) {
  return static_cast<uint16_t>(bytes[0] | (bytes[1] << 8));
}

/// Reads four bytes as a number.
inline uint32_t get_u32(const uint8_t *bytes) {
  return get_u16(bytes) | (static_cast<uint32_t>(get_u16(bytes + 2)) << 16);
}

#endif
