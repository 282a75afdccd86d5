// SPDX-License-Identifier: BSD-2-Clause
// Whatever storage holds: the instance starts or refuses to start, every message is answered with a
// code, and nothing else is written.
#include <gtest/gtest.h>

#include "support/scene.h"

namespace otrp_test {
namespace {

std::string nested(int levels) {
  return std::string(static_cast<size_t>(levels), '[') +
         std::string(static_cast<size_t>(levels), ']');
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
      {"TwentyLevels", stored(nested(20))},
      {"TwentyOneLevels", stored(nested(21))},
      {"LengthBeyondTheObject", word(1000) + "{}"},
      {"LargestLength", word(0xFFFFFFFF) + "{}"},
      {"HalfTheHeap", word(0x100000) + "{}"},
      {"BinaryCount", stored(word(0xFFFFFFFF))},
  };
  Json list = Json::array();
  for (int i = 0; i < 3000; ++i) list.push_back(std::to_string(i));
  data["HugeList"] = stored(Json({{"sd_list", list}, {"talist", list}}).dump());
  const char *const members[] = {"sd_list", "name", "spid", "tsmid", "talist",
                                 "spcert",  "aik",  "sdid", "taid",  "ta_version"};
  for (const char *value : {"null", "7", "\"text\"", "[]", "{}", "[null]", "[[]]", "[{}]"}) {
    Json record;
    for (const char *name : members) record[name] = Json::parse(value);
    data[std::string("AllMembers ") + value] = stored(record.dump());
  }
  return data;
}

// The boxes that an SP record may hold.
std::map<std::string, std::string> any_box() {
  const auto size = [](uint32_t bits) { return box_record(0x10, word(bits)); };
  const auto key = [](const std::string &n) {
    return box_record(0x11, n) + box_record(0x12, std::string("\1\0\1", 3)) + box_record(0x13, n);
  };
  return {
      {"NoBox", "no box"},
      {"EmptyBox", ""},
      {"BoxWithoutModulus", size(2048) + box_record(0x12, "e")},
      {"EmptyModulus", size(2048) + key("")},
      {"Key512", size(512) + key(std::string(64, '\xC5'))},
      {"Key4096", size(4096) + key(std::string(512, '\xC5'))},
      {"KeyLongerThanItsSize", size(2048) + key(std::string(512, '\xC5'))},
      {"KeyOfSizeZero", size(0) + key(std::string(256, '\xC5'))},
      {"KeyOfLargestSize", size(0xFFFFFFFF) + key(std::string(256, '\xC5'))},
  };
}

class StoredState : public testing::Test {
 protected:
  void SetUp() override {
    scene.furnish();
    ASSERT_TRUE(scene.device.restart());
    ASSERT_TRUE(scene.get_device_state().passed());
    snapshot = scene.device.snapshot();
  }

  /// Spoils one record and asks everything, each on a device of its own.
  void try_all(const std::string &id, const std::string &name, const std::string &data) {
    SCOPED_TRACE(id + ": " + name);
    Snapshot spoiled = snapshot;
    spoiled.agent[id] = data;
    for (int i = 2; i <= 8; ++i) {
      const tee::test::TraceSink log;
      Scene device(scene, spoiled);
      TEEC_Result opened = TEEC_SUCCESS;
      if (!device.device.open(&opened)) {
        EXPECT_EQ(opened, TEEC_ERROR_BAD_STATE);
        EXPECT_EQ(device.device.objects(), spoiled.agent);
        ++num_refused;
        return;
      }
      ask_one(device, static_cast<MessageId>(i));
      // What is not in the way of the request stays what it is.
      EXPECT_EQ(device.device.objects().at("SD_INFO_sd3"), spoiled.agent.at("SD_INFO_sd3"));
      device.device.expect_clean();
      ++num_answered;
    }
  }

  /// An SP record may hold a key that no TSM takes an answer from.
  static void ask_one(Scene &device, MessageId message) {
    device.get_device_state();  // for the hash that the others need
    tsm::RequestOptions options = usual(message);
    if (message == MessageId::kCreateSd) options.spid = "sp1";  // whose record may be spoiled
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
  int num_answered = 0;
  int num_refused = 0;
};

TEST_F(StoredState, AnyRecordMayHoldAnything) {
  const std::string ids[] = {"SD_LIST_ID",           "SD_INFO_sd1",   "SD_INFO_sd2",
                             "SP_INFO_sp1",          "TSM_INFO_tsm1", "TA_INFO_" + taid("ta1"),
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
  for (const auto &[name, box] : any_box()) {
    const std::string aik = tools::base64_encode(box);
    const Json record = {{"spid", "sp1"}, {"spcert", "c"}, {"aik", aik}};
    try_all("SP_INFO_sp1", name, stored(record.dump()));
  }
  try_all("SP_INFO_sp1", "AikNotBase64", stored(R"({"spid":"sp1","spcert":"c","aik":"****"})"));
}

TEST_F(StoredState, AnyRegisterCountIsCheckedAgainstItsRows) {
  const std::string rows = snapshot.agent.at("OTRP_TA_REGISTER_INFO").substr(8);
  for (const uint32_t count : {0u, 1u, 3u, 0x03FFFFFFu}) {
    try_all("OTRP_TA_REGISTER_INFO", std::to_string(count), stored(word(count) + rows));
  }
}

}  // namespace
}  // namespace otrp_test
