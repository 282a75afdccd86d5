// SPDX-License-Identifier: BSD-2-Clause
// GetDeviceState: the device state, encrypted for the TSM that asks. A failure has no response.
#include "failure.h"
#include "frame/response_fields.h"
#include "operations/exchange.h"
#include "operations/operations.h"
#include "otrp_result.h"
#include "security/jwe.h"
#include "security/tsm_trust.h"
#include "state/dsi.h"

static TEE_Result add_edsi(const char *tsmid, JSON_Object *response) {
  const json_ptr dsi(construct_dsi());
  key_object key;
  const TEE_Result found = get_tsm_pubkey_by_tsmid(tsmid, out(key));
  CHECK(found == TEE_SUCCESS && key, found != TEE_SUCCESS ? found : OTRP_MISSING,
        "convert_ca_to_pubkey error code: 0x%x", found);
  json_ptr jwe(dsi ? encrypt_json(key.get(), dsi.get(), JWE_HEADER_A128CBC_HS256) : nullptr);
  CHECK(jwe, OTRP_RESPONSE_FAILED, "encrypt_json error");
  return static_cast<TEE_Result>(json_object_take(response, "edsi", &jwe));
}

TEE_Result getdevstat_process(const char *tsmid, const jsmn_object *tbs, char **response,
                              ta_image *, const jsmn_object *) {
  const json_ptr root(json_value_init_object());
  if (tbs == nullptr || response == nullptr) return OTRP_MISSING;
  *response = nullptr;
  JSON_Object *members = json_value_get_object(root.get());
  CHECK(root && members != nullptr, OTRP_NO_MEMORY,
        "json error response_value %p response_object %p\n", static_cast<void *>(root.get()),
        static_cast<void *>(members));
  const token_object_ptr request(jsmn_object_get_object(tbs, "GetDeviceStateTBSRequest"));
  CHECK(request, OTRP_BAD_REQUEST, "request_object is null");

  TRY(add_ver_rid_tid(members, request.get()));
  TRY(static_cast<TEE_Result>(json_object_set_string(members, "signerreq", "true")));
  TRY(add_edsi(tsmid, members));
  *response = json_serialize_to_string(root.get());
  CHECK(*response != nullptr, OTRP_NO_MEMORY, "parse response_json to json string get NULL");
  return TEE_SUCCESS;
}
