// SPDX-License-Identifier: BSD-2-Clause
/// All devices of a fleet behind one HTTP server:
///
///     GET /devices               their names and IDs, as JSON lines
///     ... /devices/NAME/...      what `otrp-device serve` answers
///     GET /healthz
///
/// Paths that a device's answers name (OTrP-TA-Image) are below its own.
#ifndef FLEET_SERVE_H
#define FLEET_SERVE_H

#include <filesystem>
#include <map>
#include <memory>
#include <mutex>
#include <string>

#include "fleet/fleet.h"
#include "http/handler.h"

namespace fleet {

/// For any number of workers. A device is opened when it is asked for, and stays so while not too
/// many others are.
class FleetService : public http::Handler {
 public:
  explicit FleetService(const std::filesystem::path &root);
  ~FleetService() override;

  std::optional<http::Answer> answer_early(const http::Request &head) override;
  http::Answer answer(const http::Request &request) override;

 private:
  struct Open;
  struct Slot;

  Slot *find(const std::string &name);
  std::shared_ptr<Open> open(Slot &slot);
  void close_one();

  std::map<std::string, std::unique_ptr<Slot>, std::less<>> slots_;
  std::string list_;
  std::mutex lock_;  // of the ones below, and of what is open in each slot
  size_t num_open_ = 0;
  uint64_t now_ = 0;  // counts requests
};

}  // namespace fleet

#endif
