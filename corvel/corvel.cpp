// SPDX-License-Identifier: BSD-2-Clause
#include "corvel.h"

#include "failure.h"
#include "identity.h"

static bool has_room(const TEE_Param &output, uint32_t len) {
  return output.memref.buffer != nullptr && output.memref.size >= len;
}

// Writes `content` to an output parameter, whose size becomes its length in any case.
static TEE_Result give(const reader &content, TEE_Param *output) {
  const bool fits = has_room(*output, content.left);
  output->memref.size = content.left;
  if (!fits) return TEE_ERROR_SHORT_BUFFER;
  memcpy(output->memref.buffer, content.at, content.left);
  return TEE_SUCCESS;
}

// A text as it counts here, with its NUL.
template <uint32_t N>
static reader bytes_of(const char (&text)[N]) {
  return {reinterpret_cast<const uint8_t *>(text), N};
}

static bool is_label(const TEE_Param &input, const reader &label) {
  return input.memref.buffer != nullptr && input.memref.size == label.left &&
         memcmp(input.memref.buffer, label.at, label.left) == 0;
}

static TEE_Result give_tee_key(TEE_Param params[4]) {
  identity device;
  TRY(get_identity(&device));
  TRY(give(device.key_box, &params[0]));
  params[1].value.a = device.key_box.left;
  return TEE_SUCCESS;
}

static TEE_Result give_sp_ek_id(TEE_Param params[4]) {
  const reader label = bytes_of(CORVEL_SP_EK_LABEL);
  if (!is_label(params[2], label)) return TEE_ERROR_BAD_PARAMETERS;
  identity device;
  char id[kEndorsementIdLen + 1];
  TRY(get_identity(&device));
  TRY(get_endorsement_id(device, label, id));
  params[1].value.a = kEndorsementIdLen;
  return give(bytes_of(id), &params[0]);
}

static TEE_Result give_device_id(TEE_Param params[4]) {
  if (!is_label(params[0], bytes_of(CORVEL_EK_LABEL))) return TEE_ERROR_BAD_PARAMETERS;
  identity device;
  TRY(get_identity(&device));
  TRY(give(device.device_id, &params[1]));
  params[2].value.a = device.device_id.left;
  return TEE_SUCCESS;
}

static TEE_Result give_public_identity(TEE_Param params[4]) {
  identity device;
  TRY(get_identity(&device));
  const uint32_t key_len = 4 + device.modulus.left + 4 + device.public_exponent.left;
  const bool fits = has_room(params[0], device.device_id.left) && has_room(params[1], key_len);
  params[1].memref.size = key_len;
  if (!fits) {
    params[0].memref.size = device.device_id.left;
    return TEE_ERROR_SHORT_BUFFER;
  }
  writer key = {static_cast<uint8_t *>(params[1].memref.buffer), key_len};
  put_block(&key, {device.modulus.at, device.modulus.left});
  put_block(&key, {device.public_exponent.at, device.public_exponent.left});
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
  TRY(TEE_GetPropertyAsIdentity(TEE_PROPSET_CURRENT_CLIENT, "gpd.client.identity", &client));
  return client.login == TEE_LOGIN_TRUSTED_APP ? TEE_SUCCESS : TEE_ERROR_ACCESS_DENIED;
}

TEE_Result TA_CreateEntryPoint(void) {
  return TEE_SUCCESS;
}

void TA_DestroyEntryPoint(void) {}

TEE_Result TA_OpenSessionEntryPoint(uint32_t param_types, TEE_Param[4], void **) {
  return param_types == 0 ? TEE_SUCCESS : TEE_ERROR_BAD_PARAMETERS;
}

void TA_CloseSessionEntryPoint(void *) {}

TEE_Result TA_InvokeCommandEntryPoint(void *, uint32_t command_id, uint32_t param_types,
                                      TEE_Param params[4]) {
  const command *wanted = find_command(command_id);
  if (wanted == nullptr) return TEE_ERROR_NOT_SUPPORTED;
  if (wanted->for_tas_only) TRY(check_client_is_ta());
  if (param_types != wanted->param_types) return TEE_ERROR_BAD_PARAMETERS;
  return wanted->run(params);
}
