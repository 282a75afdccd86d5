// SPDX-License-Identifier: BSD-2-Clause
/// Code of the agent that is measured by itself runs as an instance of a trusted application.
#ifndef BENCH_INSIDE_H
#define BENCH_INSIDE_H

#include <tee_test.h>

#include <string>

namespace bench {

struct Inside {
  explicit Inside(tee::test::Device &device) : ta(device, properties()) {}

  static tee::test::TaProperties properties() {
    tee::test::TaProperties roomy;
    roomy.data_size = 256u << 20;
    return roomy;
  }

  tee::test::InsideTa ta;
};

inline const uint8_t *bytes_of(const std::string &bytes) {
  return reinterpret_cast<const uint8_t *>(bytes.data());
}

}  // namespace bench

#endif
