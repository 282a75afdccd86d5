// SPDX-License-Identifier: BSD-2-Clause
/// What the platform does with operation objects, as calls on byte buffers: AES in GCM and in CBC
/// (padded by PKCS#7), HMAC and digests of SHA-256, random bytes.
///
/// A call is a whole operation from a key in bytes to new buffers, and leaves nothing behind in the
/// platform. Codes: TEE_ERROR_BAD_PARAMETERS for a missing out-pointer, TEE_ERROR_OUT_OF_MEMORY,
/// TEE_ERROR_GENERIC for an AES key that the platform does not take, else the platform's own.
#ifndef SYMMETRIC_H
#define SYMMETRIC_H

#include <stdint.h>

#include "data_part.h"
#include "platform.h"

constexpr uint32_t kAesBlockLen = 16;
constexpr uint32_t kGcmTagLen = 16;
constexpr uint32_t kHmacSha256Len = 32;
constexpr uint32_t kSha256Len = 32;
constexpr uint32_t T_LEN =
    16;  // tag of A128CBC-HS256: the first half of the HMAC (RFC 7518, 5.2.3)

/// A key object of `key`, the caller's to free. NULL, and a line in the log, when it is no AES key.
TEE_ObjectHandle allocate_aes_key(const uint8_t *key, uint32_t key_len);

/// The ciphertext, of the length of `plain`, and kGcmTagLen bytes of tag.
[[nodiscard]] TEE_Result aes_gcm_encrypt(const uint8_t *key, uint32_t key_len, const uint8_t *iv,
                                         uint32_t iv_len, const uint8_t *aad, uint32_t aad_len,
                                         const uint8_t *plain, uint32_t plain_len, uint8_t **cipher,
                                         uint32_t *cipher_len, uint8_t **tag, uint32_t *tag_len);

/// The plaintext, with a zero byte behind it that is not counted. TEE_ERROR_MAC_INVALID when the
/// tag, the additional data or the ciphertext was changed.
[[nodiscard]] TEE_Result aes_gcm_decrypt(const uint8_t *key, uint32_t key_len, const uint8_t *iv,
                                         uint32_t iv_len, const uint8_t *aad, uint32_t aad_len,
                                         const uint8_t *tag, uint32_t tag_len,
                                         const uint8_t *cipher, uint32_t cipher_len,
                                         uint8_t **plain, uint32_t *plain_len);

/// Pads to whole blocks, always by at least one byte.
[[nodiscard]] TEE_Result aes_cbc_encrypt(const uint8_t *key, uint32_t key_len, const uint8_t *iv,
                                         uint32_t iv_len, const uint8_t *plain, uint32_t plain_len,
                                         uint8_t **cipher, uint32_t *cipher_len);

/// The plaintext without its padding, with a zero byte behind it that is not counted.
/// TEE_ERROR_BAD_FORMAT when the padding is wrong or nothing was decrypted.
[[nodiscard]] TEE_Result aes_cbc_decrypt(const uint8_t *key, uint32_t key_len, const uint8_t *iv,
                                         uint32_t iv_len, const uint8_t *cipher,
                                         uint32_t cipher_len, uint8_t **plain, uint32_t *plain_len);

/// Decrypts `buffer` where it lies, block by block: there is no room for a TA image twice. Takes
/// the buffer over: `*plain` is the same buffer, and after a failure it has been wiped and freed,
/// except when an out-pointer was missing.
[[nodiscard]] TEE_Result aes_cbc_decrypt_with_update_block(const uint8_t *key, uint32_t key_len,
                                                           const uint8_t *iv, uint32_t iv_len,
                                                           uint8_t *buffer, uint32_t buffer_len,
                                                           uint8_t **plain, uint32_t *plain_len);

/// Checks PKCS#7 padding (RFC 5652, 6.3, block size 16). TEE_ERROR_BAD_FORMAT when it is wrong.
[[nodiscard]] TEE_Result remove_pkcs_pading_length(const uint8_t *data, uint32_t len,
                                                   uint32_t *unpadded_len);

/// `*mac` receives all 32 bytes of the HMAC, `*mac_len` is T_LEN: the part that serves as the tag.
[[nodiscard]] TEE_Result Compute_HmacSha256(const uint8_t *data, uint32_t data_len,
                                            const uint8_t *key, uint32_t key_len, uint8_t **mac,
                                            uint32_t *mac_len);

/// Compares the first `mac_len` bytes of the HMAC, at most 32, in constant time.
/// TEE_ERROR_MAC_INVALID when they differ.
[[nodiscard]] TEE_Result Verify_HmacSha256(const uint8_t *data, uint32_t data_len,
                                           const uint8_t *key, uint32_t key_len, const uint8_t *mac,
                                           uint32_t mac_len);

/// `*digest_len` is the capacity of `digest` and then the digest's length.
[[nodiscard]] TEE_Result do_digest_with_sha(uint32_t algorithm, const void *data, uint32_t data_len,
                                            uint8_t *digest, uint32_t *digest_len);

/// The digest of the parts as if they stood behind each other.
[[nodiscard]] TEE_Result compute_string_array_digest_with_update(uint32_t algorithm,
                                                                 const data_part *parts,
                                                                 uint32_t num_parts,
                                                                 uint8_t *digest,
                                                                 uint32_t *digest_len);

/// New random bytes, or NULL.
uint8_t *gen_random_bytes(uint32_t len);

/// The AES half of a 32-byte composite key: MAC key first, AES key last (RFC 7518, 5.2.2.1).
inline const uint8_t *get_aes_key_from_cek(const uint8_t *cek) {
  return cek + 16;
}

#endif
