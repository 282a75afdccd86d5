// SPDX-License-Identifier: BSD-2-Clause
// Real devices call servers that share a store: whatever gets lost on the way, they arrive.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <set>
#include <thread>

#include "common/error_line.h"
#include "device/broker/broker.h"
#include "support/agent_device.h"
#include "support/manager.h"
#include "tsm/server/service.h"
#include "tsm_server/fresh_store.h"

namespace tsm {
namespace {

using namespace std::chrono_literals;
using otrp_test::AgentDevice;
using otrp_test::make_image;
using otrp_test::Manager;
using testing::HasSubstr;

constexpr char kOtrpJson[] = "application/otrp+json";

/// A device that has its keys, which are slow to make.
const otrp_test::Snapshot &new_device() {
  static const otrp_test::Snapshot snapshot = [] {
    AgentDevice device;
    device.require_open();
    (void)device::read_info(device.door());
    return device.snapshot();
  }();
  return snapshot;
}

Plan usual_plan(const std::string &version = "1") {
  const auto app = [](const char *name, const std::string &its_version) {
    return PlannedApp{otrp_test::taid(name), its_version, make_image(3000)};
  };
  return {.domains = {{"wallet", "bank", "cert", {app("pay", version), app("save", "1")}},
                      {"tickets", "bank", "cert", {}}}};
}

class Agent : public broker::Agent {
 public:
  explicit Agent(AgentDevice *device) : device_(device) { device->require_open(); }
  device::Answer send(const tools::Message &message, std::string_view request) override {
    return device::send(device_->session(), message, request, device::capacity_for(request));
  }

 private:
  AgentDevice *device_;
};

/// Two servers on one store, which take turns, and one device.
struct Fleet {
  otrp_test::FreshStore fresh;
  Store stores[2] = {Store(fresh.uri()), Store(fresh.uri())};
  const Identity &tsm = otrp_test::tsm_named("tsm1");
  Service services[2] = {Service(tsm, &stores[0], 60s), Service(tsm, &stores[1], 60s)};
  AgentDevice device{new_device()};
  DeviceInfo info = Manager(device).info;
  std::map<std::string, int> executed;  // by message and verdict
  int num_posts = 0;
  std::function<void(int number, bool is_answer)> lose = [](int, bool) {};  // may throw
  size_t lost_image = 0;                                                    // counts from 1
  size_t num_images = 0;

  Fleet() {
    stores[0].enrol({{info.device_id, base64url_encode(info.tee_key.encoded())}}, kDefaultGroup);
    stores[0].assign(stored_plan(usual_plan()), kDefaultGroup);
  }

  static http::Answer ask(Service *service, const http::Request &request) {
    const std::optional<http::Answer> early = service->handler().answer_early(request);
    return early ? *early : service->handler().answer(request);
  }
  http::Answer post(const std::string &body, Service *service = nullptr) {
    http::Request request = {.method = "POST", .path = "/tam/" + info.device_id, .body = body};
    request.headers = {{"Content-Length", std::to_string(body.size())}};
    if (!body.empty()) request.headers.push_back({"Content-Type", kOtrpJson});
    return ask(service ? service : &services[0], request);
  }
  std::string obey(const http::Answer &request) {
    const tools::Message *message = nullptr;
    for (const tools::Message &each : messages()) {
      if (request.body->find("\"" + std::string(each.request) + "\"") < 3) message = &each;
    }
    return Agent(&device).send(*message, *request.body).response;
  }

  broker::Outcome call() {
    const broker::Stop stop;
    const broker::Ends ends = {
        .url = "http://tsm/tam/" + info.device_id,
        .post =
            [this](const http::Call &call) {
              const int number = ++num_posts;
              lose(number, false);
              const http::Answer answer = post(call.body, &services[number % 2]);
              lose(number, true);
              return http::Reply{.status = answer.status,
                                 .headers = {{"Content-Type", answer.type}},
                                 .body = answer.body ? *answer.body : "",
                                 .url = call.url};
            },
        .open_agent = [this] { return std::make_unique<Agent>(&device); },
        .keep_image =
            [this](const std::string &, std::string_view) {
              if (++num_images == lost_image) throw tools::UsageError("no space");
            },
        .on_exchange =
            [this](const broker::Exchange &exchange) {
              ++executed[std::string(exchange.message->command) + " " + exchange.verdict];
            }};
    return broker::run_session(ends, 64, stop);
  }

  StoredDevice row() { return stores[0].find_device(info.device_id).value(); }
  std::string metrics() {
    return *ask(&services[0], {.method = "GET", .path = "/metrics"}).body +
           *ask(&services[1], {.method = "GET", .path = "/metrics"}).body;
  }
};

TEST(TsmServer, ADeviceIsBroughtToItsPlanByServersInTurn) {
  Fleet fleet;
  EXPECT_THAT(fleet.metrics(), HasSubstr("otrp_devices{state=\"unseen\"} 1\n"));
  EXPECT_EQ(fleet.call().reason, "");
  EXPECT_EQ(fleet.executed,
            (std::map<std::string, int>{
                {"get-device-state pass", 2}, {"create-sd pass", 2}, {"install-ta pass", 2}}));
  EXPECT_EQ(fleet.row().outcome, "current");
  for (const char *line :
       {"otrp_exchanges_total{message=\"create-sd\",outcome=\"pass\"} 1\n",
        "otrp_exchange_seconds_count{message=\"call\"} 1\n", "otrp_devices{state=\"current\"} 1\n",
        "otrp_devices{state=\"behind\"} 0\n", "otrp_open_transactions 0\n"}) {
    EXPECT_THAT(fleet.metrics(), HasSubstr(line));
  }

  fleet.executed.clear();
  EXPECT_EQ(fleet.call().reason, "");
  EXPECT_EQ(fleet.executed.size(), 2u) << "the state and versions are asked for, nothing is done";

  fleet.stores[0].assign(stored_plan(usual_plan("2")), kDefaultGroup);
  EXPECT_THAT(fleet.metrics(), HasSubstr("otrp_devices{state=\"behind\"} 1\n"));
  EXPECT_EQ(fleet.call().reason, "");
  EXPECT_EQ(fleet.executed["update-ta pass"], 1);
  EXPECT_EQ(fleet.executed["get-device-state pass"], 3) << "once before, and twice now";
  EXPECT_EQ(fleet.row().outcome, "current");
  EXPECT_EQ(fleet.row().plan, fleet.row().outcome_plan);

  fleet.stores[0].enrol({{fleet.info.device_id, fleet.row().key}}, "others");
  EXPECT_EQ(fleet.post("").status, 204);
  EXPECT_THAT(fleet.metrics(), HasSubstr("otrp_devices{state=\"unplanned\"} 1\n"));
}

/// Nothing that was acknowledged is sent again, and nothing is left half way.
TEST(TsmServer, WhateverIsLostTheNextCallArrives) {
  enum Loss { kRequest, kAnswer, kImage };
  for (const Loss loss : {kRequest, kAnswer, kImage}) {
    for (int number = 1, was_lost = 1; was_lost != 0; ++number) {
      SCOPED_TRACE(testing::Message() << "loss " << loss << ", number " << number);
      Fleet fleet;
      was_lost = 0;
      fleet.lose = [&](int now, bool is_answer) {
        if (now != number || loss == kImage || is_answer != (loss == kAnswer)) return;
        was_lost = 1;
        throw http::ClientError(http::Failure::kLost, "lost");
      };
      fleet.lost_image = loss == kImage ? number : 0;
      const broker::Outcome first = fleet.call();
      if (first.end == broker::End::kImageNotKept) was_lost = 1;
      EXPECT_EQ(first.end == broker::End::kDone, was_lost == 0) << first.reason;
      if (was_lost != 0) {
        EXPECT_EQ(fleet.call().reason, "");
      }
      EXPECT_EQ(fleet.row().outcome, "current") << fleet.row().reason;
      EXPECT_EQ(fleet.executed["create-sd pass"], 2);
      // The one whose image was lost is told to nobody.
      EXPECT_EQ(fleet.executed["install-ta pass"], loss == kImage ? 2 - was_lost : 2);
      for (const auto &[what, times] : fleet.executed) EXPECT_THAT(what, HasSubstr(" pass"));
      if (loss == kImage) {
        EXPECT_EQ(fleet.executed["update-ta pass"], was_lost);
      }
      ASSERT_LT(number, 12);
    }
  }
}

TEST(TsmServer, ALostQuestionBringsNoImageAgainButAFewInARowDo) {
  Fleet fleet;
  ASSERT_EQ(fleet.call().reason, "");
  fleet.executed.clear();
  const auto call = [&](int lost) {  // requests and answers, counted from 1
    const int before = fleet.num_posts;
    bool was_lost = false;
    fleet.lose = [&, before](int now, bool is_answer) {
      if (2 * (now - before) - !is_answer != lost) return;
      was_lost = true;
      throw http::ClientError(http::Failure::kLost, "lost");
    };
    (void)fleet.call();
    return was_lost;
  };
  int lost = 1;
  while (call(lost)) ASSERT_LT(++lost, 12);
  EXPECT_EQ(fleet.row().outcome, "current");
  EXPECT_EQ(fleet.executed.size(), 2u) << "the state and versions are asked for, nothing is done";

  for (int i = 0; i < 3; ++i) EXPECT_TRUE(call(5)) << "the answer of the device about its first TA";
  EXPECT_FALSE(call(0));
  EXPECT_EQ(fleet.executed["update-ta pass"], 1);
  EXPECT_EQ(fleet.row().outcome, "current");
}

TEST(TsmServer, WhatIsNotTheAnswerChangesNothing) {
  Fleet fleet;
  Service impatient(fleet.tsm, &fleet.stores[0], 0s);
  AgentDevice stranger;
  const http::Answer ask_state = fleet.post("");
  const std::string state = fleet.obey(ask_state);
  stranger.require_open();
  const std::string strange =
      Agent(&stranger).send(message_of(MessageId::kGetDeviceState), *ask_state.body).response;

  struct Case {
    const char *name;
    int status;
    const char *outcome;
    std::string body;
    const char *path = nullptr;
    const char *type = kOtrpJson;
    const char *method = "POST";
  };
  const auto check = [&](const Case &row) {
    SCOPED_TRACE(row.name);
    const StoredDevice before = fleet.row();
    const size_t num_events = fleet.stores[0].events_of(before.device_id).size();
    const http::Answer answer = Fleet::ask(
        &fleet.services[0], {.method = row.method,
                             .path = row.path != nullptr ? row.path : "/tam/" + before.device_id,
                             .headers = {{"Content-Length", std::to_string(row.body.size())},
                                         {"Content-Type", row.type}},
                             .body = row.body});
    EXPECT_EQ(answer.status, row.status);
    EXPECT_EQ(fleet.row().version, before.version);
    EXPECT_EQ(fleet.stores[0].events_of(before.device_id).size(), num_events);
    if (row.outcome[0] == '\0') return;
    EXPECT_THAT(fleet.metrics(), HasSubstr("otrp_exchanges_total{message=\"none\",outcome=\"" +
                                           std::string(row.outcome) + "\"} "));
  };
  for (const Case &row : {
           Case{"NoSuchDevice", 404, "unknown", "", "/tam/nobody"},
           Case{"NoDeviceHasThisId", 404, "unknown", "", "/tam/\xFF'\n"},
           Case{"NotJson", 400, "malformed", "{"},
           Case{"ARequest", 400, "malformed", *ask_state.body},
           Case{"AnotherDevicesAnswer", 403, "stranger", strange},
           Case{"AnotherType", 415, "", state, nullptr, "application/json"},
           Case{"AnotherMethod", 405, "", "", nullptr, kOtrpJson, "GET"},
       }) {
    check(row);
  }

  const http::Answer create = fleet.post(state);
  ASSERT_EQ(create.status, 200);
  check({"AnOldAnswer", 409, "other", state});
  const std::string created = fleet.obey(create);
  EXPECT_EQ(fleet.post(created).status, 200);

  ASSERT_EQ(fleet.post("", &impatient).status, 200);
  check({"ALateAnswer", 409, "late", state});
  ASSERT_EQ(fleet.call().reason, "");
  check({"NothingWasAsked", 409, "unasked", created});
}

TEST(TsmServer, OfManyCallsAtOnceEachLeavesOneTransaction) {
  Fleet fleet;
  std::atomic<int64_t> num_taken = 0;
  {
    std::vector<std::jthread> threads;
    for (int i = 0; i < 6; ++i) {
      threads.emplace_back([&, i] {
        const int status = fleet.post("", &fleet.services[i % 2]).status;
        EXPECT_TRUE(status == 200 || status == 409) << status;
        if (status == 200) ++num_taken;
      });
    }
  }
  EXPECT_GE(num_taken, 1);
  EXPECT_EQ(fleet.row().version, num_taken);
  EXPECT_EQ(fleet.stores[0].count_open(0), 1u);
  EXPECT_EQ(fleet.call().reason, "");
  EXPECT_EQ(fleet.row().outcome, "current");
}

TEST(TsmServer, WhatNoMessageCanDoIsSaidAndLeft) {
  Fleet fleet;
  Manager other(fleet.device, "tsm2");
  ASSERT_TRUE(other.get_device_state().passed());
  ASSERT_TRUE(other.create_sd("bank", "wallet").passed());
  EXPECT_EQ(fleet.call().reason, "");
  EXPECT_EQ(fleet.row().outcome, "refused");
  EXPECT_EQ(fleet.row().reason, "domain \"wallet\" is managed by another TSM");
  EXPECT_EQ(fleet.executed.count("create-sd pass"), 0u);
  EXPECT_THAT(fleet.metrics(), HasSubstr("otrp_devices{state=\"refused\"} 1\n"));
}

TEST(TsmServer, AStoreThatIsAwayIsNobodysEnd) {
  Fleet fleet;
  if (!fleet.fresh.is_shared()) GTEST_SKIP() << "SQLite has no server";
  const http::Answer ask_state = fleet.post("");
  fleet.fresh.end_connections();
  const http::Answer away = fleet.post("");
  EXPECT_EQ(away.status, 503);
  EXPECT_NE(http::find_header(away.headers, "Retry-After"), nullptr);
  EXPECT_EQ(fleet.post(fleet.obey(ask_state)).status, 200);
}

}  // namespace
}  // namespace tsm
