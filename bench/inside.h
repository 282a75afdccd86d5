// SPDX-License-Identifier: BSD-2-Clause
/// Code of the agent that is measured by itself runs as an instance of a trusted application.
#ifndef BENCH_INSIDE_H
#define BENCH_INSIDE_H

#include <tee_test.h>

#include <string>

namespace bench {

/// Makes this thread the instance while it lives, with its objects in memory or on a disk.
struct Inside {
  Inside() = default;
  explicit Inside(const std::string &state_directory) : device(state_directory) {}

  static tee::test::TaProperties properties() {
    tee::test::TaProperties roomy;
    roomy.data_size = 256u << 20;
    return roomy;
  }

  tee::test::Device device;
  tee::test::InsideTa ta{device, properties()};
};

inline const uint8_t *bytes_of(const std::string &bytes) {
  return reinterpret_cast<const uint8_t *>(bytes.data());
}

}  // namespace bench

#endif
