// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/server/service.h"

namespace tsm {
namespace {

using http::Captures;
using http::Request;

constexpr char kOtrpJson[] = "application/otrp+json";
constexpr char kSecondsToRetry[] = "5";

std::string note_of(const DoorAnswer &answer) {
  std::string note = (answer.message.empty() ? "" : answer.message + " ") + answer.outcome;
  if (!answer.next.empty()) note += " -> " + answer.next;
  return note;
}

}  // namespace

http::Answer unavailable(const StoreError &error) {
  http::Answer answer = http::failure(503, "the store cannot be used now: expected later");
  answer.headers.push_back({"Retry-After", kSecondsToRetry});
  answer.note = error.what();
  return answer;
}

Service::Service(const Identity &tsm, Store *store, std::chrono::seconds time_to_answer,
                 bool has_metrics)
    : store_(store), door_(tsm, store, time_to_answer) {
  router_.add({.method = "POST",
               .path = "/tam/*",
               .types = {kOtrpJson},
               .may_be_empty = true,
               .answer = [this](const Request &request, const Captures &captures) {
                 return post(captures[0], request.body);
               }});
  router_.add({.method = "GET",
               .path = "/healthz",
               .answer = [this](const Request &, const Captures &) { return health(); }});
  if (!has_metrics) return;
  router_.add({.method = "GET",
               .path = "/metrics",
               .answer = [this](const Request &, const Captures &) { return metrics(); }});
}

http::Answer Service::post(const std::string &device_id, const std::string &body) {
  const auto start = std::chrono::steady_clock::now();
  try {
    DoorAnswer told = door_.post(device_id, body);
    metrics_.count_exchange(told, std::chrono::steady_clock::now() - start);
    http::Answer answer = {.status = told.status};
    if (told.status == 200) {
      answer = http::text_answer(200, kOtrpJson, std::move(told.text));
    } else if (told.status != 204) {
      answer = http::failure(told.status, told.text);
    }
    answer.note = note_of(told);
    return answer;
  } catch (const StoreError &error) {
    metrics_.count_failure();
    return unavailable(error);
  }
}

http::Answer Service::health() {
  try {
    store_->ping();
    return http::text_answer(200, "application/json", "{\"status\":\"ok\"}\n");
  } catch (const StoreError &error) {
    return unavailable(error);
  }
}

http::Answer Service::metrics() {
  try {
    return http::text_answer(200, "text/plain; version=0.0.4", metrics_.text(count_fleet(store_)));
  } catch (const StoreError &error) {
    return unavailable(error);
  }
}

}  // namespace tsm
