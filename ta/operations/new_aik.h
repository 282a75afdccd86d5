// SPDX-License-Identifier: BSD-2-Clause
/// A new AIK for an SP, step by step, as CreateSD and UpdateSD make it: the same texts, under the
/// name of the operation `as`.
#ifndef NEW_AIK_H
#define NEW_AIK_H

#include <stdint.h>

#include "crypto/tlv_box.h"
#include "platform.h"
#include "state/json.h"

/// The encoded public key of a key box, in a new buffer.
[[nodiscard]] TEE_Result read_public_half(const tlv_box *box, uint8_t **pubkey,
                                          uint32_t *pubkey_len,
                                          const char *as = __builtin_FUNCTION());

/// Makes the key: a box that can still be serialized, and what the world may see of it.
[[nodiscard]] TEE_Result make_aik(box_ptr *box, uint8_t **pubkey, uint32_t *pubkey_len,
                                  const char *as = __builtin_FUNCTION());

/// Makes the key the SP's only one in the in-memory DSI, where a renewed key stands, or one that an
/// earlier attempt announced and never stored.
[[nodiscard]] TEE_Result announce_aik(const char *spid, const uint8_t *pubkey, uint32_t pubkey_len,
                                      const char *as = __builtin_FUNCTION());

/// The key box as the base64 text that an SP record holds: private key material.
[[nodiscard]] TEE_Result encode_aik(tlv_box *box, char **encoded,
                                    const char *as = __builtin_FUNCTION());

/// Sets "teespaik" in a response's content.
[[nodiscard]] TEE_Result set_teespaik(JSON_Object *content, const uint8_t *pubkey,
                                      uint32_t pubkey_len, const char *as = __builtin_FUNCTION());

#endif
