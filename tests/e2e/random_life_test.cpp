// SPDX-License-Identifier: BSD-2-Clause
// Random requests, good ones and refused ones, against a small model of what the device must keep.
#include <gtest/gtest.h>

#include <algorithm>
#include <random>

#include "support/scene.h"
#include "tsm/image.h"

namespace otrp_test {
namespace {

using Names = std::vector<std::string>;

const std::string kRegister = "OTRP_TA_REGISTER_INFO";

void remove_by_swap(Names *list, const std::string &name) {
  const auto at = std::ranges::find(*list, name);
  *at = list->back();
  list->pop_back();
}

struct Sd {
  std::string spid;
  std::string tsmid;
  Names tas;
};

struct Model {
  std::map<std::string, Sd> sds;
  Names list;      // SDs as the stored list has them
  Names dsi_sds;   // SDs as the device state has them
  Names dsi_aiks;  // SPs with an AIK, in the device state's order
  std::map<std::string, std::string> sp_certs;
  std::map<std::string, std::string> ta_records;
  std::vector<std::pair<std::string, std::string>> rows;  // taid and digest
  bool has_register = false;

  void refresh(const std::string &sd) {
    remove_by_swap(&dsi_sds, sd);
    dsi_sds.push_back(sd);
  }

  void restart() {
    dsi_sds = list;
    dsi_aiks.clear();
    for (const std::string &sd : list) {
      const std::string &spid = sds[sd].spid;
      if (std::ranges::find(dsi_aiks, spid) == dsi_aiks.end()) dsi_aiks.push_back(spid);
    }
  }

  bool has_row(const std::string &ta) const {
    return std::ranges::any_of(rows, [&](const auto &row) { return row.first == ta; });
  }
};

std::string talist_text(const Names &tas) {
  std::string text;
  for (const std::string &ta : tas) {
    text += (text.empty() ? "" : ",") + (R"({"taid":")" + ta + R"(","taname":")") + ta + "\"}";
  }
  return "[" + text + "]";
}

class RandomLife : public testing::Test {
 protected:
  static constexpr uint32_t kSeed = 20161;

  size_t below(size_t limit) { return std::uniform_int_distribution<size_t>(0, limit - 1)(random); }
  bool chance(unsigned percent) { return below(100) < percent; }
  const std::string &any_of(const Names &names) { return names[below(names.size())]; }

  void change_tsm() { scene.use_tsm(chance(50) ? "tsm1" : "tsm2"); }

  /// Sends the request, spoiled or with a stale hash once in a while.
  Outcome send(MessageId id, tsm::RequestOptions options) {
    if (chance(8)) options.dsihash = std::string(64, '0');
    std::string text = scene.request(id, options);
    if (chance(5)) text[text.find("payload") + 40] ^= 1;
    return scene.send(id, text);
  }

  /// A failure after the records were written says nothing of the new device state.
  void end_of(const Outcome &outcome) {
    ++num_passed;
    EXPECT_TRUE(outcome.passed() || scene.get_device_state().response);
  }

  void create_sd() {
    const std::string sd = "sd" + std::to_string(below(9));
    const std::string sp = "sp" + std::to_string(below(3));
    const std::string cert = "cert " + std::to_string(below(1000));
    if (!send(MessageId::kCreateSd, {.spid = sp, .sdname = sd, .spcert = cert}).passed()) return;
    ++num_passed;
    EXPECT_FALSE(model.sds.contains(sd));
    model.sds[sd] = {sp, scene.tsm().tsmid, {}};
    model.list.push_back(sd);
    model.dsi_sds.push_back(sd);
    if (model.sp_certs.emplace(sp, cert).second) model.dsi_aiks.push_back(sp);
  }

  void update_sd(const std::string &sd) {
    const std::string &sp = model.sds[sd].spid;
    const bool renew = chance(60);
    const std::string cert = "renewed " + std::to_string(below(1000));
    if (!send(MessageId::kUpdateSd, {.spid = sp, .sdname = sd, .spcert = cert, .renew_aik = renew})
             .passed()) {
      return;
    }
    ++num_passed;
    if (!renew) return;
    model.sp_certs[sp] = cert;
    remove_by_swap(&model.dsi_aiks, sp);
    model.dsi_aiks.push_back(sp);
  }

  void install_ta(const std::string &sd) {
    Sd &target = model.sds[sd];
    const std::string ta = taid("ta" + std::to_string(below(12)));
    const std::string image = make_image(200, static_cast<uint32_t>(below(1000)));
    const Outcome outcome =
        send(MessageId::kInstallTa,
             {.spid = target.spid, .sdname = sd, .taid = ta, .ta_version = "1", .image = image});
    if (!outcome.reply.image) return;
    // The records are written before the register has its say.
    EXPECT_EQ(outcome.passed(), !model.has_row(ta));
    EXPECT_EQ(outcome.reply.image, image);
    EXPECT_EQ(std::ranges::count(target.tas, ta), 0);
    target.tas.push_back(ta);
    model.ta_records[ta] = R"({"spid":")" + target.spid + R"(","sdid":")" + sd + R"(","taid":")" +
                           ta + R"(","ta_version":"1"})";
    model.refresh(sd);
    model.has_register = true;
    if (outcome.passed()) model.rows.emplace_back(ta, tsm::parse_image(image)->digest);
    end_of(outcome);
  }

  void delete_ta(const std::string &sd) {
    Sd &target = model.sds[sd];
    if (target.tas.empty()) return;
    const std::string ta = any_of(target.tas);
    if (!model.ta_records.contains(ta)) return;  // stops half way, which is not modelled here
    const Outcome outcome = send(MessageId::kDeleteTa, {.sdname = sd, .taid = ta});
    if (!outcome.response || !outcome.response->members.contains("taid")) return;
    EXPECT_EQ(target.tsmid, scene.tsm().tsmid);
    EXPECT_EQ(outcome.passed(), model.has_row(ta));
    remove_by_swap(&target.tas, ta);
    model.ta_records.erase(ta);
    model.refresh(sd);
    std::erase_if(model.rows, [&](const auto &row) { return row.first == ta; });
    end_of(outcome);
  }

  void delete_sd(const std::string &sd) {
    const Sd target = model.sds[sd];
    const bool with_tas = chance(60);
    const bool complete = std::ranges::all_of(
        target.tas, [&](const std::string &ta) { return model.ta_records.contains(ta); });
    if (with_tas && !complete) return;  // the same
    if (!send(MessageId::kDeleteSd, {.sdname = sd, .deleteta = with_tas ? "true" : "false"})
             .passed()) {
      return;
    }
    ++num_passed;
    EXPECT_EQ(target.tsmid, scene.tsm().tsmid);
    model.sds.erase(sd);
    remove_by_swap(&model.list, sd);
    remove_by_swap(&model.dsi_sds, sd);
    if (with_tas) {
      for (const std::string &ta : target.tas) model.ta_records.erase(ta);
    }
    const bool last = std::ranges::none_of(
        model.sds, [&](const auto &entry) { return entry.second.spid == target.spid; });
    if (!last) return;
    model.sp_certs.erase(target.spid);
    remove_by_swap(&model.dsi_aiks, target.spid);
  }

  void step() {
    change_tsm();
    const size_t choice = below(100);
    if (model.sds.empty() || choice < 25) return create_sd();
    const std::string sd = any_of(model.list);
    if (choice < 50) return install_ta(sd);
    if (choice < 60) return update_sd(sd);
    if (choice < 75) return delete_ta(sd);
    if (choice < 90) return delete_sd(sd);
    if (choice < 95) {
      ASSERT_TRUE(scene.device.restart());
      model.restart();
    }
    ASSERT_TRUE(scene.get_device_state().response);
  }

  /// Records, device state and the known answer are those of the model.
  void expect_as_modelled() {
    std::map<std::string, std::string> expected = {{"SD_LIST_ID", list_text()}};
    for (const auto &[name, sd] : model.sds) {
      expected["SD_INFO_" + name] = R"({"name":")" + name + R"(","spid":")" + sd.spid +
                                    R"(","tsmid":")" + sd.tsmid + R"(","talist":)" +
                                    talist_text(sd.tas) + "}";
    }
    for (const auto &[ta, text] : model.ta_records) expected["TA_INFO_" + ta] = text;
    if (model.has_register) {
      std::string rows = word(static_cast<uint32_t>(model.rows.size()));
      for (const auto &[ta, digest] : model.rows) rows += ta + digest;
      expected[kRegister] = rows;
    }
    std::map<std::string, std::string> stored;
    std::map<std::string, std::string> certs;
    for (const auto &[id, raw] : scene.device.objects()) {
      const std::string payload = scene.device.record(id).value();
      if (id.starts_with("SP_INFO_")) {
        certs[id.substr(8)] = Json::parse(payload)["spcert"];
      } else if (!id.starts_with("TSM_INFO_")) {
        stored[id] = payload;
      }
    }
    EXPECT_EQ(stored, expected);
    EXPECT_EQ(certs, model.sp_certs);
  }

  void expect_device_state() {
    EXPECT_EQ(scene.sd_names(), model.dsi_sds);
    const Json &tee = scene.dsi["dsi"]["tee"];
    for (const Json &sd : tee["sdlist"]["sd"]) {
      EXPECT_EQ(sd["talist"].dump(), talist_text(model.sds[sd["name"]].tas));
    }
    Names spids;
    for (const Json &aik : tee["teeaiklist"]) spids.push_back(aik["spid"]);
    EXPECT_EQ(spids, model.dsi_aiks);
  }

  std::string list_text() const {
    Json list = {{"sd_list", model.list}};
    return list.dump();
  }

  std::mt19937 random{kSeed};
  Scene scene;
  Model model;
  int num_passed = 0;
};

TEST_F(RandomLife, RecordsAndDeviceStateFollowTheModel) {
  const tee::test::TraceSink log;
  scene.use_tsm("tsm2");
  ASSERT_TRUE(scene.get_device_state().response);
  scene.use_tsm("tsm1");
  ASSERT_TRUE(scene.get_device_state().response);
  for (int i = 0; i < 500 && !HasFailure(); ++i) {
    SCOPED_TRACE(i);
    step();
    expect_as_modelled();
    expect_device_state();
    scene.device.expect_clean();
  }
  EXPECT_GT(num_passed, 200);
}

TEST(ManyRequests, LeaveTheHeapAsItWas) {
  const tee::test::TraceSink log;
  Scene scene;
  ASSERT_TRUE(scene.get_device_state().response);
  ASSERT_TRUE(scene.create_sd("sp", "stays").passed());
  const std::string ta = taid("ta");
  uint32_t in_use = 0;
  for (int i = 0; i < 200 && !testing::Test::HasFailure(); ++i) {
    SCOPED_TRACE(i);
    EXPECT_TRUE(scene.create_sd("sp", "goes").passed());
    EXPECT_TRUE(scene.install_ta("sp", "goes", ta).passed());
    EXPECT_FALSE(scene.install_ta("sp", "goes", ta).passed());
    EXPECT_EQ(scene.device.send(4, "{}").status, 0xDEAD0006u);
    EXPECT_TRUE(scene.update_ta("sp", "goes", ta).passed());
    EXPECT_TRUE(scene.get_ta_info("sp", ta).response);
    EXPECT_FALSE(scene.update_sd("sp", "no such SD").passed());
    EXPECT_TRUE(scene.delete_ta("goes", ta).passed());
    EXPECT_TRUE(scene.delete_sd("goes", "true").passed());
    EXPECT_TRUE(scene.get_device_state().response);
    scene.device.expect_clean();
    const uint32_t now = scene.device.stats().in_use;
    if (i == 0) in_use = now;
    EXPECT_EQ(now, in_use);
  }
}

}  // namespace
}  // namespace otrp_test
