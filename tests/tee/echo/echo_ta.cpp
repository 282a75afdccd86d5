// SPDX-License-Identifier: BSD-2-Clause
// A TA image for tests of the loader: it counts commands in a global variable, and answers each
// with their number in value 0.
#include <tee_internal_api.h>

static uint32_t g_calls = 0;

TEE_Result TA_CreateEntryPoint() {
  return TEE_SUCCESS;
}

void TA_DestroyEntryPoint() {}

TEE_Result TA_OpenSessionEntryPoint(uint32_t, TEE_Param[4], void **) {
  return TEE_SUCCESS;
}

void TA_CloseSessionEntryPoint(void *) {}

TEE_Result TA_InvokeCommandEntryPoint(void *, uint32_t, uint32_t types, TEE_Param params[4]) {
  if (TEE_PARAM_TYPE_GET(types, 0) != TEE_PARAM_TYPE_VALUE_OUTPUT) return TEE_ERROR_BAD_PARAMETERS;
  params[0].value.a = ++g_calls;
  return TEE_SUCCESS;
}
