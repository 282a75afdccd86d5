// SPDX-License-Identifier: BSD-2-Clause
/// All devices call their TSM.
#ifndef FLEET_RUN_H
#define FLEET_RUN_H

#include <filesystem>
#include <functional>
#include <string>

#include "fleet/call.h"

namespace fleet {

struct RunOptions {
  CallOptions call;
  size_t num_threads = 16;
  double rate = 0;                   // first calls a second; 0: as fast as they go
  unsigned max_calls = 1;            // of a device, until one arrives
  std::vector<std::string> servers;  // for the shell: the TSMs, in order, to be run and killed
  uint64_t seed = 1;                 // of the faults
};

struct RunProgress {
  size_t num_done;  // devices
  size_t num_arrived;
  size_t num_exchanges;
};

/// Devices whose call is not over when `stop` is uttered have not arrived.
Figures run_fleet(const std::filesystem::path &root, const RunOptions &options,
                  const broker::Stop &stop,
                  const std::function<void(const RunProgress &)> &progress);

}  // namespace fleet

#endif
