// SPDX-License-Identifier: BSD-2-Clause
/// A slice, alone or one of several that are hashed or signed as if they stood behind each other.
#ifndef DATA_PART_H
#define DATA_PART_H

#include <stdint.h>

#include "platform.h"

/// A byte string that stays its owner's.
struct data_part {
  const void *data;  // may be NULL when `len` is 0
  uint32_t len;      // bytes
};

/// The characters of a text, which must not be NULL, without its terminating NUL.
inline data_part text_part(const char *text) {
  return {text, static_cast<uint32_t>(strlen(text))};
}

#endif
