// SPDX-License-Identifier: BSD-2-Clause
/// Whom the device listens to.
///
/// The build decides on one key, that of the CA for TSMs. Whoever has its signature under a key of
/// his own is admitted, by bringing both along when he asks for the device's state:
///
///     "tsm_key_chain": {"ca_tsm_hash", "tsm_list": [{"tsmid", "tsm_pub_key", "signature"}]}
///
/// "ca_tsm_hash" names the CA: SHA-256 over its encoded key (crypto/rsa.h) in base64url, written in
/// hexadecimal. An entry's signature covers a 12-byte block, the tsmid and the decoded
/// key; the block is, little-endian,
///
///     0x70004830 (4 bytes) | 3 (2) | 256 (2) | tsmid length (2) | signature length (2)
///
/// An admitted key lies in storage in the form in which it came, under its tsmid, for good.
#ifndef TSM_TRUST_H
#define TSM_TRUST_H

#include <stdint.h>

#include "platform.h"
#include "state/json.h"

struct jsmn_object;

/// Admits the TSMs that a GetDeviceState payload, a NUL-terminated JSON text, brings, one after the
/// other: a bad entry ends it, and those before it are admitted. OTRP_CA_CHECK_FAILED when the
/// chain was issued under another CA or a signature is wrong; OTRP_BAD_REQUEST or OTRP_MISSING when
/// something is not there; OTRP_NO_MEMORY when something does not decode; a storage code.
[[nodiscard]] TEE_Result handle_tsm_key_chain(const char *payload);

/// Whether the CA has signed this entry of a chain; codes as above.
[[nodiscard]] TEE_Result verify_tsm_pub_key(const JSON_Object *entry);

[[nodiscard]] TEE_Result save_tsm_pub_key_to_persistent_object(const char *tsmid,
                                                               const char *key_text);

/// An admitted TSM's key as a new key object. TEE_ERROR_ITEM_NOT_FOUND when none was admitted. A
/// record without data gives TEE_SUCCESS and no key.
[[nodiscard]] TEE_Result get_tsm_pubkey_by_tsmid(const char *tsmid, TEE_ObjectHandle *key);

/// Checks that the CA has approved this image for this device and transaction: it has signed the
/// texts tid, rid, device ID, taid and tsmid, one behind the other, as "signature2" of `request`.
/// `tbs` has the first two.
[[nodiscard]] TEE_Result verify_tsm_installta_updateta_signature(const jsmn_object *tbs,
                                                                 const char *tsmid,
                                                                 const char *taid,
                                                                 const jsmn_object *request);

// ---- The steps

/// Key objects, or NULL: of the key that the build decided on, and of any other.
TEE_ObjectHandle convert_ca_tsm_to_pubkey();
TEE_ObjectHandle convert_tsm_n_e_to_pubkey(const uint8_t *n, uint32_t n_len, const uint8_t *e,
                                           uint32_t e_len);

/// The CA's encoded key as a base64url text, and 32 bytes of SHA-256 over those characters.
[[nodiscard]] TEE_Result get_ca_tsm_encoded_string(char **text);
[[nodiscard]] TEE_Result get_ca_tsm_encoded_string_hash(uint8_t **hash, uint32_t *hash_len);

#endif
