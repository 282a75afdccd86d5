// SPDX-License-Identifier: BSD-2-Clause
/// Shared by the messages that bring a TA image.
#ifndef INSTALL_TA_H
#define INSTALL_TA_H

#include <stdint.h>
#include <tee_internal_api.h>

#include "message.h"

/// Decrypts the TA image of "encrypted_ta": {"key", "iv", FIELD}, with the AIK of SP `spid`.
/// `field` names the ciphertext member. The image and its SHA-256 digest (32 bytes) come in new
/// buffers. OTRP_TA_DECRYPT_FAILED when something does not decode or decrypt, OTRP_MISSING,
/// OTRP_NO_MEMORY.
[[nodiscard]] TEE_Result verify_encrypted_ta(const char *field, const char *spid,
                                             const jsmn_object *encrypted_ta, uint8_t **image,
                                             uint32_t *image_len, uint8_t **digest);

/// Wipes and frees an image that is not handed over after all.
void drop_image(ta_image *image);

/// The image as the TA register takes it: NULL when it is too short to have a header.
const uint8_t *image_with_header(const ta_image &image);

#endif
