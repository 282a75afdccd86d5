// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/server/admin.h"

#include <algorithm>
#include <charconv>

#include "common/error_line.h"
#include "tsm/protocol/crypto.h"
#include "tsm/protocol/json.h"
#include "tsm/server/device_page.h"
#include "tsm/server/page_files.h"
#include "tsm/server/plan_shelf.h"

namespace tsm {
namespace {

using http::Captures;
using http::Request;
using tools::UsageError;

constexpr char kJson[] = "application/json";
constexpr size_t kMaxPoints = 240;  // of a picture
constexpr int64_t kUsualHistory = 24 * 3600;
// Nothing comes from elsewhere, and nothing is sent there.
constexpr char kPagePolicy[] =
    "default-src 'none'; script-src 'self'; style-src 'self'; img-src 'self'; connect-src 'self'; "
    "base-uri 'none'; form-action 'none'; frame-ancestors 'none'";
constexpr std::string_view kBearer = "Bearer ";

http::Answer json_answer(const Json &value) {
  return http::text_answer(200, kJson, value.dump(-1, ' ', false, Json::error_handler_t::replace));
}

http::Answer no_such_device() {
  return http::failure(404, "no such device is enrolled");
}

/// What the database is asked for must be text. Throws UsageError.
const std::string &checked(const std::string &text) {
  if (text.empty() || is_device_id(text)) return text;
  throw UsageError("bad text: expected at most 256 bytes of UTF-8, no control character, \" or \\");
}

/// The values of a query, of which only these are known. Throws UsageError.
std::map<std::string, std::string> read_query(const Request &request,
                                              const std::vector<std::string> &names) {
  std::optional<std::map<std::string, std::string>> values = http::parse_query(request.query);
  if (!values) throw UsageError("bad query: expected NAME=VALUE, escaped, and each name once");
  for (const auto &[name, value] : *values) {
    if (std::ranges::find(names, name) != names.end()) continue;
    std::string known;
    for (const std::string &each : names) known += (known.empty() ? "" : ", ") + each;
    throw UsageError("unknown \"" + name + "\": expected " + known);
  }
  return std::move(*values);
}

std::optional<Standing> read_standing(const std::string &name) {
  if (name.empty()) return std::nullopt;
  const auto found = std::ranges::find(kStandings, name);
  if (found != kStandings.end()) return static_cast<Standing>(found - kStandings.begin());
  throw UsageError("bad state: expected current, behind, refused, unseen or unplanned");
}

int64_t read_seconds(const std::string &text) {
  if (text.empty()) return kUsualHistory;
  int64_t seconds = 0;
  const char *end = text.data() + text.size();
  const auto [last, failure] = std::from_chars(text.data(), end, seconds);
  if (failure == std::errc() && last == end && seconds > 0 && seconds <= kHistoryTime) {
    return seconds;
  }
  throw UsageError("bad seconds: expected 1 to " + std::to_string(kHistoryTime));
}

}  // namespace

Admin::Admin(Service *service, Store *store, std::string token)
    : service_(service), store_(store), token_(std::move(token)) {
  add_page();
  const auto id_is_unused = [](auto answer) {
    return [answer](const Request &request, const std::string &) { return answer(request); };
  };
  add("GET", "/healthz", id_is_unused([this](const Request &) { return service_->health(); }));
  add("GET", "/metrics", id_is_unused([this](const Request &) { return service_->metrics(); }));
  add("GET", "/api/fleet", id_is_unused([this](const Request &) { return fleet(); }));
  add("GET", "/api/history", id_is_unused([this](const Request &r) { return history(r); }));
  add("GET", "/api/devices", id_is_unused([this](const Request &r) { return list(r); }));
  add("GET", "/api/devices/*",
      [this](const Request &, const std::string &device_id) { return show(device_id); });
  add_change("POST", [this](const Request &request, const std::string &device_id) {
    return move(request, device_id);
  });
  add_change("DELETE",
             [this](const Request &, const std::string &device_id) { return remove(device_id); });
}

void Admin::add_page() {
  for (const PageFile &file : kPageFiles) {
    http::Answer answer = http::text_answer(200, file.type, std::string(file.content));
    answer.headers.push_back({"Content-Security-Policy", kPagePolicy});
    router_.add({.method = "GET",
                 .path = file.path,
                 .is_early = true,
                 .answer = [answer](const Request &, const Captures &) { return answer; }});
  }
}

void Admin::add(const char *method, const char *path, Answering answer) {
  std::vector<std::string> types;
  if (std::string_view(method) == "POST") types = {kJson};
  router_.add({.method = method,
               .path = path,
               .types = types,
               .answer = [answer = std::move(answer)](const Request &request,
                                                      const Captures &captures) -> http::Answer {
                 try {
                   return answer(request, captures.empty() ? "" : captures[0]);
                 } catch (const UsageError &error) {
                   return http::failure(400, error.what());
                 } catch (const StoreError &error) {
                   return unavailable(error);
                 }
               }});
}

void Admin::add_change(const char *method, Answering answer) {
  add(method, "/api/devices/*",
      [this, answer = std::move(answer)](const Request &request, const std::string &device_id) {
        if (has_token(request)) return answer(request, device_id);
        http::Answer refusal = http::failure(
            401,
            "changes need the token: expected \"Authorization: Bearer\" and what is in the "
            "file admin-token of the TSM's home");
        refusal.headers.push_back({"WWW-Authenticate", "Bearer"});
        return refusal;
      });
}

bool Admin::has_token(const Request &request) const {
  const std::string *header = http::find_header(request.headers, "Authorization");
  if (header == nullptr) return false;
  const std::string_view value = *header;
  return http::same_word(value.substr(0, kBearer.size()), kBearer) &&
         same_secret(value.substr(kBearer.size()), token_);
}

http::Answer Admin::fleet() {
  const FleetCounts counts = count_fleet(store_);
  Json devices, groups = Json::array();
  for (size_t i = 0; i < kStandings.size(); ++i) devices[kStandings[i]] = counts.devices[i];
  for (const auto &[name, plan] : store_->group_plans()) {
    groups.push_back({{"name", name}, {"plan", plan}});
  }
  return json_answer({{"time", seconds_now()},
                      {"devices", devices},
                      {"open", counts.num_open},
                      {"groups", groups}});
}

http::Answer Admin::history(const Request &request) {
  const int64_t seconds = read_seconds(read_query(request, {"seconds"})["seconds"]);
  const int64_t now = seconds_now();
  const std::vector<HistoryEntry> entries = store_->history_since(now - seconds);
  const size_t stride = entries.size() / kMaxPoints + 1;
  Json points = Json::array();
  for (size_t i = 0; i < entries.size(); ++i) {
    if ((entries.size() - 1 - i) % stride != 0) continue;  // the last is among them
    points.push_back({{"time", entries[i].time}, {"counts", entries[i].counts}});
  }
  return json_answer(
      {{"from", now - seconds}, {"to", now}, {"states", kStandings}, {"points", points}});
}

http::Answer Admin::list(const Request &request) {
  auto values = read_query(request, {"text", "state", "after"});
  DeviceQuery query = {.text = checked(values["text"]),
                       .standing = read_standing(values["state"]),
                       .after = checked(values["after"])};
  // One more tells whether there are more.
  const size_t max_shown = query.max_devices++;
  std::vector<ListedDevice> devices = store_->list_devices(query);
  const bool has_more = devices.size() > max_shown;
  if (has_more) devices.resize(max_shown);
  Json list = Json::array();
  for (const ListedDevice &device : devices) {
    list.push_back({{"id", device.device_id},
                    {"group", device.group},
                    {"state", name_of(device.standing)},
                    {"reason", device.reason},
                    {"seen", device.seen}});
  }
  return json_answer({{"devices", list}, {"has_more", has_more}});
}

http::Answer Admin::show(const std::string &device_id) {
  std::optional<StoredDevice> row;
  if (is_device_id(device_id)) row = store_->find_device(device_id);
  if (!row) return no_such_device();
  std::optional<Plan> plan;
  if (!row->plan.empty()) plan = plan_outline(row->plan, store_);
  return json_answer(
      device_page(*row, store_->events_of(device_id), plan ? &*plan : nullptr, seconds_now()));
}

http::Answer Admin::move(const Request &request, const std::string &device_id) {
  const std::optional<Json> body = parse_json(request.body);
  const std::string *group = body ? find_string(*body, "group") : nullptr;
  if (group == nullptr || body->size() != 1 || !is_device_id(*group)) {
    throw UsageError(
        "bad body: expected {\"group\": NAME}, 1 to 256 bytes of UTF-8 text, no control "
        "character, \" or \\");
  }
  if (!is_device_id(device_id) || !store_->move(device_id, *group)) return no_such_device();
  return {.status = 204, .note = "moved"};
}

http::Answer Admin::remove(const std::string &device_id) {
  if (!is_device_id(device_id) || !store_->find_device(device_id)) return no_such_device();
  try {
    store_->remove({device_id});
  } catch (const UsageError &) {
    return no_such_device();  // somebody was quicker
  }
  return {.status = 204, .note = "removed"};
}

}  // namespace tsm
