// SPDX-License-Identifier: BSD-2-Clause
// Whatever storage holds: the instance starts or refuses to start, every message is answered with a
// code, and nothing else is written.
#include <gtest/gtest.h>

#include "support/scene.h"
#include "tsm/crypto.h"

namespace otrp_test {
namespace {

std::string with_length(uint32_t len, const std::string &payload) {
  return word(len) + payload;
}

std::string stored(const std::string &payload) {
  return with_length(static_cast<uint32_t>(payload.size()), payload);
}

std::string nested(int levels) {
  return std::string(static_cast<size_t>(levels), '[') +
         std::string(static_cast<size_t>(levels), ']');
}

std::string box_record(uint16_t type, const std::string &value) {
  return tsm::little_endian(type, 2) + tsm::little_endian(value.size(), 2) + value;
}

std::string sp_record(const std::string &box) {
  return stored(
      Json({{"spid", "sp1"}, {"spcert", "c"}, {"aik", tools::base64_encode(box)}}).dump());
}

// Objects that fit any record: raw data streams.
std::map<std::string, std::string> any_record() {
  std::map<std::string, std::string> data = {
      {"Nothing", ""},
      {"NoWholeLength", "\1\0"},
      {"Empty", stored("")},
      {"NoJson", stored("no JSON")},
      {"OpenString", stored("{\"name\":\"")},
      {"AnArray", stored("[]")},
      {"AnObject", stored("{}")},
      {"AString", stored("\"name\"")},
      {"TwentyLevels", stored(nested(20))},
      {"TwentyOneLevels", stored(nested(21))},
      {"LengthBeyondTheObject", with_length(1000, "{}")},
      {"LargestLength", with_length(0xFFFFFFFF, "{}")},
      {"AlmostLargestLength", with_length(0xFFFFFFFE, "{}")},
      {"HalfTheHeap", with_length(0x100000, "{}")},
      {"BinaryCount", stored(word(0xFFFFFFFF))},
  };
  std::string list;
  for (int i = 0; i < 3000; ++i) list += (list.empty() ? "\"" : ",\"") + std::to_string(i) + "\"";
  data["HugeList"] = stored("{\"sd_list\":[" + list + "],\"talist\":[" + list + "]}");
  for (const char *value :
       {"null", "true", "7", "\"text\"", "[]", "{}", "[null]", "[[]]", "[{}]"}) {
    std::string record = "{";
    for (const char *name :
         {"sd_list", "name", "spid", "tsmid", "talist", "spcert", "aik", "sdid", "taid"}) {
      record += std::string(record.size() > 1 ? "," : "") + "\"" + name + "\":" + value;
    }
    data[std::string("AllMembers ") + value] = stored(record + ",\"ta_version\":" + value + "}");
  }
  return data;
}

std::map<std::string, std::string> any_sp_record() {
  const std::string size = box_record(0x10, tsm::little_endian(2048, 4));
  const auto key_of = [](size_t len) {
    const std::string n(len, '\xC5');
    return box_record(0x11, n) + box_record(0x12, std::string("\1\0\1", 3)) + box_record(0x13, n);
  };
  return {
      {"NoBox", sp_record("no box")},
      {"EmptyBox", sp_record("")},
      {"BoxWithoutModulus", sp_record(size + box_record(0x12, "e"))},
      {"EmptyModulus", sp_record(size + box_record(0x11, "") + box_record(0x12, "e"))},
      {"Key512", sp_record(box_record(0x10, tsm::little_endian(512, 4)) + key_of(64))},
      {"Key4096", sp_record(box_record(0x10, tsm::little_endian(4096, 4)) + key_of(512))},
      {"KeyLongerThanItsSize", sp_record(size + key_of(512))},
      {"KeyOfSizeZero", sp_record(box_record(0x10, word(0)) + key_of(256))},
      {"KeyOfLargestSize", sp_record(box_record(0x10, word(0xFFFFFFFF)) + key_of(256))},
      {"AikNotBase64", stored(R"({"spid":"sp1","spcert":"c","aik":"****"})")},
  };
}

class StoredState : public testing::Test {
 protected:
  void SetUp() override {
    tee::test::reuse_generated_keys(7);
    ASSERT_TRUE(scene.get_device_state().response);
    ASSERT_TRUE(scene.create_sd("sp1", "sd1").passed());
    ASSERT_TRUE(scene.create_sd("sp1", "sd2").passed());
    ASSERT_TRUE(scene.install_ta("sp1", "sd1", taid("ta1")).passed());
    ASSERT_TRUE(scene.device.restart());
    ASSERT_TRUE(scene.get_device_state().response);
    snapshot = scene.device.snapshot();
    prepare_requests();
  }
  void TearDown() override { tee::test::reuse_generated_keys(0); }

  // For the state before anything was spoiled. GetDeviceState comes first: its answer has the hash
  // that the others need on the spoiled device.
  void prepare_requests() {
    asks = {
        {MessageId::kUpdateSd, {.spid = "sp1", .sdname = "sd1", .spcert = "c", .renew_aik = true}},
        {MessageId::kInstallTa,
         {.spid = "sp1", .sdname = "sd1", .taid = taid("ta2"), .image = make_image(100)}},
        {MessageId::kUpdateTa,
         {.spid = "sp1", .sdname = "sd1", .taid = taid("ta1"), .image = make_image(100)}},
        {MessageId::kDeleteTa, {.sdname = "sd1", .taid = taid("ta1")}},
        {MessageId::kGetTaInfo, {.spid = "sp1", .taid = taid("ta1")}},
        {MessageId::kCreateSd, {.spid = "sp1", .sdname = "sd3", .spcert = "c"}},
        {MessageId::kDeleteSd, {.sdname = "sd1", .deleteta = "true"}}};
    for (auto &ask : asks) ask.second.ta_version = "2";
  }

  /// Spoils one record and asks everything, each on a device of its own.
  void try_all(const std::string &id, const std::string &name, const std::string &data) {
    SCOPED_TRACE(id + ": " + name);
    Snapshot spoiled = snapshot;
    spoiled.agent[id] = data;
    for (const auto &[message, options] : asks) {
      const tee::test::TraceSink log;
      Scene device(scene, spoiled);
      TEEC_Result opened = TEEC_SUCCESS;
      if (!device.device.open(&opened)) {
        EXPECT_EQ(opened, TEEC_ERROR_BAD_STATE);
        EXPECT_EQ(device.device.objects(), spoiled.agent);
        ++num_refused;
        return;
      }
      ask_one(device, message, options);
      // What is not in the way of the request stays what it is.
      if (id != "SD_INFO_sd2") {
        EXPECT_EQ(device.device.objects().at("SD_INFO_sd2"), spoiled.agent.at("SD_INFO_sd2"));
      }
      device.device.expect_clean();
      ++num_answered;
    }
  }

  /// An SP record may hold a key that no TSM takes an answer from.
  static void ask_one(Scene &device, MessageId message, const tsm::RequestOptions &options) {
    device.get_device_state();
    try {
      const Outcome outcome = device.run(message, options);
      EXPECT_EQ(outcome.reply.result, TEEC_SUCCESS);
      EXPECT_TRUE(outcome.response || outcome.reply.status != 0);
    } catch (const tsm::NotVerified &) {
      EXPECT_EQ(message, MessageId::kGetTaInfo);
    }
  }

  Scene scene;
  Snapshot snapshot;
  std::vector<std::pair<MessageId, tsm::RequestOptions>> asks;
  int num_answered = 0;
  int num_refused = 0;
};

TEST_F(StoredState, AnyRecordMayHoldAnything) {
  const std::string ids[] = {"SD_LIST_ID",
                             "SD_INFO_sd1",
                             "SP_INFO_sp1",
                             "TSM_INFO_tsm1",
                             "TA_INFO_" + taid("ta1"),
                             "OTRP_TA_REGISTER_INFO"};
  for (const std::string &id : ids) {
    for (const auto &[name, data] : any_record()) try_all(id, name, data);
  }
  std::printf("stored states: %d requests answered, %d instances refused\n", num_answered,
              num_refused);
  EXPECT_GT(num_answered, 0);
  EXPECT_GT(num_refused, 0);
}

TEST_F(StoredState, AnySpRecordMayHoldAnyKey) {
  for (const auto &[name, data] : any_sp_record()) try_all("SP_INFO_sp1", name, data);
}

TEST_F(StoredState, AnyRegisterCountIsCheckedAgainstItsRows) {
  const std::string rows = snapshot.agent.at("OTRP_TA_REGISTER_INFO").substr(8);
  for (const uint32_t count : {0u, 2u, 0x03FFFFFFu, 0x04000000u, 0x04000001u, 0xFFFFFFFFu}) {
    try_all("OTRP_TA_REGISTER_INFO", std::to_string(count), stored(word(count) + rows));
  }
}

}  // namespace
}  // namespace otrp_test
