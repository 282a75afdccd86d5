// SPDX-License-Identifier: BSD-2-Clause
/// What a TSM's server answers over HTTP:
///
///     POST /tam/DEVICE_ID   a device: see Door
///     GET /healthz          200 while the store answers
///     GET /metrics          see Metrics; not here where there is an Admin, which has it
#ifndef TSM_SERVER_SERVICE_H
#define TSM_SERVER_SERVICE_H

#include "http/access_log.h"
#include "http/router.h"
#include "tsm/server/door.h"
#include "tsm/server/metrics.h"

namespace tsm {

/// 503, to be asked again.
http::Answer unavailable(const StoreError &error);

class Service {
 public:
  /// Both must live longer.
  Service(const Identity &tsm, Store *store, std::chrono::seconds time_to_answer,
          bool has_metrics = true);

  http::Handler &handler() { return router_; }
  /// Of all that the server answers, also where no route was asked.
  void note(const http::LogEntry &entry) { metrics_.count_status(entry.status); }
  http::Answer health();
  http::Answer metrics();

 private:
  http::Answer post(const std::string &device_id, const std::string &body);

  Store *store_;
  Door door_;
  Metrics metrics_;
  http::Router router_;
};

}  // namespace tsm

#endif
