// SPDX-License-Identifier: BSD-2-Clause
#include "faults/sweep.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>

#include "tsm/dsi.h"

namespace otrp_test {
namespace {

using tee::test::Fault;
using Records = std::map<std::string, std::string>;

constexpr uint32_t kStatusQueryCommand = 1;
constexpr uint32_t kDeviceIdCommand = 2;
constexpr size_t kCapacity = 1 << 16;

/// Payloads by ID. An object without a complete payload counts as one that is not there, as it does
/// for the agent.
Records payloads_of(const AgentDevice &device) {
  Records records;
  for (const auto &[id, raw] : device.objects()) {
    const auto payload = device.record(id);
    if (payload && !payload->empty()) records[id] = *payload;
  }
  return records;
}

/// The same; of an AIK that is not in `before` only counts that it is a new one.
Records records_of(const AgentDevice &device, const Records &before) {
  Records records = payloads_of(device);
  for (auto &[id, text] : records) {
    const auto old = before.find(id);
    if (!id.starts_with("SP_INFO_") || (old != before.end() && old->second == text)) continue;
    Json record = Json::parse(text);
    record["aik"] = "new";
    text = record.dump();
  }
  return records;
}

std::string query_frame(const std::string &ta) {
  const std::string text = R"({"taid":")" + ta + "\"}";
  return word(0) + word(static_cast<uint32_t>(text.size())) + text;
}

/// The state without its order, and without the keys.
std::set<std::string> state_of(const Scene &scene) {
  std::set<std::string> state;
  const Json &tee = scene.dsi.at("dsi").at("tee");
  for (const Json &sd : tee.at("sdlist").at("sd")) state.insert(sd.dump());
  for (const Json &aik : tee.at("teeaiklist")) state.insert(aik.at("spid").dump());
  return state;
}

class Sweep {
 public:
  Sweep(const Scenario &scenario, const FaultKind &kind) : scenario_(scenario), kind_(kind) {
    const tee::test::TraceSink log;
    scenario.prepare(origin_);
    restart_origin();
    request_ = origin_.request(scenario.id, scenario.options);
    state_request_ = origin_.request(MessageId::kGetDeviceState, {});
    snapshot_ = origin_.device.snapshot();
    before_ = payloads_of(origin_.device);
    learn_good_run();
  }

  unsigned run() {
    unsigned n = 1;
    while (run_point(n) && !testing::Test::HasFailure()) ++n;
    return n - 1;
  }

 private:
  /// A new instance lists the SDs in another order, and the request is one for that.
  void restart_origin() {
    if (origin_.dsi_text.empty()) return;
    ASSERT_TRUE(origin_.device.restart());
    ASSERT_TRUE(origin_.get_device_state().response);
  }

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
    switch (scenario_.ask) {
      case Ask::kCreation:
        scene.device.open();
        return;
      case Ask::kStatusQuery:
        return check_query(scene.device.invoke(kStatusQueryCommand, query_frame(taid("ta1")), 57));
      case Ask::kDeviceId: {
        const Answer answer = scene.device.invoke(kDeviceIdCommand, "", 100);
        EXPECT_TRUE(answer.result != TEEC_SUCCESS || answer.size == scene.info.device_id.size());
        return;
      }
      case Ask::kMessage:
        return check_frame(scene.send(scenario_.id, request_));
    }
  }

  static void check_query(const Answer &answer) {
    EXPECT_TRUE(answer.result != TEEC_SUCCESS || answer.size <= answer.buffer.size());
  }

  /// Either a code and no response, or a response, which Scene::send() has verified.
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
    const size_t image_len = reply.image ? reply.image->size() : 0;
    const size_t used = 8 + reply.response.size() + (reply.image ? 4 + image_len : 0);
    const size_t told = 8 + 4 + scenario_.options.image.size();
    EXPECT_TRUE(answer.size == used || (reply.status != 0 && answer.size == told)) << answer.size;
  }

  bool run_point(unsigned n) {
    SCOPED_TRACE(std::string(scenario_.name) + ", " + kind_.name + " " + std::to_string(n));
    const tee::test::TraceSink log;
    Scene scene(origin_, snapshot_);
    tee::test::Device &host = scene.device.host();
    if (scenario_.ask != Ask::kCreation) scene.device.open();
    host.fail(kAgentUuid, kind_.fault, n, kind_.and_after);
    perform(scene);
    const tee::test::FaultReport report = host.fault_report();
    SCOPED_TRACE(report.call);
    host.clear_faults();
    if (kind_.fault == Fault::kPowerCut) host.restore_power();
    check_what_is_left(scene);
    // How life goes on depends on what is stored alone.
    if (survived_.insert(records_of(scene.device, before_)).second) check_life_goes_on(scene);
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
    const Outcome again = scene.run(scenario_.id, scenario_.options);
    const bool accepted = again.passed() || (again.response && again.response->status.empty());
    EXPECT_TRUE(accepted || scenario_.done_codes.contains(again.code()))
        << std::hex << again.code();
    scene.device.expect_clean();
    // An SP that had its AIK before the failure is in the device state again from here on.
    ASSERT_TRUE(scene.device.restart());
    ASSERT_TRUE(scene.send(MessageId::kGetDeviceState, state_request_).response);
    EXPECT_EQ(state_of(scene), final_);
  }

  const Scenario &scenario_;
  const FaultKind &kind_;
  Scene origin_;
  std::string request_;
  std::string state_request_;
  Snapshot snapshot_;
  Records before_;
  std::set<Records> orderly_;
  std::set<Records> survived_;
  std::set<std::string> final_;
};

// ---- Scenarios

void nothing(Scene &) {}

void no_objects(Scene &scene) {
  scene.device.close();
  scene.device.host().remove_object(kAgentUuid, "SD_LIST_ID");
}

void known_tsm(Scene &scene) {
  ASSERT_TRUE(scene.get_device_state().response);
}

void one_sp(Scene &scene) {
  known_tsm(scene);
  ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
}

// Two SDs for one SP, two TAs in the first; one SD of another SP.
void furnished(Scene &scene) {
  one_sp(scene);
  ASSERT_TRUE(scene.create_sd("sp1", "sd2").passed());
  ASSERT_TRUE(scene.create_sd("sp2", "sd3").passed());
  ASSERT_TRUE(scene.install_ta("sp1", "sd1", taid("ta1")).passed());
  ASSERT_TRUE(scene.install_ta("sp1", "sd1", taid("ta2")).passed());
}

const std::string kStale(64, '0');
constexpr uint32_t kMismatch = 0xDEAD0001;
constexpr uint32_t kSdExists = 0xDEAD0002;
constexpr uint32_t kTaExists = 0xDEAD0008;
constexpr uint32_t kSdNotListed = 0xDEAD000E;

}  // namespace

unsigned sweep(const Scenario &scenario, const FaultKind &kind) {
  // Once: each call would begin with new keys.
  [[maybe_unused]] static const bool is_reusing = (tee::test::reuse_generated_keys(7), true);
  return Sweep(scenario, kind).run();
}

const std::vector<Scenario> &scenarios() {
  static const std::vector<Scenario> all = {
      {"FirstCreation", no_objects, Ask::kCreation},
      {"Creation", furnished, Ask::kCreation},
      {"StatusQuery", furnished, Ask::kStatusQuery},
      {"DeviceId", nothing, Ask::kDeviceId},
      {"GetDeviceState", nothing, Ask::kMessage, MessageId::kGetDeviceState},
      {"CreateSd",
       known_tsm,
       Ask::kMessage,
       MessageId::kCreateSd,
       {.spid = "sp1", .sdname = "sd1", .spcert = "certificate"},
       {kSdExists}},
      {"CreateSdKnownSp",
       furnished,
       Ask::kMessage,
       MessageId::kCreateSd,
       {.spid = "sp1", .sdname = "sd4", .spcert = "certificate"},
       {kSdExists}},
      {"CreateSdRefused",
       one_sp,
       Ask::kMessage,
       MessageId::kCreateSd,
       {.dsihash = kStale, .spid = "sp1", .sdname = "sd4", .spcert = "certificate"},
       {kMismatch}},
      {"UpdateSd",
       furnished,
       Ask::kMessage,
       MessageId::kUpdateSd,
       {.spid = "sp1", .sdname = "sd2", .spcert = "renewed", .renew_aik = true}},
      {"DeleteSd",
       furnished,
       Ask::kMessage,
       MessageId::kDeleteSd,
       {.sdname = "sd1", .deleteta = "true"},
       {kSdNotListed},
       {"TA_INFO_" + taid("ta1"), "TA_INFO_" + taid("ta2")}},
      {"DeleteLastSd",
       furnished,
       Ask::kMessage,
       MessageId::kDeleteSd,
       {.sdname = "sd3", .deleteta = "false"},
       {kSdNotListed}},
      {"InstallTa",
       furnished,
       Ask::kMessage,
       MessageId::kInstallTa,
       {.spid = "sp1",
        .sdname = "sd2",
        .taid = taid("ta3"),
        .ta_version = "1",
        .image = make_image(100)},
       {kTaExists}},
      {"InstallTaRefused",
       furnished,
       Ask::kMessage,
       MessageId::kInstallTa,
       {.spid = "sp1",
        .sdname = "sd1",
        .taid = taid("ta1"),
        .ta_version = "1",
        .image = make_image(100)},
       {kTaExists}},
      {"UpdateTa",
       furnished,
       Ask::kMessage,
       MessageId::kUpdateTa,
       {.spid = "sp1",
        .sdname = "sd1",
        .taid = taid("ta1"),
        .ta_version = "2",
        .image = make_image(100)}},
      {"DeleteTa",
       furnished,
       Ask::kMessage,
       MessageId::kDeleteTa,
       {.sdname = "sd1", .taid = taid("ta1")},
       {TEEC_ERROR_ITEM_NOT_FOUND}},
      {"GetTaInfo",
       furnished,
       Ask::kMessage,
       MessageId::kGetTaInfo,
       {.spid = "sp1", .taid = taid("ta1")}},
  };
  return all;
}

}  // namespace otrp_test
