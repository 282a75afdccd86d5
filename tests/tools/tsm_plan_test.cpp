// SPDX-License-Identifier: BSD-2-Clause
#include <gtest/gtest.h>

#include <algorithm>
#include <fstream>
#include <random>

#include "common/agent_codes.h"
#include "common/error_line.h"
#include "support/temporary_folder.h"
#include "tsm/plan/decision.h"
#include "tsm/protocol/dsi.h"
#include "tsm/protocol/image.h"
#include "tsm_fake_device.h"

namespace tsm {
namespace {

using Domains = std::map<std::string, std::vector<std::string>>;  // "sd/sp": "taid version"...

std::string before(const std::string &text, char mark) {
  return text.substr(0, text.find(mark));
}
std::string after(const std::string &text, char mark) {
  return text.substr(text.find(mark) + 1);
}

/// Does what a device does, as far as a plan sees it.
struct Device {
  Domains domains = {};
  std::set<std::string> theirs = {};     // SDs
  std::set<std::string> keyless = {};    // SPs
  std::set<std::string> refusing = {};   // orders, each once
  std::vector<std::string> orders = {};  // that changed something, or asked whose a domain is

  Json state() const {
    Json document = test_dsi();
    Json &aiks = document["dsi"]["tee"]["teeaiklist"];
    const Json aik = aiks[0];
    aiks = Json::array();
    Json list = Json::array();
    for (const auto &[name, apps] : domains) {
      Json tas = Json::array();
      for (const std::string &app : apps) tas.push_back({{"taid", before(app, ' ')}});
      list.push_back({{"name", before(name, '/')}, {"spid", after(name, '/')}, {"talist", tas}});
      if (keyless.contains(after(name, '/'))) continue;
      aiks.push_back(aik);
      aiks.back()["spid"] = after(name, '/');
    }
    document["dsi"]["tee"]["sdlist"]["sd"] = list;
    return document;
  }

  /// Returns the code of a refusal, or 0.
  uint32_t carry_out(const Order &order) {
    const RequestOptions &options = order.options;
    const std::string key = options.sdname + "/" + options.spid;
    const auto app = std::ranges::find_if(
        domains[key], [&](const std::string &a) { return before(a, ' ') == options.taid; });
    if (refusing.erase(order_text(order)) != 0) return OTRP_NO_MEMORY;
    switch (order.message) {
      case MessageId::kCreateSd:
        break;
      case MessageId::kUpdateSd:
        if (theirs.contains(options.sdname)) return OTRP_SD_MISMATCH;
        if (options.renew_aik) keyless.erase(options.spid);
        break;
      case MessageId::kDeleteSd:
        domains.erase(key);
        break;
      case MessageId::kDeleteTa:
        domains[key].erase(app);
        break;
      case MessageId::kInstallTa:
      case MessageId::kUpdateTa:
        if ((app == domains[key].end()) != (order.message == MessageId::kInstallTa)) {
          return OTRP_TA_EXISTS;
        }
        if (app != domains[key].end()) domains[key].erase(app);
        domains[key].push_back(options.taid + " " + options.ta_version);
        break;
      case MessageId::kGetDeviceState:
      case MessageId::kGetTaInfo:
        break;
    }
    return 0;
  }

  Response answer(const Order &order) {
    Response response = {.message = &message_of(order.message)};
    if (order.message == MessageId::kGetTaInfo) {
      for (const auto &[name, apps] : domains) {
        for (const std::string &app : apps) {
          if (before(app, ' ') == order.options.taid) {
            response.members["ta_version"] = after(app, ' ');
          }
        }
      }
      return response;
    }
    if (order.message != MessageId::kGetDeviceState) orders.push_back(order_text(order));
    const Domains kept = domains;
    const bool only_asks = order.message == MessageId::kGetDeviceState;
    if (const uint32_t code = only_asks ? 0 : carry_out(order)) {
      domains = kept;
      response.error_code = code;
    } else {
      response.content = state();
    }
    return response;
  }

  /// What is in the way in the end; nothing when the plan is met.
  std::vector<std::string> bring_to(const Plan &plan, Progress *progress) {
    begin_session(progress);
    for (int i = 0; i < 100; ++i) {
      const Decision decision = decide(plan, *progress);
      if (!decision.order) return decision.obstacles;
      const Response response = answer(*decision.order);
      learn(*decision.order, response, response.error_code ? "refused" : "", progress);
    }
    return {"it does not end"};
  }
};

Plan plan_of(const Domains &domains, bool deletes_others) {
  Plan plan = {.domains = {}, .deletes_others = deletes_others};
  for (const auto &[name, apps] : domains) {
    PlannedDomain domain = {before(name, '/'), after(name, '/'), "certificate", {}};
    for (const std::string &app : apps) {
      domain.apps.push_back({before(app, ' '), after(app, ' '), "image"});
    }
    plan.domains.push_back(domain);
  }
  return plan;
}

struct PlanCase {
  const char *name;
  Device device;
  Domains plan;
  bool deletes_others;
  std::vector<std::string> orders;
  std::vector<std::string> obstacles = {};
  Progress known = {};
};

const PlanCase kPlans[] = {
    {"Nothing", {}, {}, true, {}},
    {"FromNothing",
     {},
     {{"a/sp", {"t1 1", "t2 1"}}, {"b/sp", {}}},
     false,
     {"create-sd a", "create-sd b", "install-ta t1 in a", "install-ta t2 in a"}},
    {"OthersAreKept",
     {.domains = {{"a/sp", {"t1 1", "t9 1"}}, {"z/sp", {"t8 1"}}}},
     {{"a/sp", {"t1 1"}}},
     false,
     {"update-sd a"}},
    {"OthersGo",
     {.domains = {{"a/sp", {"t1 1", "t9 1"}}, {"z/sp", {"t8 1"}}}},
     {{"a/sp", {"t1 1"}}},
     true,
     {"update-sd a", "update-sd z", "delete-ta t9 in a", "delete-ta t8 in z", "delete-sd z"}},
    {"OthersOfAnotherTsmStay",
     {.domains = {{"a/sp", {}}, {"z/sp", {"t8 1"}}}, .theirs = {"z"}},
     {{"a/sp", {}}},
     true,
     {"update-sd a", "update-sd z"}},
    {"AnotherVersion",
     {.domains = {{"a/sp", {"t1 1"}}}},
     {{"a/sp", {"t1 2"}}},
     false,
     {"update-sd a", "update-ta t1 in a"}},
    {"ALostKey",
     {.domains = {{"a/sp", {}}}, .keyless = {"sp"}},
     {{"a/sp", {}}},
     false,
     {"update-sd a", "update-sd a"}},
    {"AnAppMovesWhereOthersGo",
     {.domains = {{"a/sp", {}}, {"b/sp", {"t1 1"}}}},
     {{"a/sp", {"t1 1"}}, {"b/sp", {}}},
     true,
     {"update-sd a", "update-sd b", "delete-ta t1 in b", "install-ta t1 in a"}},
    {"AnAppElsewhere",
     {.domains = {{"b/sp", {"t1 1"}}}},
     {{"a/sp", {"t1 1"}}},
     false,
     {},
     {R"(app "t1" is in domain "b" and the plan wants it in "a")"}},
    {"ADomainOfAnotherTsm",
     {.domains = {{"a/sp", {}}}, .theirs = {"a"}},
     {{"0/sp", {}}, {"a/sp", {}}},
     false,
     {"update-sd a"},
     {R"(domain "a" is managed by another TSM)"}},
    {"ADomainOfAnotherSp",
     {.domains = {{"a/sp", {}}}},
     {{"0/sp", {}}, {"a/other", {}}},
     false,
     {},
     {R"(domain "a" belongs to service provider "sp", not to "other")"}},
    {"HalfInstalled",
     {.domains = {{"a/sp", {"t1 1"}}}},
     {{"a/sp", {"t1 1"}}},
     false,
     {"update-ta t1 in a"},
     {},
     {.is_ours = {{"a", true}}, .doubtful = {"t1"}}},
    {"CannotBeUpdated",
     {.domains = {{"a/sp", {"t1 1"}}}, .refusing = {"update-ta t1 in a"}},
     {{"a/sp", {"t1 2"}}},
     false,
     {"update-sd a", "update-ta t1 in a", "delete-ta t1 in a", "install-ta t1 in a"}},
    {"RefusedOnce",
     {.refusing = {"create-sd a", "install-ta t1 in a"}},
     {{"a/sp", {"t1 1"}}},
     false,
     {"create-sd a", "create-sd a", "install-ta t1 in a", "install-ta t1 in a"}},
};

TEST(Plan, TakesTheseMessages) {
  for (const PlanCase &row : kPlans) {
    SCOPED_TRACE(row.name);
    Device device = row.device;
    Progress progress = row.known;
    const Plan plan = plan_of(row.plan, row.deletes_others);
    EXPECT_EQ(device.bring_to(plan, &progress), row.obstacles);
    EXPECT_EQ(device.orders, row.orders);
    if (!row.obstacles.empty()) continue;
    device.orders.clear();
    progress = parse_progress(progress_json(progress));
    EXPECT_EQ(device.bring_to(plan, &progress), std::vector<std::string>());
    EXPECT_EQ(device.orders, std::vector<std::string>()) << "the second time";
  }
}

/// From anywhere to anywhere, with messages and answers lost: a plan is met, and then met at once.
TEST(Plan, IsMetFromAnywhere) {
  std::mt19937 random(20);
  const auto pick = [&](int n) { return static_cast<int>(random() % static_cast<unsigned>(n)); };
  const auto anything = [&] {
    Domains domains;
    for (const char *name : {"a/sp1", "b/sp1", "c/sp2"}) {
      if (pick(3) != 0) domains[name] = {};
    }
    for (const char *taid : {"t1", "t2", "t3"}) {
      if (domains.empty() || pick(3) == 0) continue;
      auto at = domains.begin();
      std::advance(at, pick(static_cast<int>(domains.size())));
      at->second.push_back(std::string(taid) + " " + std::to_string(pick(2)));
    }
    return domains;
  };
  for (int i = 0; i < 40; ++i) {
    SCOPED_TRACE(i);
    Device device = {.domains = anything()};
    const Domains wanted = anything();
    const Plan plan = plan_of(wanted, true);
    Progress progress;
    for (int session = 0; session < 4; ++session) {
      begin_session(&progress);
      for (;;) {
        const Decision decision = decide(plan, progress);
        if (!decision.order) break;
        const int luck = pick(8);  // 0: the message is lost, 1: the answer
        if (luck != 0) {
          const Response response = device.answer(*decision.order);
          if (luck != 1) learn(*decision.order, response, "", &progress);
        }
        if (luck <= 1) learn_nothing(*decision.order, "lost", &progress);
        progress = parse_progress(progress_json(progress));
        if (luck <= 1) break;
        progress.state = device.state();
        progress.has_changed = true;
        if (decision.order->message == MessageId::kGetDeviceState) progress.has_changed = false;
      }
    }
    EXPECT_EQ(device.bring_to(plan, &progress), std::vector<std::string>());
    for (auto &[name, apps] : device.domains) std::ranges::sort(apps);
    EXPECT_EQ(device.domains, wanted);
    device.orders.clear();
    EXPECT_EQ(device.bring_to(plan, &progress), std::vector<std::string>());
    EXPECT_EQ(device.orders, std::vector<std::string>());
  }
}

TEST(Plan, IsCheckedWholeBeforeUse) {
  const TemporaryFolder folder;
  const std::string plan = folder.path / "plan.json";
  const auto write = [&](const char *name, const std::string &text) {
    std::ofstream(folder.path / name) << text;
  };
  write("sp.pem", "certificate");
  write("other.pem", "another");
  write("app.img", pack_image("payload"));
  write("raw.img", "payload");
  const std::string app =
      R"({"taid": "71cce700000000000000000000000002", "version": "1", "image": "app.img"})";
  const auto domain = [](const std::string &sd, const std::string &apps) {
    return R"({"sd": ")" + sd + "\", \"sp\": \"bank\",\n\"cert_file\": \"sp.pem\",\n\"apps\": [" +
           apps + "]}";
  };
  const auto with = [&](std::string text, const std::string &from, const std::string &to) {
    return text.replace(text.find(from), from.size(), to);
  };
  const std::string good = "{\"domains\": [\n" + domain("a", app) + "]}";
  write("plan.json", good);
  EXPECT_EQ(read_plan(plan).domains.at(0).apps.at(0).image, pack_image("payload"));

  const std::pair<std::string, const char *> kBad[] = {
      {"", "1: not JSON: unexpected end of input; expected '[', '{', or a literal"},
      {"[]", "1: a plan: expected an object"},
      {"{}", "1: a plan needs \"domains\""},
      {with(good, "\"sp\"", "\"sp2\""), "2: a domain has no member \"sp2\""},
      {with(good, "\"cert_file\"", "\"sd\""), "3: \"sd\" is there twice"},
      {with(good, "sp.pem", "none.pem"), "3: cannot open"},
      {with(good, "app.img", "raw.img"), "4: "},
      {with(good, "71cce7", "71"), "4: \"taid\" has 28 characters: expected 32"},
      {with(good, "\"a\"", "\"\""), "2: \"sd\" is empty"},
      {with(good, "\"a\"", "\"" + std::string(57, 'a') + "\""), "2: \"sd\" has 57 bytes"},
      {with(good, "\"a\"", "\"a\\n\""), "2: \"sd\" has a control character"},
      {with(good, "\"a\"", "7"), "2: \"sd\": expected a text"},
      {"{\"domains\": [" + domain("a", "") + ",\n" + domain("a", "") + "]}",
       "4: domain \"a\" is planned twice, first in line 1"},
      {"{\"domains\": [" + domain("a", app) + ",\n" + domain("b", app) + "]}",
       "6: app \"71cce700000000000000000000000002\" is planned twice, first in line 3"},
      {"{\"domains\": [" + domain("a", "") + ",\n" + with(domain("b", ""), "sp.pem", "other.pem") +
           "]}",
       "5: service provider \"bank\" has another certificate above"},
      {"{\"domains\": [],\n\"others\": true}", "2: \"others\": expected \"keep\" or \"delete\""},
      {std::string(20, '['), "1: nested deeper than expected"},
  };
  for (const auto &[text, wanted] : kBad) {
    SCOPED_TRACE(wanted);
    write("plan.json", text);
    try {
      read_plan(plan);
      ADD_FAILURE() << "it was taken";
    } catch (const tools::UsageError &error) {
      EXPECT_TRUE(std::string(error.what()).starts_with(plan + ":" + wanted)) << error.what();
    }
  }
}

}  // namespace
}  // namespace tsm
