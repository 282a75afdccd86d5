// SPDX-License-Identifier: BSD-2-Clause
/// One of several byte strings that are hashed or signed as if they stood behind each other.
#ifndef DATA_PART_H
#define DATA_PART_H

#include <stdint.h>
#include <string.h>

struct data_part {
  const void *data;
  uint32_t len;
};

/// The characters of a text, without its terminating NUL.
inline data_part text_part(const char *text) {
  return {text, static_cast<uint32_t>(strlen(text))};
}

#endif
