// SPDX-License-Identifier: BSD-2-Clause
#include "device/broker/session.h"

#include <charconv>
#include <nlohmann/json.hpp>

#include "common/error_line.h"
#include "device/envelope.h"

namespace broker {
namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::microseconds;

constexpr char kOtrpJson[] = "application/otrp+json";
constexpr size_t kMaxShownLen = 500;  // of what others say

/// What ends a session, on its way to run().
class Ended : public std::runtime_error {
 public:
  Ended(End end, const std::string &reason, std::chrono::seconds retry_after = {})
      : std::runtime_error(reason), end_(end), retry_after_(retry_after) {}
  End end() const { return end_; }
  std::chrono::seconds retry_after() const { return retry_after_; }

 private:
  End end_;
  std::chrono::seconds retry_after_;
};

microseconds since(Clock::time_point start) {
  return std::chrono::duration_cast<microseconds>(Clock::now() - start);
}

std::string shown(std::string_view text) {
  return std::string(text.substr(0, kMaxShownLen));
}

// ---- Answers of the server

/// The status, and what the server says of it.
std::string failure_of(const http::Reply &reply) {
  const std::string text = reply.url + ": " + std::to_string(reply.status) + " " +
                           std::string(http::reason_of(reply.status));
  const nlohmann::json body = nlohmann::json::parse(reply.body, nullptr, false);
  const auto message = body.is_object() ? body.find("message") : body.end();
  if (message == body.end() || !message->is_string()) return text;
  return text + ": " + message->get_ref<const std::string &>();
}

std::chrono::seconds retry_after(const http::Reply &reply) {
  uint32_t seconds = 0;
  const std::string *text = http::find_header(reply.headers, "Retry-After");
  if (text != nullptr) std::from_chars(text->data(), text->data() + text->size(), seconds);
  return std::chrono::seconds(seconds);
}

bool has_otrp_type(const http::Reply &reply) {
  const std::string *type = http::find_header(reply.headers, "Content-Type");
  if (type == nullptr) return false;
  return http::same_word(std::string_view(*type).substr(0, type->find_first_of("; \t")), kOtrpJson);
}

/// The next request; empty where there is none.
std::string request_in(http::Reply reply) {
  const bool is_done = reply.status == 204 || (reply.status == 200 && reply.body.empty());
  if (is_done) return "";
  if (reply.status >= 500) {
    throw Ended(End::kUnreachable, failure_of(reply), retry_after(reply));
  }
  if (reply.status != 200) throw Ended(End::kRefused, failure_of(reply));
  if (!has_otrp_type(reply)) {
    throw Ended(End::kRefused, reply.url + ": an answer of another type: expected " + kOtrpJson);
  }
  return std::move(reply.body);
}

End end_of(http::Failure failure) {
  const bool is_lasting =
      failure == http::Failure::kRedirect || failure == http::Failure::kTooLarge;
  return is_lasting ? End::kRefused : End::kUnreachable;
}

// ---- The session

class Session {
 public:
  Session(const Ends &ends, size_t max_messages, const Stop &stop)
      : ends_(ends), stop_(stop), max_messages_(max_messages) {}

  Outcome run();

 private:
  void obey_requests();
  std::string ask(std::string response);
  const tools::Message &message_in(std::string_view request) const;
  std::string carry_out(const std::string &request);
  device::Answer send(const tools::Message &message, std::string_view request);
  std::string keep_image(const tools::Message &message, const device::Answer &answer);
  void tell(const Exchange &exchange) const;

  const Ends &ends_;
  const Stop &stop_;
  size_t max_messages_;
  size_t num_messages_ = 0;
  microseconds tsm_time_{0};
  std::unique_ptr<Agent> agent_;
};

Outcome Session::run() {
  const auto over = [&](End end, std::string_view reason, uint32_t code = 0) {
    return Outcome{end, num_messages_, shown(reason), code, {}};
  };
  try {
    obey_requests();
    return over(End::kDone, "");
  } catch (const http::ClientError &error) {
    return over(end_of(error.failure()), error.what());
  } catch (const device::Error &error) {
    return over(End::kNoResponse, error.what(), error.code());
  } catch (const Ended &ended) {
    Outcome outcome = over(ended.end(), ended.what());
    outcome.retry_after = ended.retry_after();
    return outcome;
  }
}

// A request that came after the wish to end is left: nothing of it was done, and the TSM will ask
// how things are. A response is always delivered first.
void Session::obey_requests() {
  for (std::string response;;) {
    const std::string request = ask(std::move(response));
    if (request.empty()) return;
    if (stop_.is_requested()) throw Ended(End::kStopped, "");
    if (num_messages_ == max_messages_) {
      throw Ended(End::kTooLong, ends_.url + ": the session does not end: expected at most " +
                                     std::to_string(max_messages_) + " messages");
    }
    response = carry_out(request);
  }
}

std::string Session::ask(std::string response) {
  http::Call call = {.method = "POST",
                     .url = ends_.url,
                     .headers = {{"Accept", kOtrpJson}},
                     .body = std::move(response)};
  if (!call.body.empty()) call.headers.push_back({"Content-Type", kOtrpJson});
  const Clock::time_point start = Clock::now();
  std::string request = request_in(ends_.post(call));
  tsm_time_ = since(start);
  return request;
}

const tools::Message &Session::message_in(std::string_view request) const {
  try {
    return device::message_in(request, nullptr);
  } catch (const tools::UsageError &error) {
    throw Ended(End::kRefused, ends_.url + ": " + error.what());
  }
}

std::string Session::carry_out(const std::string &request) {
  Exchange exchange;
  exchange.message = &message_in(request);
  exchange.tsm_time = tsm_time_;
  ++num_messages_;
  const Clock::time_point start = Clock::now();
  try {
    device::Answer answer = send(*exchange.message, request);
    exchange.agent_time = since(start);
    exchange.verdict = device::verdict_of_response(answer.response);
    exchange.image = keep_image(*exchange.message, answer);
    tell(exchange);
    return std::move(answer.response);
  } catch (const device::Error &error) {
    exchange.agent_time = since(start);
    exchange.verdict = device::verdict_of_code(error.code());
    tell(exchange);
    throw;
  }
}

device::Answer Session::send(const tools::Message &message, std::string_view request) {
  if (!agent_) agent_ = ends_.open_agent();
  device::Answer answer = agent_->send(message, request);
  const bool image_is_lost = answer.needed_capacity != 0 && ends_.keep_image;
  if (answer.response.empty() || image_is_lost) device::require_success(message, answer);
  if (answer.response.empty()) {
    throw Ended(End::kNoResponse, std::string(message.command) + ": a success without a response");
  }
  return answer;
}

std::string Session::keep_image(const tools::Message &message, const device::Answer &answer) {
  const std::string taid = device::installed_ta(answer.response);
  if (!answer.image || taid.empty() || !ends_.keep_image) return "";
  try {
    ends_.keep_image(taid, *answer.image);
    return taid;
  } catch (const tools::UsageError &error) {
    throw Ended(End::kImageNotKept, std::string(message.command) +
                                        ": the TA image was not kept, and the TSM is not told "
                                        "that it was: " +
                                        error.what());
  }
}

void Session::tell(const Exchange &exchange) const {
  if (ends_.on_exchange) ends_.on_exchange(exchange);
}

}  // namespace

Outcome run_session(const Ends &ends, size_t max_messages, const Stop &stop) {
  return Session(ends, max_messages, stop).run();
}

}  // namespace broker
