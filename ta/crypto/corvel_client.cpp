// SPDX-License-Identifier: BSD-2-Clause
#include "crypto/corvel_client.h"

#include <ta_config.h>

#include "crypto/rsa.h"
#include "failure.h"
#include "ownership.h"

namespace {

const TEE_UUID kCorvelUuid = CORVEL_UUID;

enum corvel_command : uint32_t {
  kGetTeeKey = 2,
  kGetSpEkId = 5,
  kGetDeviceId = 11,
};

// Both labels are sent with their terminating NUL.
char kEkLabel[] = "EK";
char kSpEkIdLabel[] = "SP_EK_ID";

constexpr uint32_t kSpEkIdLen = 80;
constexpr uint32_t kKeyBufferLen = 8192;

using corvel_session = owned<TEE_TASessionHandle, TEE_CloseTASession>;

}  // namespace

TEE_Result open_corvel_session(TEE_TASessionHandle *session) {
  *session = TEE_HANDLE_NULL;
  uint32_t origin = 0;
  const TEE_Result result =
      TEE_OpenTASession(&kCorvelUuid, TEE_TIMEOUT_INFINITE, 0, nullptr, session, &origin);
  if (result != TEE_SUCCESS) {
    *session = TEE_HANDLE_NULL;
    FAIL(result, "Open corvel session failed with 0x%x\n", result);
  }
  return TEE_SUCCESS;
}

static TEE_Result call_corvel(uint32_t command, uint32_t types, TEE_Param params[4],
                              const char *as = __builtin_FUNCTION()) {
  corvel_session session;
  TRY_LOG_AS(as, open_corvel_session(out(session)), "Failed to open corvel session with 0x%x\n");
  uint32_t origin = 0;
  const TEE_Result result =
      TEE_InvokeTACommand(session.get(), TEE_TIMEOUT_INFINITE, command, types, params, &origin);
  CHECK_AS(as, result == TEE_SUCCESS, result, "Failed to invoke command with 0x%x errorOrigin %u\n",
           result, origin);
  return TEE_SUCCESS;
}

// The key service is not this TA: a length that it reports is believed only within the capacity.
static TEE_Result accept_length(uint32_t reported, uint32_t *len,
                                const char *as = __builtin_FUNCTION()) {
  CHECK_AS(as, reported <= *len, TEE_ERROR_EXCESS_DATA,
           "key service reports %u bytes in a buffer of %u", reported, *len);
  *len = reported;
  return TEE_SUCCESS;
}

TEE_Result corvel_get_device_id(void *buffer, uint32_t *len) {
  if (buffer == nullptr || len == nullptr || *len == 0) return TEE_ERROR_BAD_PARAMETERS;
  TEE_Param params[4] = {};
  params[0].memref.buffer = kEkLabel;
  params[0].memref.size = sizeof kEkLabel;
  params[1].memref.buffer = buffer;
  params[1].memref.size = *len;
  TRY(call_corvel(kGetDeviceId,
                  TEE_PARAM_TYPES(TEE_PARAM_TYPE_MEMREF_INPUT, TEE_PARAM_TYPE_MEMREF_OUTPUT,
                                  TEE_PARAM_TYPE_VALUE_OUTPUT, TEE_PARAM_TYPE_NONE),
                  params));
  return accept_length(params[2].value.a, len);
}

TEE_Result corvel_get_tee_key(void *buffer, uint32_t *len) {
  if (buffer == nullptr || len == nullptr || *len == 0) return TEE_ERROR_BAD_PARAMETERS;
  TEE_Param params[4] = {};
  params[0].memref.buffer = buffer;
  params[0].memref.size = *len;
  TRY(call_corvel(kGetTeeKey,
                  TEE_PARAM_TYPES(TEE_PARAM_TYPE_MEMREF_OUTPUT, TEE_PARAM_TYPE_VALUE_OUTPUT,
                                  TEE_PARAM_TYPE_NONE, TEE_PARAM_TYPE_NONE),
                  params));
  return accept_length(params[1].value.a, len);
}

TEE_Result corvel_get_sp_ek_id(char **id) {
  *id = nullptr;
  tee_ptr<uint8_t> buffer(allocate_bytes(kSpEkIdLen));
  CHECK(buffer, TEE_ERROR_OUT_OF_MEMORY, "Out of memory");
  TEE_Param params[4] = {};
  params[0].memref.buffer = buffer.get();
  params[0].memref.size = kSpEkIdLen;
  params[2].memref.buffer = kSpEkIdLabel;
  params[2].memref.size = sizeof kSpEkIdLabel;
  TRY(call_corvel(kGetSpEkId,
                  TEE_PARAM_TYPES(TEE_PARAM_TYPE_MEMREF_OUTPUT, TEE_PARAM_TYPE_VALUE_OUTPUT,
                                  TEE_PARAM_TYPE_MEMREF_INPUT, TEE_PARAM_TYPE_NONE),
                  params));
  buffer.get()[kSpEkIdLen - 1] = 0;
  *id = reinterpret_cast<char *>(buffer.release());
  return TEE_SUCCESS;
}

// ---- The TEE key

namespace {

struct key_part {
  uint32_t type;
  uint32_t attribute;
};

const key_part kKeyParts[] = {
    {kRsaModulus, TEE_ATTR_RSA_MODULUS},
    {kRsaPublicExponent, TEE_ATTR_RSA_PUBLIC_EXPONENT},
    {kRsaPrivateExponent, TEE_ATTR_RSA_PRIVATE_EXPONENT},
};
constexpr uint32_t kNumKeyParts = sizeof(kKeyParts) / sizeof(kKeyParts[0]);

}  // namespace

static TEE_Result copy_key_part(const tlv_box *box, uint32_t type, secret_bytes *value,
                                const char *as = __builtin_FUNCTION()) {
  const auto record = static_cast<uint16_t>(type);
  const uint8_t *bytes = nullptr;
  uint32_t capacity = 0;
  CHECK_AS(as, tlv_box_get_bytes_ptr(box, record, &bytes, &capacity) == 0, TEE_ERROR_BAD_PARAMETERS,
           "Get length error for %x\n", type);
  // A component longer than the key would make the platform panic.
  CHECK_AS(as, capacity <= kRsaKeyBits / 8, TEE_ERROR_BAD_PARAMETERS, "Get length error for %x\n",
           type);
  value->data = allocate_bytes(capacity);
  CHECK_AS(as, value->data != nullptr, TEE_ERROR_OUT_OF_MEMORY, "Fail to allocate memory for %x\n",
           type);
  value->len = capacity;
  uint32_t len = capacity;
  const int copied = tlv_box_get_bytes(box, record, value->data, &len);
  CHECK_AS(as, copied == 0 && len == capacity, TEE_ERROR_SHORT_BUFFER,
           "Fail to init attribute for %x, rc=%x, length(%d) capacity(%d)\n", type,
           static_cast<uint32_t>(copied), static_cast<int>(len), static_cast<int>(capacity));
  return TEE_SUCCESS;
}

static TEE_Result init_key_param_with_tag(const secret_bytes &key_box,
                                          secret_bytes (&values)[kNumKeyParts],
                                          TEE_Attribute (&attributes)[kNumKeyParts]) {
  const box_ptr box(tlv_box_parse(key_box.data, key_box.len));
  if (!box) return TEE_ERROR_OUT_OF_MEMORY;
  for (uint32_t i = 0; i < kNumKeyParts; ++i) {
    TRY(copy_key_part(box.get(), kKeyParts[i].type, &values[i]));
    TEE_InitRefAttribute(&attributes[i], kKeyParts[i].attribute, values[i].data, values[i].len);
  }
  return TEE_SUCCESS;
}

static TEE_Result populate_key_obj(TEE_ObjectHandle key,
                                   const TEE_Attribute (&attributes)[kNumKeyParts]) {
  TRY_LOG(TEE_PopulateTransientObject(key, attributes, kNumKeyParts),
          "TEE_PopulateTransientObject failed: %08x\n");
  return TEE_SUCCESS;
}

static TEE_Result build_key(const secret_bytes &key_box, TEE_ObjectHandle key) {
  secret_bytes values[kNumKeyParts];
  TEE_Attribute attributes[kNumKeyParts];
  TRY(init_key_param_with_tag(key_box, values, attributes));
  return populate_key_obj(key, attributes);
}

TEE_ObjectHandle get_tee_key() {
  secret_bytes key_box;
  key_box.data = allocate_bytes(kKeyBufferLen);
  CHECK(key_box.data != nullptr, nullptr, "Failed to allocate %uBytes keybuf\n", kKeyBufferLen);
  key_box.len = kKeyBufferLen;
  TEE_Result result = corvel_get_tee_key(key_box.data, &key_box.len);
  CHECK(result == TEE_SUCCESS, nullptr, "Failed to get tee key with 0x%x\n", result);

  key_object key;
  result = TEE_AllocateTransientObject(TEE_TYPE_RSA_KEYPAIR, kRsaKeyBits, out(key));
  CHECK(result == TEE_SUCCESS, nullptr, "allocate tee key object failed: %x\n", result);
  result = build_key(key_box, key.get());
  CHECK(result == TEE_SUCCESS, nullptr, "Failed to build key from keybuf with 0x%x\n", result);
  return key.release();
}
