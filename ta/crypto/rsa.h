// SPDX-License-Identifier: BSD-2-Clause
/// RSA keys as TLV boxes and as encoded public keys, and the RSA operations on key objects.
///
/// A key box holds these records, numbers of a key in big-endian as the platform has them:
///
///     0x10 key size in bits (a word, little-endian)
///     0x11 modulus    0x12 public exponent    0x13 private exponent
///     0x14 first prime    0x15 second prime    0x16, 0x17 CRT exponents    0x18 CRT coefficient
///
/// The last five come together or not at all. An encoded public key is
///
///     modulus length (4 bytes, little-endian) | modulus | exponent length (same) | exponent
///
/// Nothing here logs except where it is said.
#ifndef RSA_H
#define RSA_H

#include <stdint.h>

#include "crypto/tlv_box.h"
#include "data_part.h"
#include "platform.h"

enum rsa_record : uint16_t {
  kRsaKeySize = 0x10,
  kRsaModulus = 0x11,
  kRsaPublicExponent = 0x12,
  kRsaPrivateExponent = 0x13,
  kRsaPrime1 = 0x14,
  kRsaPrime2 = 0x15,
  kRsaExponent1 = 0x16,
  kRsaExponent2 = 0x17,
  kRsaCoefficient = 0x18,
};

constexpr uint32_t kRsaKeyBits = 2048;
constexpr uint32_t kRsaSignatureLen = kRsaKeyBits / 8;

/// A fresh key pair of `bits` bits with the platform's default exponent, 65537.
[[nodiscard]] TEE_Result allocate_rsa_key_object(uint32_t bits, TEE_ObjectHandle *key);
void free_rsa_key_object(TEE_ObjectHandle key);

/// A new box, not serialized yet, with the key pair's records.
[[nodiscard]] TEE_Result serialize_rsa_key_to_tlv(TEE_ObjectHandle key, tlv_box **box);

/// Makes a key object of what a box holds; NULL when that is no key pair.
TEE_ObjectHandle deserialize_rsa_key_from_tlv(const tlv_box *box);

/// New copies of modulus and exponent. TEE_ERROR_NO_DATA (logged) without a box or out-pointer,
/// TEE_ERROR_BAD_FORMAT when a record is missing or larger than the key.
[[nodiscard]] TEE_Result get_rsa_pubkey_from_tlv(const tlv_box *box, uint8_t **modulus,
                                                 uint32_t *modulus_len, uint8_t **exponent,
                                                 uint32_t *exponent_len);

/// The encoded public key of a box, in a new buffer. Logs.
[[nodiscard]] TEE_Result parse_key_tlv_box_to_encoded_pubkey(const tlv_box *box, uint8_t **encoded,
                                                             uint32_t *encoded_len);

/// The encoded public key of these, in a new buffer; NULL: no memory.
uint8_t *encode_public_key(const data_part &modulus, const data_part &exponent, uint32_t *len);

/// Modulus and exponent of an encoded key, in new buffers. OTRP_NO_MEMORY when it ends too early.
/// Logs.
[[nodiscard]] TEE_Result read_pubkey_buf_to_n_and_e(const uint8_t *encoded, uint32_t encoded_len,
                                                    uint8_t **n, uint32_t *n_len, uint8_t **e,
                                                    uint32_t *e_len);

/// RSAES-PKCS1-v1_5 (RFC 8017, 7.2) into a new buffer. A NULL key is TEE_ERROR_BAD_PARAMETERS, as
/// in the other three.
[[nodiscard]] TEE_Result rsa_encrypt(TEE_ObjectHandle key, const uint8_t *input, uint32_t input_len,
                                     uint8_t **output, uint32_t *output_len);
[[nodiscard]] TEE_Result rsa_decrypt(TEE_ObjectHandle key, const uint8_t *input, uint32_t input_len,
                                     uint8_t **output, uint32_t *output_len);

/// RSASSA-PKCS1-v1_5 with SHA-256 (RFC 8017, 8.2) of the parts as if they stood behind each other.
/// `*signature_len` is the capacity of `signature`, then the signature's length.
[[nodiscard]] TEE_Result sha_compute_signature(TEE_ObjectHandle key, const data_part *parts,
                                               uint32_t num_parts, uint8_t *signature,
                                               uint32_t *signature_len);

/// TEE_ERROR_SIGNATURE_INVALID when the signature is another's or of other parts.
[[nodiscard]] TEE_Result sha_verify_signature(TEE_ObjectHandle key, const data_part *parts,
                                              uint32_t num_parts, const uint8_t *signature,
                                              uint32_t signature_len);

/// The same for a SHA-256 digest that the caller has computed.
[[nodiscard]] TEE_Result sha_verify_digest(TEE_ObjectHandle key, const uint8_t *digest,
                                           uint32_t digest_len, const uint8_t *signature,
                                           uint32_t signature_len);

#endif
