// SPDX-License-Identifier: BSD-2-Clause
// Stored objects, the TA register and the device state, on storage that the tests look into.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "otrp_result.h"
#include "state/dsi.h"
#include "state/object_store.h"
#include "state/records.h"
#include "state/ta_register.h"
#include "support/inside_agent.h"
#include "support/scene.h"
#include "tsm/crypto.h"
#include "tsm/dsi.h"

namespace otrp_test {
namespace {

using testing::ElementsAre;
using testing::Pair;

class State : public InsideAgent {
 protected:
  void TearDown() override {
    if (g_dsi != nullptr) dsi_json_str_free(g_dsi);
    g_dsi = nullptr;
    InsideAgent::TearDown();
  }

  // The DSI hash is always that of the instance's own DSI.
  static void start() {
    g_dsi = init_dsi();
    ASSERT_NE(g_dsi, nullptr);
  }

  std::string object(const std::string &id) { return device.objects({}).at(id); }

  static TEE_Result save(const std::string &id, const std::string &payload) {
    return save_data_to_persistent_object(payload.data(), static_cast<uint32_t>(payload.size()),
                                          id.data(), static_cast<uint32_t>(id.size()), true);
  }
  static TEE_Result load(const std::string &id, std::string *payload) {
    secret_bytes data;
    const TEE_Result result = allocate_and_load_data_from_persistent_object(
        id.data(), static_cast<uint32_t>(id.size()), &data.data, &data.len);
    *payload = data.data != nullptr ? str(data) + "$" : "NULL";
    EXPECT_TRUE(data.data == nullptr || data.data[data.len] == 0);
    return result;
  }
};

TEST_F(State, AShorterPayloadLeavesTheTailOfALongerOne) {
  std::string payload;
  EXPECT_EQ(load("id", &payload), TEE_ERROR_ITEM_NOT_FOUND);
  ASSERT_EQ(save("id", "long payload"), TEE_SUCCESS);
  ASSERT_EQ(save("id", "short"), TEE_SUCCESS);
  EXPECT_EQ(object("id"), word(5) + "shortpayload");
  EXPECT_EQ(load("id", &payload), TEE_SUCCESS);
  EXPECT_EQ(payload, "short$");
  ASSERT_EQ(save("id", ""), TEE_SUCCESS);
  EXPECT_EQ(load("id", &payload), TEE_SUCCESS);
  EXPECT_EQ(payload, "$");
  ASSERT_EQ(delete_persistent_object("id", 2), TEE_SUCCESS);
  EXPECT_EQ(delete_persistent_object("id", 2), TEE_ERROR_ITEM_NOT_FOUND);
  EXPECT_EQ(save(std::string(65, 'i'), "x"), TEE_ERROR_BAD_PARAMETERS);
  EXPECT_EQ(delete_persistent_object(std::string(65, 'i').data(), 65), TEE_ERROR_BAD_PARAMETERS);
  EXPECT_EQ(save(std::string(64, 'i'), "x"), TEE_SUCCESS);
}

TEST_F(State, APrefixIsNotBelievedBeyondTheObject) {
  const struct {
    std::string stored;
    TEE_Result result;
    std::string payload;
  } cases[] = {
      {"", TEE_SUCCESS, "NULL"},
      {"\5\0\0", TEE_SUCCESS, "NULL"},
      {word(0), TEE_SUCCESS, "$"},
      {word(9) + "abc", TEE_SUCCESS, "abc$"},
      {word(2) + "abc", TEE_SUCCESS, "ab$"},
      {word(0xFFFFFFFF) + "abc", TEE_ERROR_OUT_OF_MEMORY, "NULL"},
      {word(0x7FFFFFFF) + "abc", TEE_ERROR_OUT_OF_MEMORY, "NULL"},
  };
  for (const auto &c : cases) {
    device.put_object({}, "id", c.stored);
    std::string payload;
    EXPECT_EQ(load("id", &payload), c.result);
    EXPECT_EQ(payload, c.payload);
  }
}

TEST_F(State, TheRegisterKeepsItsRowsInOrder) {
  const std::string image = make_image(10);
  const std::string digest = image.substr(20, 32);
  const auto change = [&](const std::string &name, int32_t operation) {
    return save_ta_register_info(taid(name).c_str(), u8(image), operation);
  };
  for (const char *name : {"a", "b", "c"}) ASSERT_EQ(change(name, kRegisterTa), TEE_SUCCESS);
  EXPECT_EQ(change("b", kRegisterTa), OTRP_TA_EXISTS);
  EXPECT_EQ(change("d", kUpdateTa), OTRP_NOT_FOUND);
  EXPECT_EQ(change("d", kUnregisterTa), OTRP_NOT_FOUND);
  EXPECT_EQ(change("d", 4), OTRP_MISSING);
  ASSERT_EQ(change("a", kUnregisterTa), TEE_SUCCESS);
  const std::string rows = word(2) + taid("b") + digest + taid("c") + digest;
  EXPECT_EQ(object("OTRP_TA_REGISTER_INFO").substr(4, rows.size()), rows);

  std::string no_digest = image;
  no_digest[16] = 31;
  EXPECT_EQ(save_ta_register_info(taid("d").c_str(), u8(no_digest), kRegisterTa), OTRP_MISSING);
  EXPECT_EQ(save_ta_register_info(taid("b").c_str(), nullptr, kUpdateTa), OTRP_MISSING);
  EXPECT_EQ(save_ta_register_info("31 characters are one too few..", u8(image), kRegisterTa),
            OTRP_MISSING);
  EXPECT_EQ(object("OTRP_TA_REGISTER_INFO").substr(4, rows.size()), rows);
}

TEST_F(State, OnlyTextsThatComeBackCanBeStored) {
  for (const char *text : {"", "plain", "\b\t\n\f\r\"\\/", "\x7F", "\u00e9\u20ac\U0001F600"}) {
    EXPECT_TRUE(can_be_stored(text)) << text;
    ASSERT_EQ(save_sd_info(text, "tsm", "sd"), TEE_SUCCESS);
    const json_ptr record(get_json_by_name("SD_INFO_", "sd"));
    EXPECT_STREQ(json_object_get_string(json_value_get_object(record.get()), "spid"), text);
  }
  for (const char *text : {"\x01", "a\x1F", "\x0B", "\xFF", "\xC3", "\xED\xA0\x80", "\xC0\xAF"}) {
    EXPECT_FALSE(can_be_stored(text)) << text;
  }
  EXPECT_TRUE(can_be_stored(nullptr));
}

TEST_F(State, AnEmptyDeviceHasTheKnownHash) {
  start();
  EXPECT_THAT(device.objects({}), ElementsAre(Pair("SD_LIST_ID", word(14) + R"({"sd_list":[]})")));
  const char kKnown[] = "bbdc1d13e56fe3b3d81a742a6f9de14c813b002661c90f39cfe1bfd324bea9e5";
  EXPECT_EQ(dsi_validate_dsi_hash(g_dsi, kKnown), TEE_SUCCESS);
  for (const char *wrong :
       {"", "bbdc", "BBDC1D13E56FE3B3D81A742A6F9DE14C813B002661C90F39CFE1BFD3"}) {
    EXPECT_EQ(dsi_validate_dsi_hash(g_dsi, wrong), TEE_ERROR_MAC_INVALID);
  }
  EXPECT_EQ(dsi_validate_dsi_hash(g_dsi, (std::string(kKnown) + "0").c_str()),
            TEE_ERROR_MAC_INVALID);
  EXPECT_EQ(dsi_validate_dsi_hash(g_dsi, nullptr), TEE_ERROR_MAC_INVALID);
}

TEST_F(State, EntriesMoveIntoFreedPlacesAndTheHashWithThem) {
  start();
  for (const std::string name : {"1", "2", "3"}) {
    const std::string spid = "sp" + name;
    ASSERT_EQ(save_sd_info(spid.c_str(), "tsm", ("sd" + name).c_str()), TEE_SUCCESS);
    ASSERT_EQ(dsi_load_sd_by_name(g_dsi, ("sd" + name).c_str()), TEE_SUCCESS);
    ASSERT_EQ(dsi_add_sp_aik(g_dsi, spid.c_str(), u8("key"), 3, "RSA"), TEE_SUCCESS);
  }
  // A second key for an SP changes nothing.
  ASSERT_EQ(dsi_add_sp_aik(g_dsi, "sp1", u8("other"), 5, "RSA"), TEE_SUCCESS);
  ASSERT_EQ(dsi_delete_sd_by_name(g_dsi, "sd1"), TEE_SUCCESS);
  ASSERT_EQ(delete_dsi_spl_item_with_spid(g_dsi, "sp1"), TEE_SUCCESS);
  EXPECT_STREQ(
      g_dsi->sdl_json_str,
      R"([{"name":"sd3","spid":"sp3","talist":[]},{"name":"sd2","spid":"sp2","talist":[]}])");
  EXPECT_STREQ(g_dsi->spl_json_str, R"([{"spaik":"a2V5","spaiktype":"RSA","spid":"sp3"},)"
                                    R"({"spaik":"a2V5","spaiktype":"RSA","spid":"sp2"}])");

  const json_ptr document(dsi_get_json_dsi(g_dsi));
  const json_text text(json_serialize_to_string(document.get()));
  EXPECT_EQ(dsi_validate_dsi_hash(g_dsi, tsm::dsi_hash_of_text(text.get()).c_str()), TEE_SUCCESS);
  uint32_t found = 7;
  EXPECT_EQ(check_spid_in_dsi_sdl(g_dsi, "sp1", &found), TEE_SUCCESS);
  EXPECT_EQ(found, 0u);
}

}  // namespace
}  // namespace otrp_test
