// SPDX-License-Identifier: BSD-2-Clause
#include "crypto/rsa.h"

#include "crypto/symmetric.h"
#include "cursor.h"
#include "failure.h"
#include "otrp_result.h"
#include "ownership.h"
#include "platform.h"

namespace {

struct key_component {
  uint16_t type;
  uint32_t attribute;
};

// Boxes are filled, and the platform is given them, in this order.
const key_component kComponents[] = {
    {kRsaModulus, TEE_ATTR_RSA_MODULUS},
    {kRsaPublicExponent, TEE_ATTR_RSA_PUBLIC_EXPONENT},
    {kRsaPrivateExponent, TEE_ATTR_RSA_PRIVATE_EXPONENT},
    {kRsaPrime1, TEE_ATTR_RSA_PRIME1},
    {kRsaPrime2, TEE_ATTR_RSA_PRIME2},
    {kRsaExponent1, TEE_ATTR_RSA_EXPONENT1},
    {kRsaExponent2, TEE_ATTR_RSA_EXPONENT2},
    {kRsaCoefficient, TEE_ATTR_RSA_COEFFICIENT},
};
constexpr uint32_t kNumComponents = sizeof(kComponents) / sizeof(kComponents[0]);
constexpr uint32_t kNumWithoutCrt = 3;

}  // namespace

// ---- Key objects and boxes

TEE_Result allocate_rsa_key_object(uint32_t bits, TEE_ObjectHandle *key) {
  if (key == nullptr) return TEE_ERROR_BAD_PARAMETERS;
  *key = TEE_HANDLE_NULL;

  key_object pair;
  TRY(TEE_AllocateTransientObject(TEE_TYPE_RSA_KEYPAIR, bits, out(pair)));
  TRY(TEE_GenerateKey(pair.get(), bits, nullptr, 0));
  *key = pair.release();
  return TEE_SUCCESS;
}

void free_rsa_key_object(TEE_ObjectHandle key) {
  TEE_FreeTransientObject(key);
}

static TEE_Result key_bits(TEE_ObjectHandle key, uint32_t *bits) {
  TEE_ObjectInfo info = {};
  if (key == TEE_HANDLE_NULL || TEE_GetObjectInfo1(key, &info) != TEE_SUCCESS ||
      info.maxObjectSize == 0) {
    return TEE_ERROR_BAD_PARAMETERS;
  }
  *bits = info.maxObjectSize;
  return TEE_SUCCESS;
}

static TEE_Result put_component(TEE_ObjectHandle key, const key_component &component,
                                secret_bytes *scratch, tlv_box *box) {
  tee_length len = scratch->len;
  TRY(TEE_GetObjectBufferAttribute(key, component.attribute, scratch->data, &len));
  const int put = tlv_box_put_bytes(box, component.type, scratch->data, static_cast<uint32_t>(len));
  return put == 0 ? TEE_SUCCESS : TEE_ERROR_OUT_OF_MEMORY;
}

TEE_Result serialize_rsa_key_to_tlv(TEE_ObjectHandle key, tlv_box **box) {
  *box = nullptr;
  uint32_t bits = 0;
  TRY(key_bits(key, &bits));

  secret_bytes scratch;
  scratch.data = allocate_bytes(bits / 4);
  box_ptr records(tlv_box_create());
  if (scratch.data == nullptr || !records) return TEE_ERROR_OUT_OF_MEMORY;
  scratch.len = bits / 4;
  if (tlv_box_put_int(records.get(), kRsaKeySize, bits) != 0) return TEE_ERROR_OUT_OF_MEMORY;

  for (uint32_t i = 0; i < kNumComponents; ++i) {
    const TEE_Result result = put_component(key, kComponents[i], &scratch, records.get());
    if (i == kNumWithoutCrt && result == TEE_ERROR_ITEM_NOT_FOUND) break;
    TRY(result);
  }
  *box = records.release();
  return TEE_SUCCESS;
}

// The size in bits that a box states; it must hold one that is positive.
static bool box_key_bits(const tlv_box *box, uint32_t *bits) {
  return tlv_box_get_int(box, kRsaKeySize, bits) == 0 && *bits != 0 &&
         *bits <= static_cast<uint32_t>(INT32_MAX);
}

TEE_ObjectHandle deserialize_rsa_key_from_tlv(const tlv_box *box) {
  uint32_t bits = 0;
  if (box == nullptr || !box_key_bits(box, &bits)) return TEE_HANDLE_NULL;
  key_object pair;
  if (TEE_AllocateTransientObject(TEE_TYPE_RSA_KEYPAIR, bits, out(pair)) != TEE_SUCCESS) {
    return TEE_HANDLE_NULL;
  }

  secret_bytes values;
  values.data = allocate_bytes(bits / 8 * 8);
  if (values.data == nullptr) return TEE_HANDLE_NULL;
  values.len = bits / 8 * 8;

  const uint8_t *prime = nullptr;
  uint32_t prime_len = 0;
  const bool has_crt = tlv_box_get_bytes_ptr(box, kRsaPrime1, &prime, &prime_len) == 0;
  const uint32_t num_attributes = has_crt ? kNumComponents : kNumWithoutCrt;
  TEE_Attribute attributes[kNumComponents];
  uint32_t used = 0;
  for (uint32_t i = 0; i < num_attributes; ++i) {
    uint32_t len = values.len - used;
    const int copied = tlv_box_get_bytes(box, kComponents[i].type, values.data + used, &len);
    // A component longer than the key would make the platform panic.
    if (copied != 0 || len > bits / 8) return TEE_HANDLE_NULL;
    TEE_InitRefAttribute(&attributes[i], kComponents[i].attribute, values.data + used, len);
    used += len;
  }
  if (TEE_PopulateTransientObject(pair.get(), attributes, num_attributes) != TEE_SUCCESS) {
    return TEE_HANDLE_NULL;
  }
  return pair.release();
}

// ---- Public keys

// A new copy of a record's value, which must not be longer than `*room`; the room shrinks by it.
static TEE_Result copy_record(const tlv_box *box, uint16_t type, uint32_t *room, uint8_t **copy,
                              uint32_t *copy_len) {
  const uint8_t *value = nullptr;
  uint32_t len = 0;
  if (tlv_box_get_bytes_ptr(box, type, &value, &len) != 0 || len > *room) {
    return TEE_ERROR_BAD_FORMAT;
  }
  *room -= len;
  *copy = allocate_bytes(len);
  if (*copy == nullptr) return TEE_ERROR_OUT_OF_MEMORY;
  memcpy(*copy, value, len);
  *copy_len = len;
  return TEE_SUCCESS;
}

TEE_Result get_rsa_pubkey_from_tlv(const tlv_box *box, uint8_t **modulus, uint32_t *modulus_len,
                                   uint8_t **exponent, uint32_t *exponent_len) {
  CHECK(box != nullptr && modulus != nullptr && modulus_len != nullptr && exponent != nullptr &&
            exponent_len != nullptr,
        TEE_ERROR_NO_DATA, "get_rsa_pubkey_from_tlv bad input");
  *modulus = nullptr;
  *modulus_len = 0;
  *exponent = nullptr;
  *exponent_len = 0;
  uint32_t bits = 0;
  if (!box_key_bits(box, &bits)) return TEE_ERROR_BAD_FORMAT;

  uint32_t room = bits / 8 * 8;
  tee_ptr<uint8_t> n;
  tee_ptr<uint8_t> e;
  uint32_t n_len = 0;
  uint32_t e_len = 0;
  TRY(copy_record(box, kRsaModulus, &room, out(n), &n_len));
  TRY(copy_record(box, kRsaPublicExponent, &room, out(e), &e_len));

  *modulus = n.release();
  *modulus_len = n_len;
  *exponent = e.release();
  *exponent_len = e_len;
  return TEE_SUCCESS;
}

uint8_t *encode_public_key(const data_part &modulus, const data_part &exponent, uint32_t *len) {
  *len = 4 + modulus.len + 4 + exponent.len;  // of a sum that wraps, there is not enough room
  tee_ptr<uint8_t> encoded(allocate_bytes(*len));
  writer out = {encoded.get(), encoded ? *len : 0};
  put_block(&out, modulus);
  put_block(&out, exponent);
  if (out.ok) return encoded.release();
  *len = 0;
  return nullptr;
}

TEE_Result parse_key_tlv_box_to_encoded_pubkey(const tlv_box *box, uint8_t **encoded,
                                               uint32_t *encoded_len) {
  *encoded = nullptr;
  *encoded_len = 0;

  tee_ptr<uint8_t> modulus;
  tee_ptr<uint8_t> exponent;
  uint32_t modulus_len = 0;
  uint32_t exponent_len = 0;
  TRY_LOG(get_rsa_pubkey_from_tlv(box, out(modulus), &modulus_len, out(exponent), &exponent_len),
          "get_rsa_pubkey_from_tlv fail error code: 0x%x");
  CHECK(modulus && modulus_len != 0 && exponent && exponent_len != 0, OTRP_MISSING,
        "get_rsa_pubkey_from_tlv return NULL");

  *encoded =
      encode_public_key({modulus.get(), modulus_len}, {exponent.get(), exponent_len}, encoded_len);
  CHECK(*encoded != nullptr, OTRP_NO_MEMORY, "allocate data_buf out of mem");
  return TEE_SUCCESS;
}

static TEE_Result copy_block(reader *in, const char *no_len, const char *no_memory, uint8_t **block,
                             uint32_t *block_len, const char *as = __builtin_FUNCTION()) {
  const uint8_t *bytes = nullptr;
  CHECK_AS(as, take_u32(in, block_len) && take(in, *block_len, &bytes), OTRP_NO_MEMORY, "%s",
           no_len);
  *block = allocate_bytes(*block_len);
  CHECK_AS(as, *block != nullptr, OTRP_NO_MEMORY, "%s", no_memory);
  memcpy(*block, bytes, *block_len);
  return TEE_SUCCESS;
}

TEE_Result read_pubkey_buf_to_n_and_e(const uint8_t *encoded, uint32_t encoded_len, uint8_t **n,
                                      uint32_t *n_len, uint8_t **e, uint32_t *e_len) {
  *n = nullptr;
  *n_len = 0;
  *e = nullptr;
  *e_len = 0;
  reader in = {encoded, encoded_len};
  tee_ptr<uint8_t> modulus;
  tee_ptr<uint8_t> exponent;
  uint32_t modulus_len = 0;
  uint32_t exponent_len = 0;
  TRY(copy_block(&in, "read_pubkey_buf_to_n_and_e read tsm_key_n_len get NULL",
                 "TEE_Malloc tsm_key_n get NULL", out(modulus), &modulus_len));
  TRY(copy_block(&in, "read_pubkey_buf_to_n_and_e read tsm_key_e_len get NULL",
                 "TEE_Malloc tsm_key_e get NULL", out(exponent), &exponent_len));
  *n = modulus.release();
  *n_len = modulus_len;
  *e = exponent.release();
  *e_len = exponent_len;
  return TEE_SUCCESS;
}

// ---- Operations

static TEE_Result start_rsa(TEE_ObjectHandle key, uint32_t bits, uint32_t algorithm,
                            TEE_OperationMode mode, operation *rsa) {
  TRY(TEE_AllocateOperation(out(*rsa), algorithm, mode, bits));
  return TEE_SetOperationKey(rsa->get(), key);
}

// TEE_AsymmetricEncrypt and TEE_AsymmetricDecrypt have the same form.
static TEE_Result rsaes(TEE_ObjectHandle key, TEE_OperationMode mode,
                        decltype(&TEE_AsymmetricEncrypt) run, const uint8_t *input,
                        uint32_t input_len, uint8_t **output, uint32_t *output_len) {
  *output = nullptr;
  *output_len = 0;
  uint32_t bits = 0;
  TRY(key_bits(key, &bits));
  secret_bytes buffer;
  buffer.data = allocate_bytes(bits / 8);
  if (buffer.data == nullptr) return TEE_ERROR_OUT_OF_MEMORY;
  buffer.len = bits / 8;

  operation rsa;
  TRY(start_rsa(key, bits, TEE_ALG_RSAES_PKCS1_V1_5, mode, &rsa));
  tee_length produced = buffer.len;
  TRY(run(rsa.get(), nullptr, 0, input, input_len, buffer.data, &produced));

  *output = buffer.release();
  *output_len = static_cast<uint32_t>(produced);
  return TEE_SUCCESS;
}

TEE_Result rsa_encrypt(TEE_ObjectHandle key, const uint8_t *input, uint32_t input_len,
                       uint8_t **output, uint32_t *output_len) {
  return rsaes(key, TEE_MODE_ENCRYPT, TEE_AsymmetricEncrypt, input, input_len, output, output_len);
}

TEE_Result rsa_decrypt(TEE_ObjectHandle key, const uint8_t *input, uint32_t input_len,
                       uint8_t **output, uint32_t *output_len) {
  return rsaes(key, TEE_MODE_DECRYPT, TEE_AsymmetricDecrypt, input, input_len, output, output_len);
}

// The digest of the parts, in a buffer as large as the key, and an operation that has the key.
static TEE_Result start_rsassa(TEE_ObjectHandle key, TEE_OperationMode mode, const data_part *parts,
                               uint32_t num_parts, tee_ptr<uint8_t> *digest, uint32_t *digest_len,
                               operation *rsa) {
  uint32_t bits = 0;
  TRY(key_bits(key, &bits));
  digest->reset(allocate_bytes(bits / 8));
  if (!*digest) return TEE_ERROR_OUT_OF_MEMORY;
  *digest_len = bits / 8;
  TRY(compute_string_array_digest_with_update(TEE_ALG_SHA256, parts, num_parts, digest->get(),
                                              digest_len));
  return start_rsa(key, bits, TEE_ALG_RSASSA_PKCS1_V1_5_SHA256, mode, rsa);
}

TEE_Result sha_compute_signature(TEE_ObjectHandle key, const data_part *parts, uint32_t num_parts,
                                 uint8_t *signature, uint32_t *signature_len) {
  tee_ptr<uint8_t> digest;
  uint32_t digest_len = 0;
  operation rsa;
  TRY(start_rsassa(key, TEE_MODE_SIGN, parts, num_parts, &digest, &digest_len, &rsa));
  tee_length produced = *signature_len;
  TRY(TEE_AsymmetricSignDigest(rsa.get(), nullptr, 0, digest.get(), digest_len, signature,
                               &produced));
  *signature_len = static_cast<uint32_t>(produced);
  return TEE_SUCCESS;
}

TEE_Result sha_verify_signature(TEE_ObjectHandle key, const data_part *parts, uint32_t num_parts,
                                const uint8_t *signature, uint32_t signature_len) {
  tee_ptr<uint8_t> digest;
  uint32_t digest_len = 0;
  operation rsa;
  TRY(start_rsassa(key, TEE_MODE_VERIFY, parts, num_parts, &digest, &digest_len, &rsa));
  return TEE_AsymmetricVerifyDigest(rsa.get(), nullptr, 0, digest.get(), digest_len, signature,
                                    signature_len);
}

TEE_Result sha_verify_digest(TEE_ObjectHandle key, const uint8_t *digest, uint32_t digest_len,
                             const uint8_t *signature, uint32_t signature_len) {
  uint32_t bits = 0;
  TRY(key_bits(key, &bits));
  operation rsa;
  TRY(start_rsa(key, bits, TEE_ALG_RSASSA_PKCS1_V1_5_SHA256, TEE_MODE_VERIFY, &rsa));
  return TEE_AsymmetricVerifyDigest(rsa.get(), nullptr, 0, digest, digest_len, signature,
                                    signature_len);
}
