// SPDX-License-Identifier: BSD-2-Clause
/// The agent's functions called directly, from inside an instance that lives as long as the
/// process.
#ifndef FUZZ_INSIDE_H
#define FUZZ_INSIDE_H

#include <tee_test.h>

#include <string>

#include "ownership.h"
#include "support/require.h"

namespace fuzz {

class Inside {
 public:
  static Inside &instance() {
    static Inside inside;
    return inside;
  }

  /// What every run leaves behind: nothing.
  void require_clean() {
    const tee_heap_stats now = inside_.stats();
    require(now.live_blocks == 0, "no block is left on the heap");
    require(now.open_objects == 0 && now.open_operations == 0, "no handle is left open");
    log_.clear();
  }

 private:
  tee::test::Device device_;
  tee::test::InsideTa inside_{device_};
  tee::test::TraceSink log_;
};

/// A NUL-terminated copy of exact size, so that the sanitizer sees a character too far.
class ExactText {
 public:
  explicit ExactText(std::string_view text) : text_(new char[text.size() + 1]) {
    text.copy(text_.get(), text.size());
    text_[text.size()] = 0;
  }
  const char *get() const { return text_.get(); }

 private:
  std::unique_ptr<char[]> text_;
};

/// The same for bytes, without the NUL.
class ExactBytes {
 public:
  explicit ExactBytes(std::string_view bytes) : bytes_(new uint8_t[bytes.size()]) {
    bytes.copy(reinterpret_cast<char *>(bytes_.get()), bytes.size());
  }
  const uint8_t *get() const { return bytes_.get(); }

 private:
  std::unique_ptr<uint8_t[]> bytes_;
};

/// Takes over a text of the agent.
inline std::string take_text(char *text) {
  require(text != nullptr, "there is memory for a text");
  const tee_ptr<char> owner(text);
  return text;
}

/// Takes over `len` bytes of the agent.
inline std::string take_bytes(uint8_t *bytes, uint32_t len) {
  const tee_ptr<uint8_t> owner(bytes);
  return {reinterpret_cast<const char *>(bytes), len};
}

}  // namespace fuzz

#endif
