// SPDX-License-Identifier: BSD-2-Clause
// Stored objects, the TA register and the device state, on storage that the tests look into.
#include "otrp_result.h"
#include "state/dsi.h"
#include "state/object_store.h"
#include "state/records.h"
#include "state/ta_register.h"
#include "support/inside_agent.h"
#include "support/scene.h"

namespace otrp_test {
namespace {

class State : public InsideAgent {
 protected:
  std::string object(const std::string &id) { return device.objects({}).at(id); }

  static TEE_Result save(const std::string &id, const std::string &payload) {
    return save_data_to_persistent_object(payload.data(), len_of(payload), id.data(), len_of(id),
                                          true);
  }
  static TEE_Result load(const std::string &id, std::string *payload) {
    secret_bytes data;
    const TEE_Result result =
        allocate_and_load_data_from_persistent_object(id.data(), len_of(id), &data.data, &data.len);
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

TEST_F(State, TheRegisterRefusesWhatDoesNotFitItsRows) {
  const std::string id = "OTRP_TA_REGISTER_INFO";
  const std::string image = make_image(10);
  const std::string rows =
      word(2) + taid("a") + image.substr(20, 32) + taid("b") + image.substr(20, 32);
  std::string no_digest = image;
  no_digest[16] = 31;
  const struct {
    std::string rows;
    std::string taid;
    const uint8_t *image;
    int32_t operation;
    TEE_Result result;
  } cases[] = {
      {rows, taid("b"), u8(image), kRegisterTa, OTRP_TA_EXISTS},
      {rows, taid("d"), u8(image), kUpdateTa, OTRP_NOT_FOUND},
      {rows, taid("d"), u8(image), kUnregisterTa, OTRP_NOT_FOUND},
      {rows, taid("d"), u8(image), 4, OTRP_MISSING},
      {rows, taid("d"), u8(no_digest), kRegisterTa, OTRP_MISSING},
      {rows, taid("b"), nullptr, kUpdateTa, OTRP_MISSING},
      {rows, std::string(31, 'x'), u8(image), kRegisterTa, OTRP_MISSING},
      {word(1), taid("d"), u8(image), kRegisterTa, TEE_ERROR_BAD_FORMAT},
      {word(0x04000000), taid("d"), u8(image), kRegisterTa, TEE_ERROR_BAD_FORMAT},
      {word(0xFFFFFFFF), taid("d"), u8(image), kRegisterTa, TEE_ERROR_BAD_FORMAT},
  };
  for (const auto &c : cases) {
    device.put_object({}, id, stored(c.rows));
    EXPECT_EQ(save_ta_register_info(c.taid.c_str(), c.image, c.operation), c.result);
    EXPECT_EQ(object(id), stored(c.rows));
  }
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

TEST_F(State, AnEmptyDeviceHasTheKnownHashAndTakesAnAikOnce) {
  g_dsi = init_dsi();
  const std::string known = "bbdc1d13e56fe3b3d81a742a6f9de14c813b002661c90f39cfe1bfd324bea9e5";
  EXPECT_EQ(dsi_validate_dsi_hash(g_dsi, known.c_str()), TEE_SUCCESS);
  for (const std::string &wrong :
       {std::string(), known.substr(0, 63), known.substr(0, 63) + "0", known + "0",
        std::string("BBDC1D13E56FE3B3D81A742A6F9DE14C813B002661C90F39CFE1BFD324BEA9E5")}) {
    EXPECT_EQ(dsi_validate_dsi_hash(g_dsi, wrong.c_str()), TEE_ERROR_MAC_INVALID);
  }
  EXPECT_EQ(dsi_validate_dsi_hash(g_dsi, nullptr), TEE_ERROR_MAC_INVALID);
  // A second key for an SP changes nothing.
  for (const char *key : {"key", "another"}) {
    ASSERT_EQ(dsi_add_sp_aik(g_dsi, "sp", u8(key), 3, "RSA"), TEE_SUCCESS);
    EXPECT_STREQ(g_dsi->spl_json_str, R"([{"spaik":"a2V5","spaiktype":"RSA","spid":"sp"}])");
  }
  dsi_json_str_free(g_dsi);
  g_dsi = nullptr;
}

}  // namespace
}  // namespace otrp_test
