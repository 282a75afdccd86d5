// SPDX-License-Identifier: BSD-2-Clause
/// Shared by the messages that bring a TA image.
#ifndef INSTALL_TA_H
#define INSTALL_TA_H

#include <stdint.h>

#include "operations/exchange.h"
#include "ownership.h"
#include "platform.h"
#include "state/ta_register.h"

/// Decrypts the TA image of "encrypted_ta": {"key", "iv", FIELD}, with the AIK of SP `spid`.
/// `field` names the ciphertext member. The image and its SHA-256 digest (32 bytes) come in new
/// buffers. OTRP_TA_DECRYPT_FAILED when something does not decode or decrypt, OTRP_MISSING,
/// OTRP_NO_MEMORY.
[[nodiscard]] TEE_Result verify_encrypted_ta(const char *field, const char *spid,
                                             const jsmn_object *encrypted_ta, uint8_t **image,
                                             uint32_t *image_len, uint8_t **digest);

/// Names the TA in the response, lets the decrypted image go along with it and changes the TA's row
/// of the register, which refuses an image that is too short to have a header.
[[nodiscard]] TEE_Result hand_over_image(exchange *x, const char *taid,
                                         ta_register_operation operation_code, secret_bytes *plain);

#endif
