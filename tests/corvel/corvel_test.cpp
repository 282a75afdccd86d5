// SPDX-License-Identifier: BSD-2-Clause
#include "corvel.h"

#include <ta_config.h>

#include <cstring>

#include "../tee/tee_support.h"

namespace {

using namespace tee::test;
using namespace std::string_literals;

const TEE_UUID kCorvel = TA_UUID;

struct CorvelDevice : Device {
  CorvelDevice() {
    register_ta({.uuid = kCorvel, .data_size = TA_DATA_SIZE},
                {TA_CreateEntryPoint, TA_DestroyEntryPoint, TA_OpenSessionEntryPoint,
                 TA_CloseSessionEntryPoint, TA_InvokeCommandEntryPoint});
  }
};

TEE_Param buffer(std::string &bytes) {
  return {.memref = {bytes.data(), static_cast<uint32_t>(bytes.size())}};
}

TEE_Param label(const char *text) {
  return {.memref = {const_cast<char *>(text), static_cast<uint32_t>(strlen(text) + 1)}};
}

struct Command {
  uint32_t id, types;
  TEE_Param params[4];
};

Command tee_key(std::string &key) {
  return {CORVEL_CMD_TEE_KEY, 0x26, {buffer(key)}};
}
Command device_id(const TEE_Param &label, std::string &id) {
  return {CORVEL_CMD_DEVICE_ID, 0x265, {label, buffer(id)}};
}
Command sp_ek_id(const TEE_Param &label, std::string &id) {
  return {CORVEL_CMD_SP_EK_ID, 0x526, {buffer(id), {}, label}};
}
Command public_identity(std::string &id, std::string &key) {
  return {CORVEL_CMD_PUBLIC_IDENTITY, 0x66, {buffer(id), buffer(key)}};
}

// A command of a trusted application, in a session of its own: the key service is created for it
// and destroyed after it, as after a restart.
TEE_Result invoke(Device &device, Command &command) {
  const InsideTa inside(device);
  TEE_TASessionHandle session = TEE_HANDLE_NULL;
  EXPECT_EQ(TEE_OpenTASession(&kCorvel, TEE_TIMEOUT_INFINITE, 0, nullptr, &session, nullptr),
            TEE_SUCCESS);
  const TEE_Result result = TEE_InvokeTACommand(session, TEE_TIMEOUT_INFINITE, command.id,
                                                command.types, command.params, nullptr);
  TEE_CloseTASession(session);
  return result;
}

// All that the key service gives out. The result is that of the first command that fails.
TEE_Result read_identity(Device &device, std::string *identity) {
  std::string id(32, '?'), box(8192, '?'), same_id(32, '?'), key(1024, '?');
  Command commands[] = {device_id(label("EK"), id), tee_key(box), public_identity(same_id, key)};
  for (Command &command : commands) {
    const TEE_Result result = invoke(device, command);
    if (result != TEE_SUCCESS) return result;
  }
  EXPECT_EQ(same_id, id);
  *identity = id + box.substr(0, commands[1].params[1].value.a) +
              key.substr(0, commands[2].params[1].memref.size);
  return TEE_SUCCESS;
}

// A device that has its identity; making a key takes long enough to do it once.
class Corvel : public testing::Test {
 protected:
  static void SetUpTestSuite() {
    CorvelDevice first;
    std::string identity;
    ASSERT_EQ(read_identity(first, &identity), TEE_SUCCESS);
    std::tie(object_id_, object_) = *first.objects(kCorvel).begin();
  }

  Corvel() { device_.put_object(kCorvel, object_id_, object_); }

  static inline std::string object_id_, object_;
  const TraceSink quiet_;
  CorvelDevice device_;
};

TEST_F(Corvel, IdsAreHexAndTheEndorsementKeysADigestOfDeviceIdAndLabel) {
  EXPECT_EQ(object_.find_first_not_of("0123456789abcdef"), 32u);
  device_.put_object(kCorvel, object_id_, "00112233445566778899aabbccddeeff" + object_.substr(32));
  std::string id(80, '\0');
  Command command = sp_ek_id(label("SP_EK_ID"), id);
  EXPECT_EQ(invoke(device_, command), TEE_SUCCESS);
  EXPECT_EQ(command.params[0].memref.size, 65u);
  // printf '00112233445566778899aabbccddeeffSP_EK_ID\0' | sha256sum
  EXPECT_STREQ(id.c_str(), "b070bd853fbc5ba63cdc2cc536add1d8322e24312da55fc53302f8d2d1f6a390");
}

TEST_F(Corvel, RefusedCommandsGiveNothing) {
  std::string wide(600, '?'), id(31, '?'), ek_id(64, '?'), key(266, '?');
  const TEE_Param unterminated = {.memref = {const_cast<char *>("EK"), 2}};
  const uint32_t box_len = static_cast<uint32_t>(object_.size() - 32);
  struct {
    const char *name;
    Command command;
    TEE_Result result;
    uint32_t needed[2];  // by the first two parameters; 0: stays as it is
  } cases[] = {
      {"NoSuchCommand", {3, 0, {}}, TEE_ERROR_NOT_SUPPORTED, {}},
      {"OtherTypes", {CORVEL_CMD_TEE_KEY, 0x66, {}}, TEE_ERROR_BAD_PARAMETERS, {}},
      {"OtherLabel", device_id(label("EP"), wide), TEE_ERROR_BAD_PARAMETERS, {}},
      {"LabelWithoutNul", device_id(unterminated, wide), TEE_ERROR_BAD_PARAMETERS, {}},
      {"EkLabelForSpEk", sp_ek_id(label("EK"), wide), TEE_ERROR_BAD_PARAMETERS, {}},
      {"ShortForKey", tee_key(key), TEE_ERROR_SHORT_BUFFER, {box_len}},
      {"ShortForEkId", sp_ek_id(label("SP_EK_ID"), ek_id), TEE_ERROR_SHORT_BUFFER, {65}},
      {"ShortForId", device_id(label("EK"), id), TEE_ERROR_SHORT_BUFFER, {0, 32}},
      {"ShortForPublicId", public_identity(id, wide), TEE_ERROR_SHORT_BUFFER, {32}},
      {"ShortForPublicKey", public_identity(wide, key), TEE_ERROR_SHORT_BUFFER, {0, 267}},
  };
  for (auto &[name, command, result, needed] : cases) {
    SCOPED_TRACE(name);
    EXPECT_EQ(invoke(device_, command), result);
    for (int i = 0; i < 2; ++i) {
      if (needed[i] == 0) continue;
      EXPECT_EQ(command.params[i].memref.size, needed[i]);
    }
  }
  EXPECT_EQ((wide + id + ek_id + key).find_first_not_of('?'), std::string::npos);
}

TEST_F(Corvel, TheNormalWorldGetsNeitherKeyNorIds) {
  Client client(device_.name());
  TEEC_Operation none = {};
  ASSERT_EQ(client.open(std::bit_cast<TEEC_UUID>(kCorvel)), TEEC_SUCCESS);
  for (const uint32_t command : {CORVEL_CMD_TEE_KEY, CORVEL_CMD_SP_EK_ID, CORVEL_CMD_DEVICE_ID}) {
    EXPECT_EQ(client.invoke(command, &none), TEEC_ERROR_ACCESS_DENIED);
  }
}

TEST_F(Corvel, DamagedIdentityIsReportedAndLeftAlone) {
  std::string other_type = object_, long_record = object_;
  other_type[32] = 0x12;
  long_record[35] = 0x7f;
  for (const std::string &data :
       {""s, object_.substr(0, 32), object_.substr(0, 295), object_.substr(0, object_.size() - 1),
        object_ + "x", object_ + std::string(1000, 'x'), other_type, long_record}) {
    device_.put_object(kCorvel, object_id_, data);
    std::string found;
    EXPECT_EQ(read_identity(device_, &found), TEE_ERROR_CORRUPT_OBJECT);
    EXPECT_EQ(device_.objects(kCorvel)[object_id_], data);
  }
}

}  // namespace
