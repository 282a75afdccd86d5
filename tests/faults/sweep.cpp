// SPDX-License-Identifier: BSD-2-Clause
#include "faults/sweep.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <map>

#include "support/log_rows.h"

namespace otrp_test {
namespace {

using tee::test::Fault;
using tee::test::FaultReport;
using Records = std::map<std::string, std::string>;

/// Adds white space to the payloads of all objects whose ID begins with `prefix`.
void lengthen(Snapshot &snapshot, const std::string &prefix) {
  for (auto &[id, raw] : snapshot.agent) {
    if (id.starts_with(prefix)) raw = stored(*payload_of(raw) + std::string(30000, ' '));
  }
}

/// Payloads by ID, but of a new AIK only that it is new. An object without a whole payload, which a
/// cut may leave, has an empty one.
Records records_of(const AgentDevice &device, const Records &before = {}) {
  Records records;
  for (const auto &[id, raw] : device.objects()) {
    std::string &text = records[id] = payload_of(raw).value_or("");
    text.erase(text.find_last_not_of(' ') + 1);
    const auto old = before.find(id);
    const bool is_new = old == before.end() || old->second != text;
    if (before.empty() || !id.starts_with("SP_INFO_") || text.empty() || !is_new) continue;
    Json record = Json::parse(text);
    record["aik"] = "new";
    text = record.dump();
  }
  return records;
}

/// What the agent sees of them.
Records whole(Records records) {
  std::erase_if(records, [](const auto &record) { return record.second.empty(); });
  return records;
}

/// A stored record; without members when there is none.
Json json_of(const AgentDevice &device, const std::string &id) {
  const std::string text = device.record(id).value_or("");
  return text.empty() ? Json::object() : Json::parse(text);
}

/// The public half of an SP's stored AIK, as device states show it; empty without one.
std::string stored_aik(const AgentDevice &device, const std::string &spid) {
  const std::string box =
      tools::base64_decode(json_of(device, "SP_INFO_" + spid).value("aik", "")).value();
  if (box.empty()) return "";
  auto values = box_records(box);
  return tools::base64url_encode(stored(values[0x11]) + stored(values[0x12]));
}

/// The state without its order, and without the keys.
std::set<std::string> state_of(const Scene &scene) {
  std::set<std::string> state;
  for (const Json &sd : scene.sd_list()) state.insert(sd.dump());
  for (const Json &aik : scene.aik_list()) state.insert(aik.at("spid").dump());
  return state;
}

}  // namespace

void live_on(Scene &scene) {
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

class Sweep::Driver {
 public:
  explicit Driver(const Scenario &scenario) : scenario_(scenario) {
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

  const std::set<std::string> &log_rows() const { return said_; }

  unsigned run(const FaultKind &kind) {
    start_ = snapshot_;
    if (kind.long_records != nullptr) lengthen(start_, kind.long_records);
    const bool is_limit = kind.fault == Fault::kFullHeap;
    unsigned num_points = 0;
    unsigned n = is_limit ? UINT32_MAX : 1;
    for (bool goes_on = true; goes_on && !testing::Test::HasFailure();) {
      const FaultReport report = run_point(kind, n);
      num_points += report.fired ? 1 : 0;
      goes_on = is_limit ? report.heap_in_use != 0 : report.fired;
      n = is_limit ? report.heap_in_use - 1 : n + kind.step;
    }
    return num_points;
  }

 private:
  /// The states that storage goes through when nothing fails, and the device state at the end.
  void learn_good_run() {
    Scene good(origin_, snapshot_);
    good.device.open();
    perform(good);
    orderly_.insert(whole(records_of(good.device, before_)));
    good.send(MessageId::kGetDeviceState, state_request_);
    final_ = state_of(good);
    for (unsigned n = 1;; ++n) {
      Scene cut(origin_, snapshot_);
      if (scenario_.ask != Ask::kCreation) cut.device.open();
      cut.device.host().fail(kAgentUuid, Fault::kPowerCut, n);
      perform(cut);
      if (!cut.device.host().fault_report().fired) return;
      cut.device.host().restore_power();
      orderly_.insert(whole(records_of(cut.device, before_)));
    }
  }

  /// What the device is asked; checks the answer's form. True when a message passed.
  bool perform(Scene &scene) {
    if (scenario_.ask == Ask::kCreation) {
      scene.device.open();
    } else if (scenario_.ask == Ask::kMessage) {
      const Outcome outcome = scene.send(scenario_.id, request_);
      check_frame(outcome);
      return outcome.passed();
    } else {
      const bool is_query = scenario_.ask == Ask::kStatusQuery;
      const Answer answer = is_query ? scene.device.invoke(1, device::build_query(taid("ta1")), 57)
                                     : scene.device.invoke(2, "", 100);
      const size_t id_len = scene.info.device_id.size();
      const bool fits = is_query ? answer.size <= 57 : answer.size == id_len;
      EXPECT_TRUE(answer.result != TEEC_SUCCESS || fits) << answer.size;
    }
    return false;
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
    // A TA that is refused before it is recorded has no image.
    const bool is_handed_over = outcome.response && reply.image;
    EXPECT_TRUE(!is_handed_over || outcome.response->members.contains("taid"));
    EXPECT_TRUE(answer.size == used || (reply.status != 0 && answer.size == told)) << answer.size;
  }

  FaultReport run_point(const FaultKind &kind, unsigned n) {
    SCOPED_TRACE(std::string(kind.name) + " " + std::to_string(n));
    tee::test::TraceSink log;
    Scene scene(origin_, start_);
    tee::test::Device &host = scene.device.host();
    host.create_at_once(kind.create_at_once);
    if (scenario_.ask != Ask::kCreation) scene.device.open();
    host.fail(kAgentUuid, kind.fault, n, kind.and_after, kind.code);
    log.clear();
    const bool passed = perform(scene);
    said_.insert(said(log));
    const FaultReport report = host.fault_report();
    SCOPED_TRACE(report.call);
    host.clear_faults();
    const bool was_cut = kind.fault == Fault::kPowerCut && report.fired;
    if (was_cut) host.restore_power();
    const Records left = records_of(scene.device, before_);
    check_what_is_left(scene, whole(left));
    // How life goes on after a restart depends on what is stored alone.
    const bool is_new_cut = was_cut && lived_on_.insert({report.call, left}).second;
    if (survived_.insert(left).second || is_new_cut) {
      Scene restarted(origin_, scene.device.snapshot());
      check_life_goes_on(restarted);
      if (is_new_cut) live_on(restarted);
    }
    if (!was_cut) check_instance(scene, left, passed);
    return report;
  }

  void check_what_is_left(Scene &scene, const Records &left) {
    const bool orderly = std::ranges::any_of(orderly_, [&](Records state) {
      for (const std::string &id : scenario_.may_stay) {
        if (left.contains(id)) state[id] = left.at(id);
      }
      return state == left;
    });
    EXPECT_TRUE(orderly) << testing::PrintToString(left);
    const bool created = scenario_.ask != Ask::kCreation || scene.device.open();
    EXPECT_TRUE(created);
    scene.device.expect_clean();
  }

  /// Without a restart: what is announced is what is stored, and no SD loses its SP.
  void check_instance(Scene &scene, const Records &left, bool passed) {
    const Reply reply = scene.device.send(1, state_request_, scene.capacity);
    EXPECT_EQ(reply.status, 0u);
    // Entries that got lost, or came too early, show in the length.
    if (!went_on_.insert({left, reply.response.size() + (passed ? 1 : 0)}).second) return;
    ASSERT_TRUE(scene.get_device_state().passed());
    if (passed || scenario_.id != MessageId::kUpdateSd) expect_stored_aiks(scene, passed);
    const bool asks = scenario_.ask == Ask::kMessage;
    const bool is_done = asks && scene.run(scenario_.id, options_).passed();
    ASSERT_TRUE(scene.get_device_state().passed());
    if (is_done) expect_stored_aiks(scene, true);
    const Records records = records_of(scene.device);
    for (const std::string &name : scene.sd_names()) (void)scene.delete_sd(name, "false");
    const Json list = json_of(scene.device, "SD_LIST_ID");
    for (const Json &name : list.value("sd_list", Json::array())) {
      const Json sd = json_of(scene.device, "SD_INFO_" + name.get<std::string>());
      const std::string sp = "SP_INFO_" + sd.value("spid", "");
      EXPECT_EQ(scene.device.record(sp).has_value(), records.contains(sp)) << sd;
    }
    scene.device.expect_clean();
  }

  /// An announced key that is not stored is a failure's; the next attempt puts its own there.
  static void expect_stored_aiks(const Scene &scene, bool is_whole) {
    for (const Json &aik : scene.aik_list()) {
      const std::string stored = stored_aik(scene.device, aik.at("spid"));
      if (!is_whole && stored.empty()) continue;
      EXPECT_EQ(aik.at("spaik"), stored) << aik.at("spid");
    }
  }

  /// What the request was about can be had again. A TA that InstallTA takes for one that is there,
  /// though part of it may be missing, is deleted first, whatever DeleteTA says.
  void check_all_can_be_had(Scene &scene) {
    std::string spid = options_.spid;
    std::set<std::string> tas = {options_.taid};
    for (const Json &sd : origin_.sd_list()) {
      if (sd["name"] != options_.sdname) continue;
      spid = sd["spid"];
      for (const Json &ta : sd["talist"]) tas.insert(ta["taid"]);
    }
    const bool is_gone = std::ranges::count(scene.sd_names(), options_.sdname) == 0;
    EXPECT_TRUE(!is_gone || scene.create_sd(spid, options_.sdname).passed());
    tas.erase("");
    for (const std::string &ta : tas) {
      if (!scene.install_ta(spid, options_.sdname, ta).passed()) {
        scene.get_device_state();
        scene.delete_ta(options_.sdname, ta);
        scene.get_device_state();
        EXPECT_TRUE(scene.install_ta(spid, options_.sdname, ta).passed());
      }
      EXPECT_TRUE(scene.get_ta_info(spid, ta).passed());
    }
  }

  /// After a restart the device tells its state, and the request can be made again or is done.
  void check_life_goes_on(Scene &scene) {
    ASSERT_TRUE(scene.device.open());
    ASSERT_TRUE(scene.send(MessageId::kGetDeviceState, state_request_).response);
    expect_stored_aiks(scene, true);
    if (scenario_.ask != Ask::kMessage) return;
    const Outcome again = scene.run(scenario_.id, options_);
    EXPECT_TRUE(again.passed() || scenario_.done_codes.contains(again.code()))
        << std::hex << again.code();
    scene.device.expect_clean();
    // An SP that had its AIK before the failure is in the device state again from here on.
    ASSERT_TRUE(scene.device.restart());
    ASSERT_TRUE(scene.send(MessageId::kGetDeviceState, state_request_).response);
    EXPECT_EQ(state_of(scene), final_);
    if (!options_.sdname.empty()) check_all_can_be_had(scene);
  }

  const Scenario &scenario_;
  Scene origin_;
  tsm::RequestOptions options_;
  std::string request_;
  std::string state_request_;
  Snapshot snapshot_;
  Snapshot start_;  // with records as long as a kind of fault wants them
  Records before_;
  std::set<Records> orderly_;
  std::set<Records> survived_;
  std::set<std::pair<Records, size_t>> went_on_;        // and a length
  std::set<std::pair<std::string, Records>> lived_on_;  // what a cut met, and left
  std::set<std::string> said_;
  std::set<std::string> final_;
};

Sweep::Sweep(const Scenario &scenario) : driver_(std::make_unique<Driver>(scenario)) {}

Sweep::~Sweep() = default;

unsigned Sweep::run(const FaultKind &kind) {
  return driver_->run(kind);
}

const std::set<std::string> &Sweep::log_rows() const {
  return driver_->log_rows();
}

}  // namespace otrp_test
