// SPDX-License-Identifier: BSD-2-Clause
/// What an operator is answered, at an address of its own:
///
///     GET /                     the page, whose files are in page/; it asks for what follows
///     GET /api/fleet            how many devices are where, and the groups
///     GET /api/history?seconds=N            the same over time
///     GET /api/devices?text=&state=&after=  devices by ID, a page of them
///     GET /api/devices/ID       see device_page.h
///     POST /api/devices/ID      {"group": "..."}: moves the device; with the token
///     DELETE /api/devices/ID    forgets it; with the token
///     GET /healthz, /metrics    see Service
///
/// Refusals are {"message": ...}: 400, 401 without the token, 404 for a device that is not there.
#ifndef TSM_SERVER_ADMIN_H
#define TSM_SERVER_ADMIN_H

#include <functional>
#include <string>

#include "http/router.h"
#include "tsm/server/service.h"
#include "tsm/store/store.h"

namespace tsm {

class Admin {
 public:
  /// Both must live longer. Who sends the token as "Authorization: Bearer TOKEN" may change things.
  Admin(Service *service, Store *store, std::string token);

  http::Handler &handler() { return router_; }

 private:
  using Answering =
      std::function<http::Answer(const http::Request &request, const std::string &device_id)>;

  void add_page();
  void add(const char *method, const char *path, Answering answer);
  void add_change(const char *method, Answering answer);
  bool has_token(const http::Request &request) const;

  http::Answer fleet();
  http::Answer history(const http::Request &request);
  http::Answer list(const http::Request &request);
  http::Answer show(const std::string &device_id);
  http::Answer move(const http::Request &request, const std::string &device_id);
  http::Answer remove(const std::string &device_id);

  Service *service_;
  Store *store_;
  std::string token_;
  http::Router router_;
};

}  // namespace tsm

#endif
