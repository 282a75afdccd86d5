// SPDX-License-Identifier: BSD-2-Clause
// Where the TEE comes in, and which command goes where.
#include "crypto/corvel_client.h"
#include "failure.h"
#include "frame/pipeline.h"
#include "frame/status_query.h"
#include "state/dsi.h"

namespace {

enum command : uint32_t {
  kOtrpMessage = 0,
  kStatusQuery = 1,
  kDeviceId = 2,
};

constexpr uint32_t kParamTypes =
    TEE_PARAM_TYPES(TEE_PARAM_TYPE_MEMREF_INPUT, TEE_PARAM_TYPE_MEMREF_OUTPUT, TEE_PARAM_TYPE_NONE,
                    TEE_PARAM_TYPE_NONE);
static_assert(kParamTypes == 0x65);

}  // namespace

TEE_Result TA_CreateEntryPoint(void) {
  g_dsi = init_dsi();
  CHECK(g_dsi != nullptr, TEE_ERROR_BAD_STATE, "init_dsi error");
  return TEE_SUCCESS;
}

void TA_DestroyEntryPoint(void) {
  dsi_json_str_free(g_dsi);
  g_dsi = nullptr;
}

TEE_Result TA_OpenSessionEntryPoint(uint32_t, TEE_Param[4], void **) {
  return TEE_SUCCESS;
}

void TA_CloseSessionEntryPoint(void *) {}

TEE_Result TA_InvokeCommandEntryPoint(void *, uint32_t command_id, uint32_t param_types,
                                      TEE_Param params[4]) {
  CHECK(param_types == kParamTypes, TEE_ERROR_BAD_PARAMETERS, "otrp: bad param types: 0x%x\n",
        param_types);
  // The parameters lie where the normal world cannot change them; only the buffers are shared.
  const auto &in = params[0].memref;
  auto &out = params[1].memref;
  const auto in_len = static_cast<uint32_t>(in.size);
  auto out_len = static_cast<uint32_t>(out.size);
  TEE_Result result = TEE_ERROR_GENERIC;
  switch (command_id) {
    case kOtrpMessage:
      result = OTrP_TaInvokeCmd(in.buffer, in_len, out.buffer, &out_len);
      break;
    case kStatusQuery:
      result = os_query_otrp(in.buffer, in_len, out.buffer, &out_len);
      break;
    case kDeviceId:
      result = corvel_get_device_id(out.buffer, &out_len);
      break;
    default:
      break;
  }
  out.size = out_len;
  return result;
}
