// SPDX-License-Identifier: BSD-2-Clause
#include "device/connect.h"

#include <cstdio>
#include <memory>
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
constexpr uint32_t kMaxSeconds = 10 * 365 * 86'400u;
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

void log_line(const std::string &text) {
  tools::print_error_line(kProgram, http::time_text(std::chrono::system_clock::now()) + " " + text);
}

std::string seconds_text(milliseconds time) {
  char text[40];
  snprintf(text, sizeof(text), "%.1f s", static_cast<double>(time.count()) / 1000);
  return text;
}

void log_exchange(const broker::Exchange &exchange) {
  char times[80];
  snprintf(times, sizeof(times), " %.1f ms (TSM %.1f ms) ",
           static_cast<double>(exchange.agent_time.count()) / 1000,
           static_cast<double>(exchange.tsm_time.count()) / 1000);
  log_line(std::string(exchange.message->command) + times + exchange.verdict +
           (exchange.image.empty() ? "" : ", image of " + exchange.image));
}

void log_retry(const broker::Outcome &outcome, milliseconds pause) {
  log_line(outcome.reason + "; again in " + seconds_text(pause));
}

void log_end(const broker::Outcome &outcome) {
  const bool is_stopped = outcome.end == broker::End::kStopped;
  log_line((is_stopped ? "stopped after messages: " : "done, messages: ") +
           std::to_string(outcome.num_messages));
}

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
  return std::chrono::seconds(number(name, text, whole, 1, kMaxSeconds));
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
      : policy_(policy_of(arguments)), client_(client_options(arguments)) {
    if (!arguments.image_directory.empty()) {
      ends_.keep_image = [folder = broker::ImageFolder(arguments.image_directory)](
                             const std::string &taid, std::string_view image) {
        folder.keep(taid, image);
      };
    }
    ends_.url = broker::device_url(arguments.url, LocalAgent(device, device.must_exist).id());
    ends_.post = [this](const http::Call &call) { return client_.send(call); };
    ends_.open_agent = [device] { return std::make_unique<LocalAgent>(device, true); };
    ends_.on_exchange = log_exchange;
  }
  Caller(const Caller &) = delete;
  Caller &operator=(const Caller &) = delete;

  /// Throws what kept the call from its end.
  void call(const broker::Stop &stop) {
    const broker::Outcome outcome = broker::call(ends_, policy_, stop, log_retry);
    if (!outcome.reason.empty()) throw std::runtime_error(outcome.reason);
    log_end(outcome);
  }

 private:
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
      log_line(failure.what());
    }
  } while (!stop.wait_for(interval.next()));
}

}  // namespace device
