// SPDX-License-Identifier: BSD-2-Clause
#include "fleet/serve.h"

#include <algorithm>

#include "device/http_service.h"

namespace fleet {
namespace {

constexpr size_t kMaxOpen = 64;  // devices, of which each takes some files
constexpr std::string_view kDevices = "/devices";

/// The name of the device in a path, and the path as the device knows it.
struct Target {
  std::string name;
  std::string path;
};

std::optional<Target> target_of(std::string_view path) {
  if (!path.starts_with("/devices/")) return std::nullopt;
  path.remove_prefix(kDevices.size() + 1);
  const size_t end = std::min(path.find('/'), path.size());
  return Target{std::string(path.substr(0, end)), std::string(path.substr(end))};
}

bool reads(const http::Request &request) {
  return request.method == "GET" || request.method == "HEAD";
}

}  // namespace

struct FleetService::Open {
  explicit Open(const std::string &directory)
      : device(directory), service(device, directory, false) {}
  device::Device device;
  device::HttpService service;
  std::mutex lock;  // a device answers one request at a time
};

struct FleetService::Slot {
  std::string directory;
  std::shared_ptr<Open> open = {};
  uint64_t used = 0;
};

FleetService::FleetService(const std::filesystem::path &root) {
  for (const Member &member : members_of(root)) {
    slots_[member.name] = std::make_unique<Slot>(Slot{.directory = member.state_directory});
    list_ += "{\"name\":\"" + member.name + "\",\"device_id\":\"" + member.device_id + "\"}\n";
  }
}

FleetService::~FleetService() = default;

FleetService::Slot *FleetService::find(const std::string &name) {
  const auto found = slots_.find(name);
  return found == slots_.end() ? nullptr : found->second.get();
}

/// The one that was not asked for longest and is not at work.
void FleetService::close_one() {
  Slot *oldest = nullptr;
  for (const auto &[name, slot] : slots_) {
    if (slot->open.use_count() != 1) continue;
    if (oldest == nullptr || slot->used < oldest->used) oldest = slot.get();
  }
  if (oldest == nullptr) return;
  oldest->open.reset();
  --num_open_;
}

std::shared_ptr<FleetService::Open> FleetService::open(Slot &slot) {
  const std::lock_guard guard(lock_);
  slot.used = ++now_;
  if (!slot.open) {
    if (num_open_ >= kMaxOpen) close_one();
    slot.open = std::make_shared<Open>(slot.directory);
    ++num_open_;
  }
  return slot.open;
}

std::optional<http::Answer> FleetService::answer_early(const http::Request &head) {
  const std::optional<Target> target = target_of(head.path);
  if (target && find(target->name) != nullptr) return std::nullopt;
  if (target) return http::failure(404, "no device is called \"" + target->name + "\"");
  if (head.path == "/healthz" && reads(head)) {
    return http::text_answer(200, "application/json", "{\"status\":\"ok\"}\n");
  }
  if (head.path == kDevices && reads(head)) {
    return http::text_answer(200, "application/jsonl", list_);
  }
  return http::failure(404, "no such path: expected GET /devices, GET /healthz or /devices/NAME/*");
}

http::Answer FleetService::answer(const http::Request &request) {
  Target target = *target_of(request.path);
  http::Request inner = request;
  inner.path = std::move(target.path);
  try {
    const std::shared_ptr<Open> device = open(*find(target.name));
    const std::lock_guard guard(device->lock);
    const std::optional<http::Answer> early = device->service.handler().answer_early(inner);
    return early ? *early : device->service.handler().answer(inner);
  } catch (const device::Error &error) {
    return http::failure(503, error.what());
  }
}

}  // namespace fleet
