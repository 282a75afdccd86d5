// SPDX-License-Identifier: BSD-2-Clause
#include "fleet/call.h"

#include "common/result_names.h"
#include "device/agent_log.h"
#include "device/broker/device_url.h"

namespace fleet {
namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::microseconds;

constexpr char kProgram[] = "otrp-fleet";

microseconds since(Clock::time_point start) {
  return std::chrono::duration_cast<microseconds>(Clock::now() - start);
}

/// What the agent logs is not shown: failures are counted.
class FleetAgent : public broker::Agent {
 public:
  explicit FleetAgent(const Member &member)
      : device_(member.state_directory.string()), session_(device_, device::kAgentUuid) {}

  device::Answer send(const tools::Message &message, std::string_view request) override {
    return device::send(session_, message, request, device::capacity_for(request));
  }

 private:
  device::Device device_;
  device::Session session_;
};

/// The servers that a device calls, which take turns, from one of them on.
class Tsms {
 public:
  Tsms(const Member &member, const CallOptions &options, size_t first) : next_(first) {
    for (const std::string &tsm : options.tsms) {
      urls_.push_back(broker::device_url(tsm, member.device_id));
      clients_.emplace_back(
          http::ClientOptions{.ca_file = options.ca_file, .user_agent = kProgram});
    }
  }

  http::Reply send(http::Call call) {
    const size_t at = next_++ % urls_.size();
    call.url = urls_[at];
    return clients_[at].send(call);
  }

 private:
  std::vector<std::string> urls_;
  std::vector<http::Client> clients_;
  size_t next_;
};

std::string reason_of(const http::ClientError &error) {
  switch (error.failure()) {
    case http::Failure::kNoConnection:
      return "no connection";
    case http::Failure::kTls:
      return "no TLS connection that can be trusted";
    case http::Failure::kTimeout: {
      const std::string text = error.what();
      return text == kLostRequest || text == kLostAnswer ? text : "no answer in time";
    }
    case http::Failure::kLost:
      return "no whole answer";
    case http::Failure::kTooLarge:
      return "too long an answer";
    case http::Failure::kRedirect:
      return "a redirect that is not followed";
  }
  return "failed";
}

/// Counts what passes and what does not.
http::Reply measured(const std::function<http::Reply(const http::Call &)> &post,
                     const http::Call &call, Figures &figures) {
  try {
    const Clock::time_point start = Clock::now();
    http::Reply reply = post(call);
    figures.exchanges.add(since(start));
    if (reply.status >= 300) ++figures.failures["status " + std::to_string(reply.status)];
    return reply;
  } catch (const http::ClientError &error) {
    ++figures.failures[reason_of(error)];
    throw;
  }
}

void count_end(const broker::Outcome &outcome, Figures &figures) {
  if (outcome.end == broker::End::kNoResponse) {
    ++figures.failures["no response: " + tools::code_text(outcome.code)];
  } else if (outcome.end == broker::End::kTooLong) {
    ++figures.failures["too many messages"];
  } else if (outcome.end == broker::End::kRefused) {
    ++figures.failures["not begun anew"];
  } else if (outcome.end == broker::End::kUnreachable) {
    ++figures.failures["begun anew too often"];
  }
}

}  // namespace

broker::Outcome call_tsm(const Member &member, const CallOptions &options, const broker::Stop &stop,
                         Random &random, Figures &figures,
                         const std::function<void()> &on_message) {
  const Clock::time_point start = Clock::now();
  device::AgentLog log(false);
  Tsms tsms(member, options, random());
  const auto post =
      lossy([&](const http::Call &call) { return tsms.send(call); }, options.faults, random);
  broker::Ends ends;
  ends.url = broker::device_url(options.tsms[0], member.device_id);
  ends.post = [&](const http::Call &call) { return measured(post, call, figures); };
  ends.open_agent = [&] { return std::make_unique<FleetAgent>(member); };
  ends.on_exchange = [&](const broker::Exchange &exchange) {
    figures.agents.add(exchange.agent_time);
    ++figures.messages[std::string(exchange.message->command) + " " + exchange.verdict];
    if (on_message) on_message();
  };
  ++figures.num_calls;
  ++figures.num_sessions;
  const broker::Outcome outcome = broker::call(
      ends, options.policy, stop, [&](const broker::Outcome &, auto) { ++figures.num_sessions; });
  count_end(outcome, figures);
  if (outcome.end == broker::End::kDone) figures.calls.add(since(start));
  (void)log.take();
  return outcome;
}

}  // namespace fleet
