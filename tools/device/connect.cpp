// SPDX-License-Identifier: BSD-2-Clause
#include "device/connect.h"

#include <cstdio>
#include <memory>
#include <nlohmann/json.hpp>
#include <optional>
#include <random>

#include "common/error_line.h"
#include "device/agent_log.h"
#include "device/broker/broker.h"
#include "device/broker/device_url.h"
#include "device/broker/image_folder.h"
#include "device/commands.h"
#include "device/envelope.h"
#include "device/raw_session.h"
#include "device/state_directory.h"
#include "http/access_log.h"

namespace device {
namespace {

using std::chrono::milliseconds;

constexpr uint32_t kMaxReplyLen = 1u << 30;
constexpr uint32_t kMaxMessages = 1'000'000;
constexpr uint32_t kMaxRetries = 1'000;
constexpr uint32_t kMaxInterval = 10 * 365 * 86'400u;
constexpr uint32_t kMaxMilliseconds = 86'400'000;

// ---- The agent

/// Opened for a session and closed behind it, so that others find the device between calls.
class LocalAgent : public broker::Agent {
 public:
  LocalAgent(const DeviceArguments &arguments, bool must_exist)
      : log_(arguments.trace),
        device_(arguments.state_directory, must_exist),
        session_(device_, kAgentUuid) {}

  Answer send(const Message &message, std::string_view request) override {
    try {
      Answer answer = device::send(session_, message, request, capacity_for(request));
      if (verdict_of_response(answer.response) != "pass") log_.show();
      return answer;
    } catch (const Error &) {
      log_.show();
      throw;
    }
  }

  std::string id() { return device_id(session_); }

 private:
  AgentLog log_;
  StateDevice device_;
  Session session_;
};

// ---- Lines of the log

using Json = nlohmann::ordered_json;

double milliseconds_of(std::chrono::microseconds time) {
  return static_cast<double>(time.count() / 100) / 10;
}

std::string seconds_text(milliseconds time) {
  char text[40];
  snprintf(text, sizeof(text), "%.1f s", static_cast<double>(time.count()) / 1000);
  return text;
}

/// Each line in either form.
class Log {
 public:
  explicit Log(const std::string &format) : is_json_(format == "json") {
    if (!is_json_ && format != "text") {
      throw tools::UsageError("bad --log \"" + format + "\": expected text or json");
    }
  }

  void exchange(const broker::Exchange &exchange) const {
    const double ms = milliseconds_of(exchange.agent_time);
    const double tsm_ms = milliseconds_of(exchange.tsm_time);
    char times[80];
    snprintf(times, sizeof(times), " %.1f ms (TSM %.1f ms) ", ms, tsm_ms);
    Json members = {{"message", exchange.message->command},
                    {"ms", ms},
                    {"tsm_ms", tsm_ms},
                    {"verdict", exchange.verdict}};
    if (!exchange.image.empty()) members["image"] = exchange.image;
    put(std::string(exchange.message->command) + times + exchange.verdict +
            (exchange.image.empty() ? "" : ", image of " + exchange.image),
        members);
  }
  void retry(const broker::Outcome &outcome, milliseconds pause) const {
    put(outcome.reason + "; again in " + seconds_text(pause),
        {{"failure", outcome.reason}, {"again_in_ms", pause.count()}});
  }
  void failure(const std::string &reason) const { put(reason, {{"failure", reason}}); }
  void end(const broker::Outcome &outcome) const {
    const bool is_stopped = outcome.end == broker::End::kStopped;
    put((is_stopped ? "stopped after messages: " : "done, messages: ") +
            std::to_string(outcome.num_messages),
        {{"end", is_stopped ? "stopped" : "done"}, {"messages", outcome.num_messages}});
  }

 private:
  void put(const std::string &text, const Json &members) const {
    const std::string time = http::time_text(std::chrono::system_clock::now());
    if (!is_json_) return tools::print_error_line(kProgram, time + " " + text);
    Json line = {{"time", time}};
    line.update(members);
    fprintf(stderr, "%s\n", line.dump(-1, ' ', true, Json::error_handler_t::replace).c_str());
  }

  bool is_json_;
};

// ---- What the command line says

uint32_t number(const char *name, const std::string &text, uint32_t fallback, uint32_t min,
                uint32_t max) {
  if (text.empty()) return fallback;
  const uint32_t value = parse_number(name, text, max);
  if (value < min) {
    throw tools::UsageError(std::string(name) + " is " + text + ": expected at least " +
                            std::to_string(min));
  }
  return value;
}

milliseconds seconds(const char *name, const std::string &text, milliseconds fallback) {
  const auto whole = static_cast<uint32_t>(fallback.count() / 1000);
  return std::chrono::seconds(number(name, text, whole, 1, kMaxInterval));
}

http::ClientOptions client_options(const ConnectArguments &arguments) {
  http::ClientOptions options = {.ca_file = arguments.ca_file,
                                 .user_agent = std::string(kProgram) + "/" + OTRP_VERSION};
  options.connect_time = seconds("--connect-time", arguments.connect_time, options.connect_time);
  options.total_time = seconds("--answer-time", arguments.reply_time, options.total_time);
  options.max_body_len = number("--max-body", arguments.max_reply,
                                static_cast<uint32_t>(options.max_body_len), 1, kMaxReplyLen);
  return options;
}

broker::Policy policy_of(const ConnectArguments &arguments) {
  broker::Policy policy;
  policy.max_messages = number("--max-messages", arguments.max_messages,
                               static_cast<uint32_t>(policy.max_messages), 1, kMaxMessages);
  policy.max_retries = number("--retries", arguments.retries, policy.max_retries, 0, kMaxRetries);
  policy.first_pause =
      milliseconds(number("--first-pause", arguments.first_pause,
                          static_cast<uint32_t>(policy.first_pause.count()), 0, kMaxMilliseconds));
  return policy;
}

// ---- Calls

class Caller {
 public:
  Caller(const DeviceArguments &device, const ConnectArguments &arguments)
      : log_(arguments.call_log),
        policy_(policy_of(arguments)),
        client_(client_options(arguments)) {
    if (!arguments.image_directory.empty()) {
      ends_.keep_image = [folder = broker::ImageFolder(arguments.image_directory)](
                             const std::string &taid, std::string_view image) {
        folder.keep(taid, image);
      };
    }
    ends_.url = broker::device_url(arguments.url, LocalAgent(device, device.must_exist).id());
    ends_.post = [this](const http::Call &call) { return client_.send(call); };
    ends_.open_agent = [device] { return std::make_unique<LocalAgent>(device, true); };
    ends_.on_exchange = [this](const broker::Exchange &exchange) { log_.exchange(exchange); };
  }
  Caller(const Caller &) = delete;
  Caller &operator=(const Caller &) = delete;

  /// Throws what kept the call from its end.
  void call(const broker::Stop &stop) {
    const broker::Outcome outcome = broker::call(
        ends_, policy_, stop,
        [this](const broker::Outcome &failed, milliseconds pause) { log_.retry(failed, pause); });
    if (!outcome.reason.empty()) throw std::runtime_error(outcome.reason);
    log_.end(outcome);
  }
  const Log &log() const { return log_; }

 private:
  Log log_;
  broker::Policy policy_;
  http::Client client_;
  broker::Ends ends_;
};

/// A tenth is left to chance: devices that were switched on together would call together for ever.
class Interval {
 public:
  explicit Interval(milliseconds length) : length_(length) {}
  milliseconds next() {
    return std::chrono::duration_cast<milliseconds>(
        length_ * std::uniform_real_distribution<>(0.95, 1.05)(random_));
  }

 private:
  milliseconds length_;
  std::minstd_rand random_{std::random_device{}()};
};

}  // namespace

void connect_device(const DeviceArguments &device, const ConnectArguments &arguments) {
  static broker::Stop stop;
  stop.obey_signals();
  const milliseconds every = seconds("--every", arguments.every, milliseconds(0));
  Caller caller(device, arguments);
  if (every == milliseconds(0)) return caller.call(stop);

  Interval interval(every);
  do {
    try {
      caller.call(stop);
    } catch (const tools::UsageError &) {
      throw;  // no later call can be better
    } catch (const std::exception &failure) {
      caller.log().failure(failure.what());
    }
  } while (!stop.wait_for(interval.next()));
}

}  // namespace device
