// SPDX-License-Identifier: BSD-2-Clause
/// Attestation identity keys (AIKs): one RSA key pair for each service provider, made here, never
/// seen outside, and stored as a key box with what else is recorded of the provider.
#ifndef AIK_H
#define AIK_H

#include <stdint.h>

#include "crypto/tlv_box.h"
#include "platform.h"

/// Makes a key pair of kRsaKeyBits bits. The box is open: it can still be added to.
[[nodiscard]] TEE_Result generate_aik(tlv_box **box);

/// The SP's key box. OTRP_MISSING without a spid or when the record holds no key,
/// OTRP_SP_NOT_FOUND without a readable record, OTRP_NO_MEMORY when the key is no box.
[[nodiscard]] TEE_Result get_aik_tlv_box_by_spid(const char *spid, tlv_box **box);

/// The same, for who would make a new key in the place of one that is not there. After a failure
/// `*doubt` is TEE_SUCCESS when the SP certainly has no AIK, and otherwise says why that is open:
/// a code of the storage, or OTRP_NO_MEMORY for a record or key that could not be taken apart.
[[nodiscard]] TEE_Result find_aik(const char *spid, tlv_box **box, TEE_Result *doubt);

/// What the SP's box holds, ready for use by the platform; codes as above.
[[nodiscard]] TEE_Result get_aik_key_handle(const char *spid, TEE_ObjectHandle *key);

/// Its public half, encoded, in a new buffer; codes as above.
[[nodiscard]] TEE_Result read_public_aik(const char *spid, uint8_t **encoded,
                                         uint32_t *encoded_len);

#endif
