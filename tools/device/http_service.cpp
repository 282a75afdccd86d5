// SPDX-License-Identifier: BSD-2-Clause
#include "device/http_service.h"

#include <algorithm>
#include <nlohmann/json.hpp>

#include "common/agent_codes.h"
#include "common/error_line.h"
#include "common/result_names.h"
#include "device/agent_log.h"
#include "device/envelope.h"
#include "device/info_json.h"

namespace device {
namespace {

constexpr size_t kNumKeptImages = 4;
constexpr size_t kMaxExplainedLen = 64 << 10;  // longer requests are not searched for flaws
constexpr char kJson[] = "application/json";
constexpr char kOtrpJson[] = "application/otrp+json";
constexpr char kStatusHeader[] = "OTrP-Status";
constexpr char kImageHeader[] = "OTrP-TA-Image";
constexpr char kStateIsGone[] =
    "the state directory was removed or replaced while it was in use: end this server, and start "
    "one on the state that is to hold";

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

http::Answer device_failure(const Error &error, int status) {
  nlohmann::ordered_json body = {{"message", error.what()},
                                 {"code", tools::code_text(error.code())}};
  const tools::ResultName *result = tools::find_result(error.code());
  if (result != nullptr) body["name"] = result->name;
  const auto replace = nlohmann::json::error_handler_t::replace;
  return http::text_answer(status, kJson, body.dump(-1, ' ', false, replace) + "\n");
}

void tell_verdict(http::Answer &answer, const std::string &verdict) {
  answer.headers.push_back({kStatusHeader, verdict});
  answer.note = verdict;
}

/// A TSM's key that the device cannot read has no signature that the device can verify, which looks
/// like another CA's.
http::Answer message_failure(const Message &message, std::string_view request, const Error &error) {
  const bool may_be_flawed =
      error.code() == OTRP_CA_CHECK_FAILED || error.code() == OTRP_BAD_REQUEST;
  const std::string flaw =
      may_be_flawed && request.size() <= kMaxExplainedLen ? flaw_of_request(request) : "";
  http::Answer answer =
      flaw.empty()
          ? device_failure(error, status_of(error.code()))
          : device_failure(Error(message.command, error.code(), error.origin(), flaw), 400);
  tell_verdict(answer, verdict_of_code(error.code()));
  return answer;
}

}  // namespace

HttpService::HttpService(Device &device, const std::string &state_directory, bool traces)
    : device_(device), state_(state_directory), traces_(traces) {
  add_routes();
}

void HttpService::add_routes() {
  using http::Captures;
  using http::Request;
  const std::vector<std::string> json_types = {kOtrpJson, kJson};
  router_.add({.method = "POST",
               .path = "/otrp",
               .types = json_types,
               .answer = [this](const Request &request, const Captures &) {
                 return message(nullptr, request.body);
               }});
  router_.add({.method = "POST",
               .path = "/otrp/*",
               .types = json_types,
               .answer = [this](const Request &request, const Captures &captures) {
                 const Message *expected = find_message(captures[0]);
                 return expected == nullptr
                            ? http::failure(404, "no message is called \"" + captures[0] +
                                                     "\": expected one of " +
                                                     tools::message_commands())
                            : message(expected, request.body);
               }});
  router_.add({.method = "GET",
               .path = "/info",
               .answer = [this](const Request &, const Captures &) { return info(); }});
  router_.add(
      {.method = "GET",
       .path = "/query/*",
       .answer = [this](const Request &, const Captures &captures) { return query(captures[0]); }});
  router_.add(
      {.method = "GET",
       .path = "/images/*",
       .answer = [this](const Request &, const Captures &captures) { return image(captures[0]); }});
  router_.add({.method = "GET",
               .path = "/healthz",
               .is_early = true,
               .answer = [this](const Request &, const Captures &) { return health(); }});
}

// A failure may have ended the instance, so the next request opens a session of its own.
template <class Answering>
http::Answer HttpService::use_device(Answering &&answering) {
  if (!state_.is_there()) return http::failure(500, kStateIsGone);
  AgentLog log(traces_);
  try {
    http::Answer answer = answering();
    if (answer.status != 200 || answer.note.starts_with("fail")) log.show();
    return answer;
  } catch (const Error &error) {
    log.show();
    if (error.origin() != Origin::kStatusWord) agent_.reset();
    return device_failure(error, status_of(error.code()));
  } catch (const tools::UsageError &error) {
    return http::failure(400, error.what());
  }
}

Session &HttpService::agent() {
  if (!agent_) agent_.emplace(device_, kAgentUuid);
  return *agent_;
}

http::Answer HttpService::health() const {
  if (!state_.is_there()) return http::failure(503, kStateIsGone);
  return http::text_answer(200, kJson, "{\"status\":\"ok\"}\n");
}

http::Answer HttpService::info() {
  return use_device([&] { return http::text_answer(200, kJson, info_json(read_info(device_))); });
}

http::Answer HttpService::query(const std::string &taid) {
  return use_device([&] {
    const QueryAnswer answer = device::query(agent(), taid);
    const int status = answer.result == TEEC_SUCCESS ? 200 : status_of(answer.result);
    return http::text_answer(status, kJson, answer.text + "\n");
  });
}

http::Answer HttpService::message(const Message *expected, std::string_view request) {
  return use_device([&] {
    const Message &message = message_in(request, expected);
    try {
      Answer answer = send(agent(), message, request, capacity_for(request));
      // Without its image the response is still the only proof of what the device has done.
      if (answer.needed_capacity == 0) require_success(message, answer);
      return signed_response(std::move(answer));
    } catch (const Error &error) {
      if (error.origin() != Origin::kStatusWord) agent_.reset();
      return message_failure(message, request, error);
    }
  });
}

http::Answer HttpService::signed_response(Answer answer) {
  const std::string verdict = verdict_of_response(answer.response);
  http::Answer response = http::text_answer(200, kOtrpJson, std::move(answer.response));
  tell_verdict(response, verdict);
  if (answer.image) {
    response.headers.push_back({kImageHeader, keep_image(std::move(*answer.image))});
  }
  return response;
}

std::string HttpService::keep_image(std::string bytes) {
  if (images_.size() == kNumKeptImages) images_.pop_front();
  images_.push_back(
      {std::to_string(++num_images_), std::make_shared<const std::string>(std::move(bytes))});
  return "/images/" + images_.back().number;
}

http::Answer HttpService::image(std::string_view number) const {
  const auto found = std::ranges::find(images_, number, &KeptImage::number);
  if (found == images_.end()) return http::failure(404, "no such TA image, or no longer kept");
  return {.type = "application/octet-stream", .body = found->bytes};
}

}  // namespace device
