// SPDX-License-Identifier: BSD-2-Clause
#include "faults/sweep.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <map>

namespace otrp_test {
namespace {

using tee::test::Fault;
using Records = std::map<std::string, std::string>;

/// Payloads by ID; of an AIK that is not in `before` only counts that it is a new one. An object
/// without a complete payload counts as one that is not there, as it does for the agent.
Records records_of(const AgentDevice &device, const Records &before = {}) {
  Records records;
  for (const auto &[id, raw] : device.objects()) {
    std::string text = device.record(id).value_or("");
    if (text.empty()) continue;
    const auto old = before.find(id);
    const bool is_new = old == before.end() || old->second != text;
    if (!before.empty() && id.starts_with("SP_INFO_") && is_new) {
      Json record = Json::parse(text);
      record["aik"] = "new";
      text = record.dump();
    }
    records[id] = text;
  }
  return records;
}

/// Objects that a cut has left without a payload.
std::set<std::string> hollow_objects(const AgentDevice &device) {
  std::set<std::string> ids;
  for (const auto &[id, raw] : device.objects()) {
    if (device.record(id).value_or("").empty()) ids.insert(id);
  }
  return ids;
}

/// The state without its order, and without the keys.
std::set<std::string> state_of(const Scene &scene) {
  std::set<std::string> state;
  for (const Json &sd : scene.sd_list()) state.insert(sd.dump());
  for (const Json &aik : scene.aik_list()) state.insert(aik.at("spid").dump());
  return state;
}

class Sweep {
 public:
  Sweep(const Scenario &scenario, const FaultKind &kind) : scenario_(scenario), kind_(kind) {
    const tee::test::TraceSink log;
    scenario.prepare(origin_);
    // A new instance lists the SDs in another order, and the request is one for that.
    if (!origin_.dsi_text.empty()) origin_.device.restart();
    if (!origin_.dsi_text.empty()) origin_.get_device_state();
    options_ = usual(scenario.id);
    if (scenario.change != nullptr) scenario.change(options_);
    request_ = origin_.request(scenario.id, options_);
    state_request_ = origin_.request(MessageId::kGetDeviceState, {});
    snapshot_ = origin_.device.snapshot();
    before_ = records_of(origin_.device);
    learn_good_run();
  }

  unsigned run() {
    unsigned n = 1;
    while (run_point(n) && !testing::Test::HasFailure()) ++n;
    return n - 1;
  }

 private:
  /// The states that storage goes through when nothing fails, and the device state at the end.
  void learn_good_run() {
    Scene good(origin_, snapshot_);
    good.device.open();
    perform(good);
    orderly_.insert(records_of(good.device, before_));
    good.send(MessageId::kGetDeviceState, state_request_);
    final_ = state_of(good);
    for (unsigned n = 1;; ++n) {
      Scene cut(origin_, snapshot_);
      if (scenario_.ask != Ask::kCreation) cut.device.open();
      cut.device.host().fail(kAgentUuid, Fault::kPowerCut, n);
      perform(cut);
      if (!cut.device.host().fault_report().fired) return;
      cut.device.host().restore_power();
      orderly_.insert(records_of(cut.device, before_));
    }
  }

  /// What the device is asked; checks the answer's form.
  void perform(Scene &scene) {
    if (scenario_.ask == Ask::kCreation) {
      scene.device.open();
    } else if (scenario_.ask == Ask::kMessage) {
      check_frame(scene.send(scenario_.id, request_));
    } else {
      const bool is_query = scenario_.ask == Ask::kStatusQuery;
      const Answer answer = is_query ? scene.device.invoke(1, device::build_query(taid("ta1")), 57)
                                     : scene.device.invoke(2, "", 100);
      const size_t id_len = scene.info.device_id.size();
      const bool fits = is_query ? answer.size <= 57 : answer.size == id_len;
      EXPECT_TRUE(answer.result != TEEC_SUCCESS || fits) << answer.size;
    }
  }

  /// Either a code and no response, or a response, which send() has verified.
  void check_frame(const Outcome &outcome) {
    const Reply &reply = outcome.reply;
    const Answer &answer = reply.answer;
    if (reply.result != TEEC_SUCCESS) {
      const std::string untouched(answer.buffer.size(), '\xA5');
      const std::string header_only = word(reply.result) + word(0) + untouched.substr(8);
      EXPECT_TRUE(answer.buffer == untouched || answer.buffer == header_only);
      return;
    }
    EXPECT_NE(reply.status != 0, outcome.response.has_value())
        << std::hex << reply.status << " " << reply.response.size();
    // The size of an image is told even when it came to nothing.
    const size_t used = 8 + reply.response.size() + (reply.image ? 4 + reply.image->size() : 0);
    const size_t told = 8 + 4 + options_.image.size();
    EXPECT_TRUE(answer.size == used || (reply.status != 0 && answer.size == told)) << answer.size;
  }

  bool run_point(unsigned n) {
    SCOPED_TRACE(std::string(scenario_.name) + ", " + kind_.name + " " + std::to_string(n));
    const tee::test::TraceSink log;
    Scene scene(origin_, snapshot_);
    tee::test::Device &host = scene.device.host();
    host.create_at_once(kind_.create_at_once);
    if (scenario_.ask != Ask::kCreation) scene.device.open();
    host.fail(kAgentUuid, kind_.fault, n, kind_.and_after);
    perform(scene);
    const tee::test::FaultReport report = host.fault_report();
    SCOPED_TRACE(report.call);
    host.clear_faults();
    if (kind_.fault == Fault::kPowerCut) host.restore_power();
    check_what_is_left(scene);
    // How life goes on depends on what is stored alone.
    const auto left = std::pair(records_of(scene.device, before_), hollow_objects(scene.device));
    if (survived_.insert(left).second) check_life_goes_on(scene);
    const bool was_cut = kind_.fault == Fault::kPowerCut && report.fired;
    if (was_cut && lived_on_.insert(report.call).second) live_on(scene);
    return report.fired;
  }

  void check_what_is_left(Scene &scene) {
    Records records = records_of(scene.device, before_);
    const bool orderly = std::ranges::any_of(orderly_, [&](Records state) {
      for (const std::string &id : scenario_.may_stay) {
        if (records.contains(id)) state[id] = records[id];
      }
      return state == records;
    });
    EXPECT_TRUE(orderly) << testing::PrintToString(records);
    const bool created = scenario_.ask != Ask::kCreation || scene.device.open();
    EXPECT_TRUE(created);
    scene.device.expect_clean();
    if (kind_.fault == Fault::kPowerCut) return;  // the instance died with its device
    EXPECT_TRUE(scene.send(MessageId::kGetDeviceState, state_request_).response);
  }

  /// After a restart the device tells its state, and the request can be made again or is done.
  void check_life_goes_on(Scene &scene) {
    ASSERT_TRUE(scene.device.restart());
    ASSERT_TRUE(scene.send(MessageId::kGetDeviceState, state_request_).response);
    if (scenario_.ask != Ask::kMessage) return;
    const Outcome again = scene.run(scenario_.id, options_);
    EXPECT_TRUE(again.passed() || scenario_.done_codes.contains(again.code()))
        << std::hex << again.code();
    scene.device.expect_clean();
    // An SP that had its AIK before the failure is in the device state again from here on.
    ASSERT_TRUE(scene.device.restart());
    ASSERT_TRUE(scene.send(MessageId::kGetDeviceState, state_request_).response);
    EXPECT_EQ(state_of(scene), final_);
  }

  /// The TSM manages the device as ever, and ends with one that holds nothing.
  static void live_on(Scene &scene) {
    ASSERT_TRUE(scene.device.open());
    ASSERT_TRUE(scene.get_device_state().passed());
    const std::string sp = scene.aik_list().empty() ? "sp8" : scene.aik_list()[0].at("spid");
    EXPECT_TRUE(scene.create_sd(sp, "sd8").passed());
    EXPECT_TRUE(scene.create_sd("sp9", "sd9").passed());
    for (const char *ta : {"ta8", "ta9"}) {
      EXPECT_TRUE(scene.install_ta("sp9", "sd9", taid(ta)).passed());
    }
    EXPECT_TRUE(scene.update_ta("sp9", "sd9", taid("ta8")).passed());
    EXPECT_TRUE(scene.update_sd("sp9", "sd9").passed());
    EXPECT_TRUE(scene.get_ta_info("sp9", taid("ta8")).passed());
    EXPECT_TRUE(scene.delete_ta("sd9", taid("ta9")).passed());
    EXPECT_TRUE(scene.device.restart());
    EXPECT_TRUE(scene.get_device_state().passed());
    for (const std::string &name : scene.sd_names()) {
      EXPECT_TRUE(scene.delete_sd(name, "true").passed()) << name;
    }
    EXPECT_TRUE(scene.get_device_state().passed());
    EXPECT_TRUE(scene.sd_list().empty());
    EXPECT_TRUE(scene.aik_list().empty());
    scene.device.expect_clean();
  }

  const Scenario &scenario_;
  const FaultKind &kind_;
  Scene origin_;
  tsm::RequestOptions options_;
  std::string request_;
  std::string state_request_;
  Snapshot snapshot_;
  Records before_;
  std::set<Records> orderly_;
  std::set<std::pair<Records, std::set<std::string>>> survived_;
  std::set<std::string> lived_on_;  // what each cut met
  std::set<std::string> final_;
};

}  // namespace

unsigned sweep(const Scenario &scenario, const FaultKind &kind) {
  // Once: each call would begin with new keys.
  [[maybe_unused]] static const bool is_reusing = (tee::test::reuse_generated_keys(7), true);
  return Sweep(scenario, kind).run();
}

}  // namespace otrp_test
