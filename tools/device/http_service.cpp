// SPDX-License-Identifier: BSD-2-Clause
#include "device/http_service.h"

#include <algorithm>
#include <cstdio>
#include <limits>
#include <nlohmann/json.hpp>

#include "common/agent_codes.h"
#include "common/error_line.h"
#include "common/result_names.h"
#include "device/info_json.h"

namespace device {
namespace {

constexpr size_t kNumKeptImages = 4;

struct StatusOfCode {
  uint32_t code;
  int status;
};

constexpr int kUnexpected = 500;  // of every other code
constexpr StatusOfCode kStatuses[] = {
    {OTRP_BAD_REQUEST, 400},
    {OTRP_MISSING, 400},
    {TEEC_ERROR_BAD_PARAMETERS, 400},
    {TEEC_ERROR_BAD_FORMAT, 400},
    {OTRP_CA_CHECK_FAILED, 403},
    {TEEC_ERROR_ACCESS_DENIED, 403},
    {OTRP_NOT_FOUND, 404},
    {OTRP_SP_NOT_FOUND, 404},
    {TEEC_ERROR_ITEM_NOT_FOUND, 404},
    {OTRP_DSI_MISMATCH, 409},
    {OTRP_SD_EXISTS, 409},
    {OTRP_SD_MISMATCH, 409},
    {OTRP_TA_EXISTS, 409},
    {OTRP_TA_DECRYPT_FAILED, 422},
    {OTRP_NO_MEMORY, 422},  // also a value that cannot be decoded
    {TEEC_ERROR_BUSY, 503},
    {TEEC_ERROR_OUT_OF_MEMORY, 507},
    {tools::kStorageNoSpace, 507},
};

int status_of(uint32_t code) {
  const auto found = std::ranges::find(kStatuses, code, &StatusOfCode::code);
  return found == std::end(kStatuses) ? kUnexpected : found->status;
}

std::string text_of(const nlohmann::ordered_json &document) {
  return document.dump(-1, ' ', false, nlohmann::json::error_handler_t::replace) + "\n";
}

HttpAnswer device_failure(const Error &error) {
  char number[sizeof("0x00000000")];
  snprintf(number, sizeof(number), "0x%08x", error.code());
  nlohmann::ordered_json body = {{"message", error.what()}, {"code", number}};
  const tools::ResultName *result = tools::find_result(error.code());
  if (result != nullptr) body["name"] = result->name;
  return {.status = status_of(error.code()), .body = text_of(body)};
}

/// The image of a TA comes out of its request, so an answer with it needs little more than both.
uint32_t capacity_for(std::string_view request) {
  constexpr size_t kMax = std::numeric_limits<uint32_t>::max();
  return static_cast<uint32_t>(std::min(kDefaultCapacity + request.size(), kMax));
}

}  // namespace

HttpAnswer http_failure(int status, std::string_view message) {
  return {.status = status, .body = text_of({{"message", message}})};
}

// A failure may have ended the instance, so the next request opens a session of its own.
template <class Answering>
HttpAnswer HttpService::exclusively(Answering &&answering) {
  const std::lock_guard guard(lock_);
  try {
    return answering();
  } catch (const Error &error) {
    if (error.origin() != Origin::kStatusWord) agent_.reset();
    return device_failure(error);
  } catch (const tools::UsageError &error) {
    return http_failure(400, error.what());
  }
}

Session &HttpService::agent() {
  if (!agent_) agent_.emplace(device_, kAgentUuid);
  return *agent_;
}

HttpAnswer HttpService::info() {
  return exclusively([&]() -> HttpAnswer { return {.body = info_json(read_info(device_))}; });
}

HttpAnswer HttpService::query(const std::string &taid) {
  return exclusively([&]() -> HttpAnswer {
    const QueryAnswer answer = device::query(agent(), taid);
    const int status = answer.result == TEEC_SUCCESS ? 200 : status_of(answer.result);
    return {.status = status, .body = answer.text + "\n"};
  });
}

HttpAnswer HttpService::message(const std::string &name, const std::string &request) {
  const Message *message = find_message(name);
  if (message == nullptr) return http_failure(404, "no message is called \"" + name + "\"");
  return exclusively([&]() -> HttpAnswer {
    Answer answer = send(agent(), *message, request, capacity_for(request));
    // Without its image the response is still the only proof of what the device has done.
    if (answer.needed_capacity == 0) require_success(*message, answer);
    HttpAnswer sent = {.type = std::string(kOtrpType), .body = std::move(answer.response)};
    if (answer.image) sent.image_path = keep_image(std::move(*answer.image));
    return sent;
  });
}

std::string HttpService::keep_image(std::string bytes) {
  if (images_.size() == kNumKeptImages) images_.pop_front();
  images_.push_back({std::to_string(++num_images_), std::move(bytes)});
  return "/images/" + images_.back().number;
}

HttpAnswer HttpService::image(std::string_view number) {
  const std::lock_guard guard(lock_);
  const auto found = std::ranges::find(images_, number, &KeptImage::number);
  if (found == images_.end()) return http_failure(404, "no such TA image, or no longer kept");
  return {.type = "application/octet-stream", .body = found->bytes};
}

}  // namespace device
