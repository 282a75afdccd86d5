// SPDX-License-Identifier: BSD-2-Clause
#include "operations/new_aik.h"

#include "crypto/aik.h"
#include "crypto/base64.h"
#include "crypto/rsa.h"
#include "failure.h"
#include "otrp_result.h"
#include "ownership.h"
#include "state/dsi.h"

TEE_Result read_public_half(const tlv_box *box, uint8_t **pubkey, uint32_t *pubkey_len,
                            const char *as) {
  TRY_LOG_AS(as, parse_key_tlv_box_to_encoded_pubkey(box, pubkey, pubkey_len),
             "parse_key_tlv_box_to_encoded_pubkey fail error code: 0x%x");
  CHECK_AS(as, *pubkey != nullptr, OTRP_NO_MEMORY,
           "parse_key_tlv_box_to_encoded_pubkey return value is NULL");
  return TEE_SUCCESS;
}

TEE_Result make_aik(box_ptr *box, uint8_t **pubkey, uint32_t *pubkey_len, const char *as) {
  TRY_LOG_AS(as, generate_aik(out(*box)), "generate_aik error code: 0x%x");
  CHECK_AS(as, *box, OTRP_NO_MEMORY, "generate_aik return box is NULL");
  return read_public_half(box->get(), pubkey, pubkey_len, as);
}

TEE_Result announce_aik(const char *spid, const uint8_t *pubkey, uint32_t pubkey_len,
                        const char *as) {
  TRY_LOG_AS(as, delete_dsi_spl_item_with_spid(g_dsi, spid),
             "delete_dsi_spl_item_with_spid error code: 0x%x");
  TRY_LOG_AS(as, dsi_add_sp_aik(g_dsi, spid, pubkey, pubkey_len, "RSA"),
             "dsi_add_sp_aik to sync dsi in mem fail error code: 0x%x");
  return TEE_SUCCESS;
}

TEE_Result encode_aik(tlv_box *box, char **encoded, const char *as) {
  CHECK_AS(as, tlv_box_serialize(box) == 0, OTRP_NO_MEMORY, "Serialize object error\n");
  *encoded = base64EncodeAddEndZero(tlv_box_get_buffer(box), tlv_box_get_size(box));
  CHECK_AS(as, *encoded != nullptr, OTRP_NO_MEMORY, "base64EncodeAddEndZero pubkey fail");
  return TEE_SUCCESS;
}

TEE_Result set_teespaik(JSON_Object *content, const uint8_t *pubkey, uint32_t pubkey_len,
                        const char *as) {
  const data_part key = {pubkey, pubkey_len};
  CHECK_AS(as, json_object_set_base64url(content, "teespaik", key) == JSONSuccess, OTRP_NO_MEMORY,
           "base64urlEncodeAddEndZero aik_data_buf len: 0x%x failed.\n", pubkey_len);
  return TEE_SUCCESS;
}
