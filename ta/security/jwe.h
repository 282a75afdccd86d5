// SPDX-License-Identifier: BSD-2-Clause
/// JSON Web Encryption objects (RFC 7516, JSON serialization with one recipient):
///
///     {"protect", "recipients": [{"header": {"alg": "RSA1_5"}, "encrypted_key"}],
///      "iv", "ciphertext", "tag"}
///
/// All values are base64url. The content key (CEK) travels under RSAES-PKCS1-v1_5; the content is
/// encrypted with A128CBC-HS256 (RFC 7518, 5.2.3) or A128GCM (RFC 7518, 5.3). Failures are
/// reported as NULL, and logged with the step.
#ifndef JWE_H
#define JWE_H

#include <stdint.h>

#include "platform.h"
#include "state/json.h"

#define JWE_HEADER_A128CBC_HS256 "{\"alg\":\"dir\",\"enc\":\"A128CBC-HS256\"}"
#define JWE_HEADER_A128GCM "{\"alg\":\"dir\",\"enc\":\"A128GCM\"}"

/// A new JWE object over the compact text of `value` for the RSA public key `key`. `header` is
/// one of the two texts above and chooses the scheme.
JSON_Value *encrypt_json(TEE_ObjectHandle key, const JSON_Value *value, const char *header);

/// The plaintext of a JWE object, parsed; `key` is the RSA key pair of its recipient. The bytes of
/// the protected header choose A128GCM; anything else is taken as A128CBC-HS256.
JSON_Value *decrypt_json(TEE_ObjectHandle key, const JSON_Value *jwe);

// ---- The steps

JSON_Value *encrypt_json_with_aes_cbc(TEE_ObjectHandle key, const JSON_Value *value,
                                      const char *header);
JSON_Value *encrypt_json_with_aes_gcm(TEE_ObjectHandle key, const JSON_Value *value,
                                      const char *header);

/// The same with a given IV and CEK: 16 and 32 bytes for CBC, 12 and 16 for GCM.
JSON_Value *encrypt_json_with_cbc_iv_cek(TEE_ObjectHandle key, const JSON_Value *value,
                                         const uint8_t *iv, uint32_t iv_len, const uint8_t *cek,
                                         uint32_t cek_len, const char *header, uint32_t header_len);
JSON_Value *encrypt_json_with_gcm_iv_cek(TEE_ObjectHandle key, const JSON_Value *value,
                                         const uint8_t *iv, uint32_t iv_len, const uint8_t *cek,
                                         uint32_t cek_len, const char *header, uint32_t header_len);

/// A JWE object from its parts.
JSON_Value *construct_json_encrypt(const char *header, uint32_t header_len,
                                   const uint8_t *encrypted_cek, uint32_t encrypted_cek_len,
                                   const uint8_t *iv, uint32_t iv_len, const uint8_t *cipher,
                                   uint32_t cipher_len, const uint8_t *tag, uint32_t tag_len);

/// The A128CBC-HS256 tag (RFC 7518, 5.2.2.1) with the front half of the CEK, in a new buffer
/// of which `*tag_len` bytes are the tag.
[[nodiscard]] TEE_Result compute_jwe_auth_tag(const uint8_t *cek, uint32_t cek_len,
                                              const uint8_t *aad, uint32_t aad_len,
                                              const uint8_t *cipher, uint32_t cipher_len,
                                              const uint8_t *iv, uint32_t iv_len, uint8_t **tag,
                                              uint32_t *tag_len);
[[nodiscard]] TEE_Result verify_jwe_auth_tag(const uint8_t *cek, uint32_t cek_len,
                                             const uint8_t *aad, uint32_t aad_len,
                                             const uint8_t *cipher, uint32_t cipher_len,
                                             const uint8_t *iv, uint32_t iv_len, const uint8_t *tag,
                                             uint32_t tag_len);

/// `header` is the decoded protected header. A CEK of another length than the scheme's is refused.
JSON_Value *decrypt_json_with_aes_cbc(TEE_ObjectHandle key, const uint8_t *cipher,
                                      uint32_t cipher_len, const uint8_t *iv, uint32_t iv_len,
                                      const uint8_t *encrypted_cek, uint32_t encrypted_cek_len,
                                      const uint8_t *header, uint32_t header_len,
                                      const uint8_t *tag, uint32_t tag_len);
JSON_Value *decrypt_json_with_aes_gcm(TEE_ObjectHandle key, const uint8_t *cipher,
                                      uint32_t cipher_len, const uint8_t *iv, uint32_t iv_len,
                                      const uint8_t *encrypted_cek, uint32_t encrypted_cek_len,
                                      const uint8_t *header, uint32_t header_len,
                                      const uint8_t *tag, uint32_t tag_len);

#endif
