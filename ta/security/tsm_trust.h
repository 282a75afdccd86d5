// SPDX-License-Identifier: BSD-2-Clause
/// The trust chain that admits TSM keys, and the store of admitted keys.
///
/// One key is trusted by construction, the CA-TSM key, which is compiled in. It signs TSM keys,
/// which reach the device in the key chain of a GetDeviceState request:
///
///     "tsm_key_chain": {"ca_tsm_hash", "tsm_list": [{"tsmid", "tsm_pub_key", "signature"}]}
///
/// "ca_tsm_hash" is the SHA-256, in hexadecimal, of the base64url text of the CA-TSM key's
/// encoding (crypto/rsa.h). An entry's signature covers a 12-byte block, the tsmid and the decoded
/// key; the block is, little-endian,
///
///     0x70004830 (4 bytes) | 3 (2) | 256 (2) | tsmid length (2) | signature length (2)
///
/// Admitted keys are stored as they came, one object for each tsmid, and never removed.
#ifndef TSM_TRUST_H
#define TSM_TRUST_H

#include <stdint.h>

#include "platform.h"
#include "state/json.h"

struct jsmn_object;

/// Admits and stores the keys of a GetDeviceState payload, a NUL-terminated JSON text, entry by
/// entry: those before a failing one stay stored. OTRP_CA_CHECK_FAILED when the chain was issued
/// under another CA or a signature is wrong; OTRP_BAD_REQUEST or OTRP_MISSING when something is
/// not there; OTRP_NO_MEMORY when something does not decode; a storage code.
[[nodiscard]] TEE_Result handle_tsm_key_chain(const char *payload);

/// Checks one entry of "tsm_list" against the CA-TSM key.
[[nodiscard]] TEE_Result verify_tsm_pub_key(const JSON_Object *entry);

[[nodiscard]] TEE_Result save_tsm_pub_key_to_persistent_object(const char *tsmid,
                                                               const char *key_text);

/// The TSM's public key as a new key object. TEE_ERROR_ITEM_NOT_FOUND when none was admitted. A
/// record without data gives TEE_SUCCESS and no key.
[[nodiscard]] TEE_Result get_tsm_pubkey_by_tsmid(const char *tsmid, TEE_ObjectHandle *key);

/// Checks "signature2" of the outer request: the CA-TSM key's signature over tid, rid, device ID,
/// taid and tsmid. `tbs` is the to-be-signed request object.
[[nodiscard]] TEE_Result verify_tsm_installta_updateta_signature(const jsmn_object *tbs,
                                                                 const char *tsmid,
                                                                 const char *taid,
                                                                 const jsmn_object *request);

// ---- The steps

/// Splits an encoded public key into new buffers. OTRP_NO_MEMORY when it ends too early.
[[nodiscard]] TEE_Result read_pubkey_buf_to_n_and_e(const uint8_t *encoded, uint32_t encoded_len,
                                                    uint8_t **n, uint32_t *n_len, uint8_t **e,
                                                    uint32_t *e_len);

/// New RSA public-key objects, or NULL: the CA-TSM key, and one from modulus and exponent.
TEE_ObjectHandle convert_ca_tsm_to_pubkey();
TEE_ObjectHandle convert_tsm_n_e_to_pubkey(const uint8_t *n, uint32_t n_len, const uint8_t *e,
                                           uint32_t e_len);

/// The base64url text of the CA-TSM key's encoding, and the SHA-256 of that text, 32 bytes.
[[nodiscard]] TEE_Result get_ca_tsm_encoded_string(char **text);
[[nodiscard]] TEE_Result get_ca_tsm_encoded_string_hash(uint8_t **hash, uint32_t *hash_len);

#endif
