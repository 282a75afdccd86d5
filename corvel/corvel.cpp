// SPDX-License-Identifier: BSD-2-Clause
#include "corvel.h"

#include <string.h>
#include <tee_internal_api.h>

#include "identity.h"

static bool has_room(const TEE_Param &output, uint32_t len) {
  return output.memref.buffer != nullptr && output.memref.size >= len;
}

// Writes `content` to an output parameter, whose size becomes its length in any case.
static TEE_Result give(byte_view content, TEE_Param *output) {
  const bool fits = has_room(*output, content.len);
  output->memref.size = content.len;
  if (!fits) return TEE_ERROR_SHORT_BUFFER;
  memcpy(output->memref.buffer, content.data, content.len);
  return TEE_SUCCESS;
}

template <uint32_t N>
static bool is_label(const TEE_Param &input, const char (&label)[N]) {
  return input.memref.buffer != nullptr && input.memref.size == N &&
         memcmp(input.memref.buffer, label, N) == 0;
}

static TEE_Result give_tee_key(TEE_Param params[4]) {
  identity device;
  TEE_Result result = get_identity(&device);
  if (result == TEE_SUCCESS) result = give(device.key_box, &params[0]);
  if (result == TEE_SUCCESS) params[1].value.a = device.key_box.len;
  return result;
}

static TEE_Result give_sp_ek_id(TEE_Param params[4]) {
  if (!is_label(params[2], CORVEL_SP_EK_LABEL)) return TEE_ERROR_BAD_PARAMETERS;
  identity device;
  char id[kEndorsementIdLen + 1];
  const byte_view label = {reinterpret_cast<const uint8_t *>(CORVEL_SP_EK_LABEL),
                           sizeof(CORVEL_SP_EK_LABEL)};
  TEE_Result result = get_identity(&device);
  if (result == TEE_SUCCESS) result = get_endorsement_id(device, label, id);
  if (result != TEE_SUCCESS) return result;

  params[1].value.a = kEndorsementIdLen;
  return give({reinterpret_cast<const uint8_t *>(id), sizeof(id)}, &params[0]);
}

static TEE_Result give_device_id(TEE_Param params[4]) {
  if (!is_label(params[0], CORVEL_EK_LABEL)) return TEE_ERROR_BAD_PARAMETERS;
  identity device;
  TEE_Result result = get_identity(&device);
  if (result == TEE_SUCCESS) result = give(device.device_id, &params[1]);
  if (result == TEE_SUCCESS) params[2].value.a = device.device_id.len;
  return result;
}

static uint8_t *put_sized(uint8_t *at, byte_view content) {
  for (int shift = 0; shift < 32; shift += 8) {
    *at++ = static_cast<uint8_t>(content.len >> shift);
  }
  memcpy(at, content.data, content.len);
  return at + content.len;
}

static TEE_Result give_public_identity(TEE_Param params[4]) {
  identity device;
  const TEE_Result result = get_identity(&device);
  if (result != TEE_SUCCESS) return result;

  const uint32_t key_len = 4 + device.modulus.len + 4 + device.public_exponent.len;
  const bool fits = has_room(params[0], device.device_id.len) && has_room(params[1], key_len);
  params[1].memref.size = key_len;
  if (!fits) {
    params[0].memref.size = device.device_id.len;
    return TEE_ERROR_SHORT_BUFFER;
  }
  uint8_t *key = static_cast<uint8_t *>(params[1].memref.buffer);
  put_sized(put_sized(key, device.modulus), device.public_exponent);
  return give(device.device_id, &params[0]);
}

struct command {
  uint32_t id;
  uint32_t param_types;
  bool for_tas_only;
  TEE_Result (*run)(TEE_Param params[4]);
};

static const command kCommands[] = {
    {CORVEL_CMD_TEE_KEY,
     TEE_PARAM_TYPES(TEE_PARAM_TYPE_MEMREF_OUTPUT, TEE_PARAM_TYPE_VALUE_OUTPUT, TEE_PARAM_TYPE_NONE,
                     TEE_PARAM_TYPE_NONE),
     true, give_tee_key},
    {CORVEL_CMD_SP_EK_ID,
     TEE_PARAM_TYPES(TEE_PARAM_TYPE_MEMREF_OUTPUT, TEE_PARAM_TYPE_VALUE_OUTPUT,
                     TEE_PARAM_TYPE_MEMREF_INPUT, TEE_PARAM_TYPE_NONE),
     true, give_sp_ek_id},
    {CORVEL_CMD_DEVICE_ID,
     TEE_PARAM_TYPES(TEE_PARAM_TYPE_MEMREF_INPUT, TEE_PARAM_TYPE_MEMREF_OUTPUT,
                     TEE_PARAM_TYPE_VALUE_OUTPUT, TEE_PARAM_TYPE_NONE),
     true, give_device_id},
    {CORVEL_CMD_PUBLIC_IDENTITY,
     TEE_PARAM_TYPES(TEE_PARAM_TYPE_MEMREF_OUTPUT, TEE_PARAM_TYPE_MEMREF_OUTPUT,
                     TEE_PARAM_TYPE_NONE, TEE_PARAM_TYPE_NONE),
     false, give_public_identity},
};

static const command *find_command(uint32_t id) {
  for (const command &known : kCommands) {
    if (known.id == id) return &known;
  }
  return nullptr;
}

static TEE_Result check_client_is_ta() {
  TEE_Identity client;
  const TEE_Result result =
      TEE_GetPropertyAsIdentity(TEE_PROPSET_CURRENT_CLIENT, "gpd.client.identity", &client);
  if (result != TEE_SUCCESS) return result;
  return client.login == TEE_LOGIN_TRUSTED_APP ? TEE_SUCCESS : TEE_ERROR_ACCESS_DENIED;
}

TEE_Result TA_CreateEntryPoint() {
  return TEE_SUCCESS;
}

void TA_DestroyEntryPoint() {}

TEE_Result TA_OpenSessionEntryPoint(uint32_t paramTypes, TEE_Param[4], void **) {
  return paramTypes == 0 ? TEE_SUCCESS : TEE_ERROR_BAD_PARAMETERS;
}

void TA_CloseSessionEntryPoint(void *) {}

TEE_Result TA_InvokeCommandEntryPoint(void *, uint32_t commandID, uint32_t paramTypes,
                                      TEE_Param params[4]) {
  const command *wanted = find_command(commandID);
  if (wanted == nullptr) return TEE_ERROR_NOT_SUPPORTED;
  if (wanted->for_tas_only) {
    const TEE_Result result = check_client_is_ta();
    if (result != TEE_SUCCESS) return result;
  }
  if (paramTypes != wanted->param_types) return TEE_ERROR_BAD_PARAMETERS;
  return wanted->run(params);
}
