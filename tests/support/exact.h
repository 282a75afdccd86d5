// SPDX-License-Identifier: BSD-2-Clause
/// Memory as the agent's functions take it, of exact size, so that the sanitizer sees a byte too
/// far. device::Buffer is the same for bytes.
#ifndef SUPPORT_EXACT_H
#define SUPPORT_EXACT_H

#include <string>
#include <string_view>

#include "device/device_client.h"

namespace otrp_test {

/// A NUL-terminated copy.
class ExactText {
 public:
  explicit ExactText(std::string_view text) : text_(std::string(text) + '\0') {}
  const char *get() const { return text_.bytes().data(); }

 private:
  device::Buffer text_;
};

inline const uint8_t *u8(std::string_view bytes) {
  return reinterpret_cast<const uint8_t *>(bytes.data());
}

inline uint32_t len_of(std::string_view bytes) {
  return static_cast<uint32_t>(bytes.size());
}

inline std::string_view as_view(const uint8_t *data, size_t size) {
  return {reinterpret_cast<const char *>(data), size};
}

}  // namespace otrp_test

#endif
