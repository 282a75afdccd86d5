// SPDX-License-Identifier: BSD-2-Clause
#include "corvel.h"

#include <gtest/gtest.h>
#include <ta_config.h>
#include <tee_client_api.h>
#include <tee_internal_api.h>
#include <tee_test.h>

#include <cstring>

#include "../tee/crypto_support.h"

namespace {

using tee::test::Device;
using tee::test::Fault;
using tee::test::InsideTa;
using tee::test::TraceSink;

const TEE_UUID kCorvel = TA_UUID;

const uint32_t kTeeKeyTypes = 0x26;
const uint32_t kSpEkIdTypes = 0x526;
const uint32_t kDeviceIdTypes = 0x265;
const uint32_t kPublicTypes = 0x66;

void install(Device &device) {
  device.register_ta({.uuid = kCorvel, .data_size = TA_DATA_SIZE},
                     {TA_CreateEntryPoint, TA_DestroyEntryPoint, TA_OpenSessionEntryPoint,
                      TA_CloseSessionEntryPoint, TA_InvokeCommandEntryPoint});
}

TEE_Param out_buffer(std::string &buffer) {
  return {.memref = {buffer.data(), static_cast<uint32_t>(buffer.size())}};
}

TEE_Param label(const char *text) {
  return {.memref = {const_cast<char *>(text), static_cast<uint32_t>(strlen(text) + 1)}};
}

// One command of a trusted application, in a session of its own: the key service is created for
// it and destroyed after it, as after a restart.
TEE_Result invoke(Device &device, uint32_t command, uint32_t types, TEE_Param *params) {
  const InsideTa inside(device);
  TEE_TASessionHandle session = TEE_HANDLE_NULL;
  uint32_t origin = 0;
  TEE_Param none[4] = {};
  EXPECT_EQ(TEE_OpenTASession(&kCorvel, TEE_TIMEOUT_INFINITE, 0, none, &session, &origin),
            TEE_SUCCESS);
  const TEE_Result result =
      TEE_InvokeTACommand(session, TEE_TIMEOUT_INFINITE, command, types, params, &origin);
  TEE_CloseTASession(session);
  return result;
}

struct Identity {
  std::string device_id = std::string(63, '?');
  std::string encoded_key = std::string(1024, '?');
  std::string key_box = std::string(8192, '?');

  bool operator==(const Identity &) const = default;
};

// The result is that of the first command that fails.
TEE_Result read_identity(Device &device, Identity *identity) {
  TEE_Param id[4] = {label("EK"), out_buffer(identity->device_id), {}, {}};
  TEE_Result result = invoke(device, CORVEL_CMD_DEVICE_ID, kDeviceIdTypes, id);
  if (result != TEE_SUCCESS) return result;
  identity->device_id.resize(id[2].value.a);

  TEE_Param key[4] = {out_buffer(identity->key_box), {}, {}, {}};
  result = invoke(device, CORVEL_CMD_TEE_KEY, kTeeKeyTypes, key);
  if (result != TEE_SUCCESS) return result;
  identity->key_box.resize(key[1].value.a);

  std::string same_id(63, '?');
  TEE_Param open[4] = {out_buffer(same_id), out_buffer(identity->encoded_key), {}, {}};
  result = invoke(device, CORVEL_CMD_PUBLIC_IDENTITY, kPublicTypes, open);
  if (result != TEE_SUCCESS) return result;
  identity->encoded_key.resize(open[1].memref.size);
  EXPECT_EQ(same_id.substr(0, open[0].memref.size), identity->device_id);
  return TEE_SUCCESS;
}

// A device that has its identity; making a key takes long enough to do it once.
class Corvel : public ::testing::Test {
 protected:
  static void SetUpTestSuite() {
    Device first;
    install(first);
    ASSERT_EQ(read_identity(first, &made_), TEE_SUCCESS);
    objects_ = first.objects(kCorvel);
    ASSERT_EQ(objects_.size(), 1u);
  }

  Corvel() {
    install(device_);
    for (const auto &[id, data] : objects_) device_.put_object(kCorvel, id, data);
  }

  static inline Identity made_;
  static inline std::map<std::string, std::string> objects_;
  const TraceSink quiet_;
  Device device_;
};

TEST_F(Corvel, FormsOfWhatIsGivenOut) {
  EXPECT_EQ(made_.device_id.size(), 32u);
  EXPECT_EQ(made_.device_id.find_first_not_of("0123456789abcdef"), std::string::npos);

  const std::string modulus = made_.key_box.substr(4, 256);
  const std::string exponent("\x01\x00\x01", 3);
  EXPECT_EQ(made_.key_box.substr(0, 4), std::string("\x11\x00\x00\x01", 4));
  EXPECT_EQ(made_.key_box.substr(260, 7), std::string("\x12\x00\x03\x00", 4) + exponent);
  EXPECT_EQ(made_.key_box.substr(267, 2), std::string("\x13\x00", 2));
  EXPECT_EQ(made_.encoded_key, std::string("\x00\x01\x00\x00", 4) + modulus +
                                   std::string("\x03\x00\x00\x00", 4) + exponent);
}

TEST_F(Corvel, TheThreeRecordsAreOneKeyPair) {
  const InsideTa inside(device_);
  const auto *box = reinterpret_cast<const uint8_t *>(made_.key_box.data());
  const Key key =
      make_key(TEE_TYPE_RSA_KEYPAIR, 2048,
               {{TEE_ATTR_RSA_MODULUS, Bytes(box + 4, box + 260)},
                {TEE_ATTR_RSA_PUBLIC_EXPONENT, Bytes(box + 264, box + 267)},
                {TEE_ATTR_RSA_PRIVATE_EXPONENT, Bytes(box + 271, box + made_.key_box.size())}});
  const uint32_t algorithm = TEE_ALG_RSASSA_PKCS1_V1_5_SHA256;
  const Operation sign = make_operation(algorithm, TEE_MODE_SIGN, 2048, key);
  const Operation verify = make_operation(algorithm, TEE_MODE_VERIFY, 2048, key);
  uint8_t signature[256];
  uint32_t len = sizeof(signature);
  EXPECT_EQ(TEE_AsymmetricSignDigest(sign.get(), nullptr, 0, box, 32, signature, &len),
            TEE_SUCCESS);
  EXPECT_EQ(TEE_AsymmetricVerifyDigest(verify.get(), nullptr, 0, box, 32, signature, len),
            TEE_SUCCESS);
}

TEST_F(Corvel, EndorsementKeyIdIsADigestOfDeviceIdAndLabel) {
  device_.put_object(kCorvel, objects_.begin()->first,
                     "00112233445566778899aabbccddeeff" + objects_.begin()->second.substr(32));
  std::string id(80, '\0');
  TEE_Param params[4] = {out_buffer(id), {}, label("SP_EK_ID"), {}};
  EXPECT_EQ(invoke(device_, CORVEL_CMD_SP_EK_ID, kSpEkIdTypes, params), TEE_SUCCESS);
  EXPECT_EQ(params[0].memref.size, 65u);
  // printf '00112233445566778899aabbccddeeffSP_EK_ID\0' | sha256sum
  EXPECT_STREQ(id.c_str(), "b070bd853fbc5ba63cdc2cc536add1d8322e24312da55fc53302f8d2d1f6a390");
}

TEST_F(Corvel, RefusedCommands) {
  std::string wide(600, '?');
  const TEE_Param unterminated = {.memref = {const_cast<char *>("EK"), 2}};
  struct {
    const char *name;
    uint32_t command, types;
    TEE_Param params[4];
    TEE_Result result;
  } cases[] = {
      {"NoSuchCommand", 3, 0, {}, TEE_ERROR_NOT_SUPPORTED},
      {"KeyTypes", CORVEL_CMD_TEE_KEY, 0x66, {}, TEE_ERROR_BAD_PARAMETERS},
      {"EkIdTypes", CORVEL_CMD_SP_EK_ID, 0x26, {}, TEE_ERROR_BAD_PARAMETERS},
      {"IdTypes", CORVEL_CMD_DEVICE_ID, 0x65, {}, TEE_ERROR_BAD_PARAMETERS},
      {"PublicTypes", CORVEL_CMD_PUBLIC_IDENTITY, 0x65, {}, TEE_ERROR_BAD_PARAMETERS},
      {"OtherLabel",
       CORVEL_CMD_DEVICE_ID,
       kDeviceIdTypes,
       {label("EP"), out_buffer(wide)},
       TEE_ERROR_BAD_PARAMETERS},
      {"LabelWithoutNul",
       CORVEL_CMD_DEVICE_ID,
       kDeviceIdTypes,
       {unterminated, out_buffer(wide)},
       TEE_ERROR_BAD_PARAMETERS},
      {"EkLabelForSpEk",
       CORVEL_CMD_SP_EK_ID,
       kSpEkIdTypes,
       {out_buffer(wide), {}, label("EK")},
       TEE_ERROR_BAD_PARAMETERS},
  };
  for (auto &c : cases)
    EXPECT_EQ(invoke(device_, c.command, c.types, c.params), c.result) << c.name;
  EXPECT_EQ(wide, std::string(600, '?'));
}

TEST_F(Corvel, ShortBuffersTellTheSizeAndStayUntouched) {
  std::string wide(600, '?'), id(31, '?'), ek_id(64, '?'), key(266, '?');
  const uint32_t box_len = static_cast<uint32_t>(made_.key_box.size());
  struct {
    uint32_t command, types;
    TEE_Param params[4];
    int output;
    uint32_t needed;
  } cases[] = {
      {CORVEL_CMD_TEE_KEY, kTeeKeyTypes, {out_buffer(key)}, 0, box_len},
      {CORVEL_CMD_SP_EK_ID, kSpEkIdTypes, {out_buffer(ek_id), {}, label("SP_EK_ID")}, 0, 65},
      {CORVEL_CMD_DEVICE_ID, kDeviceIdTypes, {label("EK"), out_buffer(id)}, 1, 32},
      {CORVEL_CMD_PUBLIC_IDENTITY, kPublicTypes, {out_buffer(id), out_buffer(wide)}, 0, 32},
      {CORVEL_CMD_PUBLIC_IDENTITY, kPublicTypes, {out_buffer(wide), out_buffer(key)}, 1, 267},
  };
  for (auto &c : cases) {
    EXPECT_EQ(invoke(device_, c.command, c.types, c.params), TEE_ERROR_SHORT_BUFFER);
    EXPECT_EQ(c.params[c.output].memref.size, c.needed);
  }
  EXPECT_EQ((wide + id + ek_id + key).find_first_not_of('?'), std::string::npos);
}

TEST_F(Corvel, TheNormalWorldGetsThePublicIdentityOnly) {
  TEEC_Context context;
  TEEC_Session session;
  TEEC_UUID uuid;
  memcpy(&uuid, &kCorvel, sizeof(uuid));
  ASSERT_EQ(TEEC_InitializeContext(device_.name(), &context), TEEC_SUCCESS);
  ASSERT_EQ(
      TEEC_OpenSession(&context, &session, &uuid, TEEC_LOGIN_PUBLIC, nullptr, nullptr, nullptr),
      TEEC_SUCCESS);
  for (const uint32_t command : {CORVEL_CMD_TEE_KEY, CORVEL_CMD_SP_EK_ID, CORVEL_CMD_DEVICE_ID}) {
    TEEC_Operation none = {};
    EXPECT_EQ(TEEC_InvokeCommand(&session, command, &none, nullptr), TEEC_ERROR_ACCESS_DENIED);
  }

  char id[32], key[267];
  TEEC_Operation operation = {};
  operation.paramTypes =
      TEEC_PARAM_TYPES(TEEC_MEMREF_TEMP_OUTPUT, TEEC_MEMREF_TEMP_OUTPUT, TEEC_NONE, TEEC_NONE);
  const auto read_public = [&] {
    return TEEC_InvokeCommand(&session, CORVEL_CMD_PUBLIC_IDENTITY, &operation, nullptr);
  };
  EXPECT_EQ(read_public(), TEEC_ERROR_SHORT_BUFFER);  // no buffers: asks for the sizes
  EXPECT_EQ(operation.params[0].tmpref.size, sizeof(id));
  EXPECT_EQ(operation.params[1].tmpref.size, sizeof(key));
  operation.params[0].tmpref.buffer = id;
  operation.params[1].tmpref.buffer = key;
  EXPECT_EQ(read_public(), TEEC_SUCCESS);
  EXPECT_EQ(std::string(id, sizeof(id)), made_.device_id);
  EXPECT_EQ(std::string(key, sizeof(key)), made_.encoded_key);
  TEEC_CloseSession(&session);
  TEEC_FinalizeContext(&context);
}

TEST_F(Corvel, DamagedIdentityIsReportedAndLeftAlone) {
  const auto &[id, whole] = *objects_.begin();
  std::string other_type = whole, long_record = whole;
  other_type[32] = 0x12;
  long_record[35] = 0x7f;
  for (const std::string &data :
       {std::string(), whole.substr(0, 32), whole.substr(0, 295), whole.substr(0, whole.size() - 1),
        whole + "x", whole + std::string(1000, 'x'), other_type, long_record}) {
    device_.put_object(kCorvel, id, data);
    Identity found;
    EXPECT_EQ(read_identity(device_, &found), TEE_ERROR_CORRUPT_OBJECT);
    EXPECT_EQ(device_.objects(kCorvel), (std::map<std::string, std::string>{{id, data}}));
  }
}

// Whatever goes wrong at first use, the device works the next time, and what it has given out
// stays true.
TEST_F(Corvel, FirstUseMayFailAnywhere) {
  tee::test::reuse_generated_keys(7);
  for (const Fault fault :
       {Fault::kPowerCut, Fault::kAllocation, Fault::kStorage, Fault::kCrypto, Fault::kShortRead}) {
    bool fired = true;
    for (unsigned n = 1; fired; ++n) {
      SCOPED_TRACE("fault " + std::to_string(static_cast<int>(fault)) + ", " + std::to_string(n));
      Device device;
      install(device);
      device.fail(kCorvel, fault, n);
      Identity first, next, last;
      const bool passed = read_identity(device, &first) == TEE_SUCCESS;
      fired = device.fault_report().fired;
      EXPECT_TRUE(passed || fired);
      const bool dead = fired && fault == Fault::kPowerCut;
      device.clear_faults();
      device.restore_power();
      EXPECT_EQ(read_identity(device, &next), TEE_SUCCESS);
      EXPECT_EQ(read_identity(device, &last), TEE_SUCCESS);
      EXPECT_EQ(next, last);
      EXPECT_TRUE(!passed || dead || first == last);
    }
  }
  tee::test::reuse_generated_keys(0);
}

}  // namespace
