// SPDX-License-Identifier: BSD-2-Clause
/// The agent's functions called directly, from inside an instance.
#ifndef FUZZ_INSIDE_H
#define FUZZ_INSIDE_H

#include <tee_test.h>

#include <string>

#include "ownership.h"
#include "support/exact.h"
#include "support/require.h"

namespace fuzz {

/// While it lives, a run of a target: it happens in an instance that lives as long as the process,
/// and leaves nothing behind.
class Inside {
 public:
  Inside() : world_(world()) {}
  ~Inside() {
    const tee_heap_stats now = world_.inside.stats();
    require(now.live_blocks == 0, "no block is left on the heap");
    require(now.open_objects == 0 && now.open_operations == 0, "no handle is left open");
    world_.log.clear();
  }

 private:
  struct World {
    tee::test::Device device;
    tee::test::InsideTa inside{device};
    tee::test::TraceSink log;
  };
  static World &world() {
    static World world;
    return world;
  }

  World &world_;
};

using otrp_test::as_view;
using otrp_test::ExactText;
using otrp_test::u8;

/// Takes over a text of the agent.
inline std::string take_text(char *text) {
  require(text != nullptr, "there is memory for a text");
  const tee_ptr<char> owner(text);
  return text;
}

/// Takes over `len` bytes of the agent.
inline std::string take_bytes(uint8_t *bytes, uint32_t len) {
  const tee_ptr<uint8_t> owner(bytes);
  return std::string(as_view(bytes, len));
}

}  // namespace fuzz

#endif
