// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/home/device_record.h"

#include <algorithm>
#include <filesystem>
#include <vector>

#include "tsm/protocol/dsi.h"

namespace tsm {
namespace {

using tools::UsageError;

constexpr size_t kMaxWaiting = 1000;  // of requests never answered, the oldest are forgotten

std::string make_folder(const std::string &path) {
  std::error_code failure;
  const bool is_new = std::filesystem::create_directories(path, failure);
  if (!failure && is_new) {
    std::filesystem::permissions(path, std::filesystem::perms::owner_all, failure);
  }
  if (failure) throw UsageError("cannot make directory " + path + ": " + failure.message());
  return path;
}

std::optional<uint64_t> find_number(const Json &object, const char *name) {
  const auto member = object.is_object() ? object.find(name) : object.end();
  if (member == object.end() || !member->is_number_unsigned()) return std::nullopt;
  return member->get<uint64_t>();
}

}  // namespace

std::optional<std::string> read_dsi_text(const std::string &folder) {
  const std::string file = folder + "/dsi.json";
  if (!tools::file_exists(file)) return std::nullopt;
  return tools::read_file(file);
}

std::optional<Json> read_dsi(const std::string &folder) {
  const std::optional<std::string> text = read_dsi_text(folder);
  if (!text) return std::nullopt;
  const std::optional<Json> dsi = parse_json(*text);
  if (!dsi || !is_dsi_document(*dsi)) {
    throw UsageError("the kept state " + folder +
                     "/dsi.json is damaged: expected a device state document; get-device-state "
                     "replaces it");
  }
  return dsi;
}

struct DeviceRecord::Requests {
  uint64_t last = 0;
  uint64_t kept = 0;  // 0: nobody knows
  std::vector<SentRequest> waiting = {};
};

struct DeviceRecord::Answered {
  SentRequest request;
  Tie tie = Tie::kUnchecked;
};

DeviceRecord::DeviceRecord(std::string folder, DeviceInfo device)
    : folder_(make_folder(std::move(folder))),
      device_(std::move(device)),
      lock_(folder_ + "/lock") {}

DeviceRecord::Requests DeviceRecord::load() const {
  const std::string file = path("requests.json");
  if (!tools::file_exists(file)) return {};
  const std::optional<Json> value = parse_json(tools::read_file(file));
  const std::optional<uint64_t> last = value ? find_number(*value, "last") : std::nullopt;
  const std::optional<uint64_t> kept = value ? find_number(*value, "kept") : std::nullopt;
  const Json *waiting = value ? find_array(*value, "waiting") : nullptr;
  bool is_good = last && kept && waiting != nullptr;
  Requests requests;
  if (is_good) {
    requests = {*last, *kept};
    for (const Json &entry : *waiting) {
      const std::optional<SentRequest> request = parse_sent_request(entry);
      is_good = is_good && request;
      if (request) requests.waiting.push_back(*request);
    }
  }
  if (is_good) return requests;
  throw UsageError("the record of sent requests " + file +
                   " is damaged: remove it, and name the requests that still wait with --request");
}

void DeviceRecord::save(const Requests &requests) const {
  Json waiting = Json::array();
  for (const SentRequest &request : requests.waiting) waiting.push_back(sent_request_json(request));
  const Json value = {{"last", requests.last}, {"kept", requests.kept}, {"waiting", waiting}};
  tools::write_file(path("requests.json"), value.dump(2) + "\n");
}

void DeviceRecord::keep_device() const {
  const std::string text = device_info_json(device_).dump(2) + "\n";
  const std::string file = path("device.json");
  if (!tools::file_exists(file) || tools::read_file(file) != text) tools::write_file(file, text);
}

void DeviceRecord::add(SentRequest request) {
  Requests requests = load();
  request.number = ++requests.last;
  requests.waiting.push_back(std::move(request));
  if (requests.waiting.size() > kMaxWaiting) requests.waiting.erase(requests.waiting.begin());
  keep_device();
  save(requests);
}

void DeviceRecord::forget(const SentRequest &request) {
  Requests requests = load();
  const auto is_it = [&](const SentRequest &other) { return is_same_request(request, other); };
  if (std::erase_if(requests.waiting, is_it) != 0) save(requests);
}

/// Requests are answered in any order: the state that an earlier one brings may be older than the
/// kept one. Of a request that does not wait it is known only where it was made for the kept state.
bool DeviceRecord::is_older(const Response &response, const SentRequest &request,
                            uint64_t kept) const {
  const std::optional<std::string> text = read_dsi_text(folder_);
  const std::optional<Json> dsi = text ? parse_json(*text) : std::nullopt;
  if (!response.dsi_text || !dsi || *text == *response.dsi_text) return false;
  return request.number == 0 ? request.dsihash != dsi_hash(*dsi) : request.number < kept;
}

/// What the response answers and how that is known; throws NotVerified.
DeviceRecord::Answered DeviceRecord::find(const Response &response, const Requests &requests,
                                          const std::optional<SentRequest> &named) const {
  Answered answered = {named ? *named : find_answered(response, requests.waiting)};
  const std::optional<Tie> tie = tie_of(response, answered.request);
  if (!tie) throw NotVerified("the response answers another request than the one named");
  for (const SentRequest &request : requests.waiting) {
    if (is_same_request(request, answered.request)) answered.request.number = request.number;
  }
  if (is_older(response, answered.request, requests.kept)) {
    throw NotVerified(
        "the response brings an older device state than the one kept: ask for the state anew "
        "with get-device-state, or take it with --accept-old");
  }
  answered.tie = *tie;
  return answered;
}

Tie DeviceRecord::take(const Response &response, const TiePolicy &policy) {
  Requests requests = load();
  Answered answered = {{.message = response.message}};
  try {
    answered = find(response, requests, policy.named);
  } catch (const NotVerified &) {
    if (!policy.accept_old) throw;
  }

  keep_device();
  if (response.dsi_text) {
    tools::write_file(path("dsi.json"), *response.dsi_text);
    requests.kept = answered.request.number;
  }
  std::erase_if(requests.waiting, [&](const SentRequest &request) {
    return is_same_request(request, answered.request);
  });
  save(requests);
  return answered.tie;
}

}  // namespace tsm
