// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/server/door.h"

#include <algorithm>

#include "tsm/protocol/json.h"
#include "tsm/server/visit.h"

namespace tsm {
namespace {

constexpr size_t kMaxDeviceIdLen = 256;

DoorAnswer refused(int status, const char *kind, const std::string &text) {
  return {.status = status, .text = text, .outcome = kind};
}

}  // namespace

int64_t seconds_now() {
  const auto now = std::chrono::system_clock::now().time_since_epoch();
  return std::chrono::duration_cast<std::chrono::seconds>(now).count();
}

bool is_device_id(std::string_view device_id) {
  const bool is_plain = std::ranges::none_of(
      device_id, [](unsigned char c) { return c < ' ' || c == 0x7F || c == '"' || c == '\\'; });
  if (device_id.empty() || device_id.size() > kMaxDeviceIdLen || !is_plain) return false;
  const bool is_ascii = std::ranges::none_of(device_id, [](unsigned char c) { return c > 0x7F; });
  return is_ascii || parse_json("\"" + std::string(device_id) + "\"").has_value();
}

DoorAnswer Door::post(const std::string &device_id, const std::string &body) {
  std::optional<StoredDevice> row;
  if (is_device_id(device_id)) row = store_->find_device(device_id);
  if (!row) return refused(404, "unknown", "no such device is enrolled");
  try {
    return serve(std::move(*row), body);
  } catch (const Refusal &refusal) {
    return refused(refusal.status(), refusal.kind(), refusal.what());
  }
}

DoorAnswer Door::serve(StoredDevice row, const std::string &body) {
  const std::shared_ptr<const Plan> plan = plans_.find(row.plan);
  Visit visit(tsm_, std::move(row), seconds_now());
  if (body.empty()) {
    visit.begin();
  } else {
    visit.hear(body);
  }
  std::string request = visit.go_on(plan.get(), time_to_answer_);
  if (!store_->save(visit.row(), visit.event())) {
    return refused(409, "conflict", "another request for this device was quicker");
  }
  return {.status = request.empty() ? 204 : 200,
          .text = std::move(request),
          .message = visit.event().message,
          .outcome = visit.event().outcome,
          .lost = visit.lost(),
          .next = visit.event().next};
}

}  // namespace tsm
