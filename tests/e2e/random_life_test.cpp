// SPDX-License-Identifier: BSD-2-Clause
// Random requests, good ones and refused ones, against a small model of what the device must keep.
#include <gtest/gtest.h>

#include <algorithm>
#include <random>

#include "support/scene.h"
#include "tsm/protocol/image.h"

namespace otrp_test {
namespace {

using Names = std::vector<std::string>;
using Records = std::map<std::string, std::string>;

void remove_by_swap(Names *list, const std::string &name) {
  const auto at = std::ranges::find(*list, name);
  *at = list->back();
  list->pop_back();
}

Json talist_of(const Names &tas) {
  Json list = Json::array();
  for (const std::string &ta : tas) list.push_back({{"taid", ta}, {"taname", ta}});
  return list;
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
  std::map<std::string, Json> tas;
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

  auto row_of(const std::string &ta) {
    return std::ranges::find(rows, ta, &std::pair<std::string, std::string>::first);
  }

  /// Payloads by ID. An AIK is not foreseen.
  Records records() const {
    Records all = {{"SD_LIST_ID", Json({{"sd_list", list}}).dump()}};
    for (const auto &[name, sd] : sds) {
      const Json talist = talist_of(sd.tas);
      const Json record = {
          {"name", name}, {"spid", sd.spid}, {"tsmid", sd.tsmid}, {"talist", talist}};
      all["SD_INFO_" + name] = record.dump();
    }
    for (const auto &[spid, cert] : sp_certs) {
      all["SP_INFO_" + spid] = Json({{"spid", spid}, {"spcert", cert}, {"aik", "*"}}).dump();
    }
    for (const auto &[ta, record] : tas) all["TA_INFO_" + ta] = record.dump();
    std::string text = word(static_cast<uint32_t>(rows.size()));
    for (const auto &[ta, digest] : rows) text += ta + digest;
    if (has_register) all["OTRP_TA_REGISTER_INFO"] = text;
    return all;
  }
};

class RandomLife : public testing::Test {
 protected:
  size_t below(size_t limit) { return std::uniform_int_distribution<size_t>(0, limit - 1)(random); }
  bool chance(unsigned percent) { return below(100) < percent; }
  const std::string &any_of(const Names &names) { return names[below(names.size())]; }
  std::string any(const char *prefix, size_t limit) {
    return prefix + std::to_string(below(limit));
  }

  /// Sends the request, spoiled or with a stale hash once in a while.
  Outcome send(MessageId id, tsm::RequestOptions options) {
    if (chance(8)) options.dsihash = std::string(64, '0');
    std::string text = scene.request(id, options);
    if (chance(5)) text[text.find("payload") + 40] ^= 1;
    const Outcome outcome = scene.send(id, text);
    num_passed += outcome.passed();
    return outcome;
  }

  /// A failure after the records were written says nothing of the new device state.
  void end_of(const Outcome &outcome) {
    EXPECT_TRUE(outcome.passed() || scene.get_device_state().passed());
  }

  void create_sd() {
    const std::string sd = any("sd", 9), sp = any("sp", 3), cert = any("cert ", 1000);
    if (!send(MessageId::kCreateSd, {.spid = sp, .sdname = sd, .spcert = cert}).passed()) return;
    EXPECT_FALSE(model.sds.contains(sd));
    model.sds[sd] = {sp, scene.tsm().tsmid, {}};
    model.list.push_back(sd);
    model.dsi_sds.push_back(sd);
    if (model.sp_certs.emplace(sp, cert).second) model.dsi_aiks.push_back(sp);
  }

  void update_sd(const std::string &sd) {
    const std::string &sp = model.sds[sd].spid;
    const bool renew = chance(60);
    const std::string cert = any("renewed ", 1000);
    const Outcome outcome =
        send(MessageId::kUpdateSd, {.spid = sp, .sdname = sd, .spcert = cert, .renew_aik = renew});
    if (!outcome.passed()) return;
    EXPECT_EQ(model.sds[sd].tsmid, scene.tsm().tsmid);
    if (!renew) return;
    model.sp_certs[sp] = cert;
    remove_by_swap(&model.dsi_aiks, sp);
    model.dsi_aiks.push_back(sp);
  }

  // The records are written before the register has its say.
  void bring_ta(MessageId id, const std::string &sd, const std::string &ta) {
    Sd &target = model.sds[sd];
    const bool is_new = id == MessageId::kInstallTa;
    const char *version = is_new ? "1" : "2";
    const std::string image = make_image(200, static_cast<uint32_t>(below(1000)));
    const Outcome outcome = send(
        id, {.spid = target.spid, .sdname = sd, .taid = ta, .ta_version = version, .image = image});
    if (!outcome.reply.image) return;
    EXPECT_EQ(outcome.reply.image, image);
    const auto row = model.row_of(ta);
    const bool has_row = row != model.rows.end();
    EXPECT_EQ(outcome.passed(), has_row != is_new);
    EXPECT_EQ(std::ranges::count(target.tas, ta), is_new ? 0 : 1);
    model.tas[ta] = {{"spid", target.spid}, {"sdid", sd}, {"taid", ta}, {"ta_version", version}};
    const std::string digest = tsm::parse_image(image)->digest;
    if (is_new) {
      target.tas.push_back(ta);
      model.refresh(sd);
      model.has_register = true;
      if (!has_row) model.rows.emplace_back(ta, digest);
    } else if (has_row) {
      row->second = digest;
    }
    end_of(outcome);
  }

  void install_ta(const std::string &sd) {
    bring_ta(MessageId::kInstallTa, sd, taid(any("ta", 12)));
  }

  void update_ta(const std::string &sd) {
    const Names &tas = model.sds[sd].tas;
    if (!tas.empty()) bring_ta(MessageId::kUpdateTa, sd, any_of(tas));
  }

  void delete_ta(const std::string &sd) {
    Sd &target = model.sds[sd];
    if (target.tas.empty()) return;
    const std::string ta = any_of(target.tas);
    if (!model.tas.contains(ta)) return;  // stops half way, which is not modelled here
    const Outcome outcome = send(MessageId::kDeleteTa, {.sdname = sd, .taid = ta});
    if (!outcome.response || !outcome.response->members.contains("taid")) return;
    EXPECT_EQ(target.tsmid, scene.tsm().tsmid);
    EXPECT_EQ(outcome.passed(), model.row_of(ta) != model.rows.end());
    remove_by_swap(&target.tas, ta);
    model.tas.erase(ta);
    model.refresh(sd);
    std::erase_if(model.rows, [&](const auto &row) { return row.first == ta; });
    end_of(outcome);
  }

  void delete_sd(const std::string &sd) {
    const Sd target = model.sds[sd];
    const bool with_tas = chance(60);
    const bool complete = std::ranges::all_of(
        target.tas, [&](const std::string &ta) { return model.tas.contains(ta); });
    if (with_tas && !complete) return;  // the same
    const char *deleteta = with_tas ? "true" : "false";
    if (!send(MessageId::kDeleteSd, {.sdname = sd, .deleteta = deleteta}).passed()) return;
    EXPECT_EQ(target.tsmid, scene.tsm().tsmid);
    model.sds.erase(sd);
    remove_by_swap(&model.list, sd);
    remove_by_swap(&model.dsi_sds, sd);
    for (const std::string &ta : with_tas ? target.tas : Names()) model.tas.erase(ta);
    const bool is_last = std::ranges::none_of(
        model.sds, [&](const auto &entry) { return entry.second.spid == target.spid; });
    if (!is_last) return;
    model.sp_certs.erase(target.spid);
    remove_by_swap(&model.dsi_aiks, target.spid);
  }

  void step() {
    scene.use_tsm(chance(50) ? "tsm1" : "tsm2");
    const size_t choice = below(100);
    if (model.sds.empty() || choice < 25) return create_sd();
    const std::string sd = any_of(model.list);
    if (choice < 45) return install_ta(sd);
    if (choice < 55) return update_ta(sd);
    if (choice < 65) return update_sd(sd);
    if (choice < 77) return delete_ta(sd);
    if (choice < 90) return delete_sd(sd);
    if (choice < 95) {
      ASSERT_TRUE(scene.device.restart());
      model.restart();
    }
    ASSERT_TRUE(scene.get_device_state().passed());
  }

  Records stored_records() {
    Records records;
    for (const auto &[id, raw] : scene.device.objects()) {
      std::string payload = scene.device.record(id).value();
      if (id.starts_with("SP_INFO_")) {
        Json record = Json::parse(payload);
        record["aik"] = "*";
        payload = record.dump();
      }
      if (!id.starts_with("TSM_INFO_")) records[id] = payload;
    }
    return records;
  }

  void expect_device_state() {
    EXPECT_EQ(scene.sd_names(), model.dsi_sds);
    for (const Json &sd : scene.sd_list()) {
      EXPECT_EQ(sd["talist"], talist_of(model.sds[sd["name"]].tas));
    }
    Names spids;
    for (const Json &aik : scene.aik_list()) spids.push_back(aik["spid"]);
    EXPECT_EQ(spids, model.dsi_aiks);
  }

  const tee::test::TraceSink log;
  std::mt19937 random{20161};
  Scene scene;
  Model model;
  int num_passed = 0;
};

TEST_F(RandomLife, RecordsAndDeviceStateFollowTheModel) {
  for (const char *tsmid : {"tsm2", "tsm1"}) {
    scene.use_tsm(tsmid);
    ASSERT_TRUE(scene.get_device_state().passed());
  }
  for (int i = 0; i < 500 && !HasFailure(); ++i) {
    SCOPED_TRACE(i);
    step();
    EXPECT_EQ(stored_records(), model.records());
    expect_device_state();
    scene.device.expect_clean();
  }
  EXPECT_GT(num_passed, 150);
}

}  // namespace
}  // namespace otrp_test
