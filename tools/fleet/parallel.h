// SPDX-License-Identifier: BSD-2-Clause
/// One piece of work for each of many, by some threads.
#ifndef FLEET_PARALLEL_H
#define FLEET_PARALLEL_H

#include <cstddef>
#include <functional>

namespace fleet {

/// Calls `job` for 0 to `count` - 1, in this order, from `num_threads` threads, and meanwhile
/// `tick`, twice a second, from the caller's. After an exception of either no further job begins,
/// and the first of them is thrown when those at work have ended.
void for_each(size_t count, size_t num_threads, const std::function<void(size_t)> &job,
              const std::function<void()> &tick);

}  // namespace fleet

#endif
