// SPDX-License-Identifier: BSD-2-Clause
#include "security/jwe.h"

#include "crypto/base64.h"
#include "crypto/rsa.h"
#include "crypto/symmetric.h"
#include "cursor.h"
#include "failure.h"
#include "ownership.h"
#include "platform.h"

namespace {

constexpr uint32_t kCbcIvLen = 16;
constexpr uint32_t kCbcCekLen = 32;
constexpr uint32_t kCbcMacKeyLen = 16;
constexpr uint32_t kGcmIvLen = 12;
constexpr uint32_t kGcmCekLen = 16;
constexpr uint32_t kAlLen = 8;

const char kGcmHeader[] = JWE_HEADER_A128GCM;

// What is set besides comes behind it, in its objects.
const char kJweTemplate[] = "{\"protect\":\"\",\"recipients\":[{\"header\":{\"alg\":\"RSA1_5\"}}]}";

// The members of a JWE object, as they stand in it and decoded.
struct jwe_text {
  const char *protect;
  const char *iv;
  const char *ciphertext;
  const char *tag;
  const char *encrypted_key;
};

struct jwe_bytes {
  secret_bytes protect;
  secret_bytes iv;
  secret_bytes ciphertext;
  secret_bytes tag;
  secret_bytes encrypted_cek;
};

}  // namespace

static const uint8_t *bytes_of(const char *text) {
  return reinterpret_cast<const uint8_t *>(text);
}

static uint32_t len_of(const char *text) {
  return static_cast<uint32_t>(strlen(text));
}

// ---- Authentication tag of A128CBC-HS256

// AAD, IV, ciphertext and AL, the length of the AAD in bits (8 bytes, big-endian).
static TEE_Result make_mac_input(const data_part &aad, const data_part &iv, const data_part &cipher,
                                 tee_ptr<uint8_t> *input, uint32_t *input_len,
                                 const char *as = __builtin_FUNCTION()) {
  const uint64_t len = uint64_t{aad.len} + iv.len + cipher.len + kAlLen;
  if (len <= UINT32_MAX) input->reset(allocate_bytes(static_cast<uint32_t>(len)));
  *input_len = *input ? static_cast<uint32_t>(len) : 0;

  const uint32_t aad_bits = aad.len * 8;
  uint8_t al[kAlLen] = {};
  for (uint32_t i = 0; i < 4; ++i) al[4 + i] = static_cast<uint8_t>(aad_bits >> (24 - 8 * i));
  writer out = {input->get(), *input_len};
  put(&out, aad);
  put(&out, iv);
  put(&out, cipher);
  put(&out, {al, kAlLen});
  CHECK_AS(as, out.ok, TEE_ERROR_OUT_OF_MEMORY, "no memory for hmac_input");
  return TEE_SUCCESS;
}

TEE_Result compute_jwe_auth_tag(const uint8_t *cek, uint32_t cek_len, const uint8_t *aad,
                                uint32_t aad_len, const uint8_t *cipher, uint32_t cipher_len,
                                const uint8_t *iv, uint32_t iv_len, uint8_t **tag,
                                uint32_t *tag_len) {
  *tag = nullptr;
  *tag_len = 0;
  if (cek_len < kCbcMacKeyLen) return TEE_ERROR_BAD_PARAMETERS;
  tee_ptr<uint8_t> input;
  uint32_t input_len = 0;
  TRY(make_mac_input({aad, aad_len}, {iv, iv_len}, {cipher, cipher_len}, &input, &input_len));
  return Compute_HmacSha256(input.get(), input_len, cek, kCbcMacKeyLen, tag, tag_len);
}

TEE_Result verify_jwe_auth_tag(const uint8_t *cek, uint32_t cek_len, const uint8_t *aad,
                               uint32_t aad_len, const uint8_t *cipher, uint32_t cipher_len,
                               const uint8_t *iv, uint32_t iv_len, const uint8_t *tag,
                               uint32_t tag_len) {
  if (cek_len < kCbcMacKeyLen) return TEE_ERROR_BAD_PARAMETERS;
  tee_ptr<uint8_t> input;
  uint32_t input_len = 0;
  TRY(make_mac_input({aad, aad_len}, {iv, iv_len}, {cipher, cipher_len}, &input, &input_len));
  return Verify_HmacSha256(input.get(), input_len, cek, kCbcMacKeyLen, tag, tag_len);
}

// ---- Encryption

static bool set_encoded(JSON_Object *into, const char *key, const data_part &bytes,
                        const char *failed, const char *as = __builtin_FUNCTION()) {
  CHECK_AS(as, json_object_set_base64url(into, key, bytes) == JSONSuccess, false, "%s", failed);
  return true;
}

JSON_Value *construct_json_encrypt(const char *header, uint32_t header_len,
                                   const uint8_t *encrypted_cek, uint32_t encrypted_cek_len,
                                   const uint8_t *iv, uint32_t iv_len, const uint8_t *cipher,
                                   uint32_t cipher_len, const uint8_t *tag, uint32_t tag_len) {
  CHECK(header != nullptr && encrypted_cek != nullptr && iv != nullptr && cipher != nullptr &&
            tag != nullptr,
        nullptr, "null parameter");
  json_ptr jwe(json_parse_string(kJweTemplate));
  CHECK(jwe, nullptr, "json_parse_string error");
  JSON_Object *members = json_value_get_object(jwe.get());
  const JSON_Array *recipients = json_object_get_array(members, "recipients");
  CHECK(recipients != nullptr, nullptr, "json_object_get_array error");
  JSON_Object *recipient = json_array_get_object(recipients, 0);
  CHECK(recipient != nullptr, nullptr, "recipient is null");

  const bool complete =
      set_encoded(members, "protect", {header, header_len}, "base64url encode protect error") &&
      set_encoded(recipient, "encrypted_key", {encrypted_cek, encrypted_cek_len},
                  "base64url encode encrypted_cek error") &&
      set_encoded(members, "iv", {iv, iv_len}, "base64url encode iv error") &&
      set_encoded(members, "ciphertext", {cipher, cipher_len},
                  "base64url encode ciphertext error") &&
      set_encoded(members, "tag", {tag, tag_len}, "base64url encode tag error");
  return complete ? jwe.release() : nullptr;
}

JSON_Value *encrypt_json_with_cbc_iv_cek(TEE_ObjectHandle key, const JSON_Value *value,
                                         const uint8_t *iv, uint32_t iv_len, const uint8_t *cek,
                                         uint32_t cek_len, const char *header,
                                         uint32_t header_len) {
  if (cek_len != kCbcCekLen) return nullptr;
  const tee_ptr<char> aad(base64urlEncodeAddEndZero(bytes_of(header), header_len));
  CHECK(aad, nullptr, "base64urlEncodeAddEndZero protect error");
  secret_bytes plain;
  CHECK(json_serialize_to_bytes(value, &plain), nullptr, "json_serialize_to_string error");

  tee_ptr<uint8_t> cipher;
  uint32_t cipher_len = 0;
  const TEE_Result encrypted = aes_cbc_encrypt(get_aes_key_from_cek(cek), kAesBlockLen, iv, iv_len,
                                               plain.data, plain.len, out(cipher), &cipher_len);
  if (encrypted != TEE_SUCCESS) return nullptr;
  plain.reset();
  tee_ptr<uint8_t> tag;
  uint32_t tag_len = 0;
  const TEE_Result tagged =
      compute_jwe_auth_tag(cek, cek_len, bytes_of(aad.get()), len_of(aad.get()), cipher.get(),
                           cipher_len, iv, iv_len, out(tag), &tag_len);
  if (tagged != TEE_SUCCESS) return nullptr;
  tee_ptr<uint8_t> encrypted_cek;
  uint32_t encrypted_cek_len = 0;
  if (rsa_encrypt(key, cek, cek_len, out(encrypted_cek), &encrypted_cek_len) != TEE_SUCCESS) {
    return nullptr;
  }
  return construct_json_encrypt(header, header_len, encrypted_cek.get(), encrypted_cek_len, iv,
                                iv_len, cipher.get(), cipher_len, tag.get(), tag_len);
}

JSON_Value *encrypt_json_with_gcm_iv_cek(TEE_ObjectHandle key, const JSON_Value *value,
                                         const uint8_t *iv, uint32_t iv_len, const uint8_t *cek,
                                         uint32_t cek_len, const char *header,
                                         uint32_t header_len) {
  secret_bytes plain;
  CHECK(json_serialize_to_bytes(value, &plain), nullptr, "json_serialize_to_string json error");
  const tee_ptr<char> aad(base64urlEncodeAddEndZero(bytes_of(header), header_len));
  CHECK(aad, nullptr, "base64urlEncodeAddEndZero protect get tmp_protect is null");

  tee_ptr<uint8_t> cipher;
  uint32_t cipher_len = 0;
  tee_ptr<uint8_t> tag;
  uint32_t tag_len = 0;
  const TEE_Result encrypted =
      aes_gcm_encrypt(cek, cek_len, iv, iv_len, bytes_of(aad.get()), len_of(aad.get()), plain.data,
                      plain.len, out(cipher), &cipher_len, out(tag), &tag_len);
  if (encrypted != TEE_SUCCESS) return nullptr;
  plain.reset();
  tee_ptr<uint8_t> encrypted_cek;
  uint32_t encrypted_cek_len = 0;
  if (rsa_encrypt(key, cek, cek_len, out(encrypted_cek), &encrypted_cek_len) != TEE_SUCCESS) {
    return nullptr;
  }
  return construct_json_encrypt(header, header_len, encrypted_cek.get(), encrypted_cek_len, iv,
                                iv_len, cipher.get(), cipher_len, tag.get(), tag_len);
}

static bool draw_iv_and_cek(uint32_t iv_len, uint32_t cek_len, secret_bytes *iv, secret_bytes *cek,
                            const char *as = __builtin_FUNCTION()) {
  iv->data = gen_random_bytes(iv_len);
  CHECK_AS(as, iv->data != nullptr, false, "gen_random_bytes error for iv");
  iv->len = iv_len;
  cek->data = gen_random_bytes(cek_len);
  CHECK_AS(as, cek->data != nullptr, false, "gen_random_bytes error for cek");
  cek->len = cek_len;
  return true;
}

JSON_Value *encrypt_json_with_aes_cbc(TEE_ObjectHandle key, const JSON_Value *value,
                                      const char *header) {
  secret_bytes iv;
  secret_bytes cek;
  if (!draw_iv_and_cek(kCbcIvLen, kCbcCekLen, &iv, &cek)) return nullptr;
  return encrypt_json_with_cbc_iv_cek(key, value, iv.data, iv.len, cek.data, cek.len, header,
                                      len_of(header));
}

JSON_Value *encrypt_json_with_aes_gcm(TEE_ObjectHandle key, const JSON_Value *value,
                                      const char *header) {
  secret_bytes iv;
  secret_bytes cek;
  if (!draw_iv_and_cek(kGcmIvLen, kGcmCekLen, &iv, &cek)) return nullptr;
  return encrypt_json_with_gcm_iv_cek(key, value, iv.data, iv.len, cek.data, cek.len, header,
                                      len_of(header));
}

JSON_Value *encrypt_json(TEE_ObjectHandle key, const JSON_Value *value, const char *header) {
  if (strcmp(header, JWE_HEADER_A128CBC_HS256) == 0) {
    return encrypt_json_with_aes_cbc(key, value, header);
  }
  if (strcmp(header, JWE_HEADER_A128GCM) == 0) {
    return encrypt_json_with_aes_gcm(key, value, header);
  }
  FAIL(nullptr, "unsupport encryption algorithm %s", header);
}

// ---- Decryption

// The canonical encoding of the decoded header is the AAD.
static char *encode_aad(const uint8_t *header, uint32_t header_len,
                        const char *as = __builtin_FUNCTION()) {
  char *aad = base64urlEncodeAddEndZero(header, header_len);
  CHECK_AS(as, aad != nullptr, nullptr, "base64urlEncodeAddEndZero protect error");
  return aad;
}

static bool unwrap_cek(TEE_ObjectHandle key, const uint8_t *encrypted_cek,
                       uint32_t encrypted_cek_len, uint32_t cek_len, secret_bytes *cek,
                       const char *as = __builtin_FUNCTION()) {
  const TEE_Result result =
      rsa_decrypt(key, encrypted_cek, encrypted_cek_len, &cek->data, &cek->len);
  if (result != TEE_SUCCESS) return false;
  CHECK_AS(as, cek->len == cek_len, false, "the content key has %u bytes, not %u", cek->len,
           cek_len);
  return true;
}

// `plain` is followed by a zero byte.
static JSON_Value *parse_plain(const secret_bytes &plain, const char *as = __builtin_FUNCTION()) {
  JSON_Value *value = json_parse_string(reinterpret_cast<const char *>(plain.data));
  CHECK_AS(as, value != nullptr, nullptr, "json_parse_string error");
  return value;
}

JSON_Value *decrypt_json_with_aes_cbc(TEE_ObjectHandle key, const uint8_t *cipher,
                                      uint32_t cipher_len, const uint8_t *iv, uint32_t iv_len,
                                      const uint8_t *encrypted_cek, uint32_t encrypted_cek_len,
                                      const uint8_t *header, uint32_t header_len,
                                      const uint8_t *tag, uint32_t tag_len) {
  const tee_ptr<char> aad(encode_aad(header, header_len));
  if (!aad) return nullptr;
  secret_bytes cek;
  if (!unwrap_cek(key, encrypted_cek, encrypted_cek_len, kCbcCekLen, &cek)) return nullptr;
  const TEE_Result verified =
      verify_jwe_auth_tag(cek.data, cek.len, bytes_of(aad.get()), len_of(aad.get()), cipher,
                          cipher_len, iv, iv_len, tag, tag_len);
  if (verified != TEE_SUCCESS) return nullptr;
  secret_bytes plain;
  const TEE_Result decrypted = aes_cbc_decrypt(get_aes_key_from_cek(cek.data), kAesBlockLen, iv,
                                               iv_len, cipher, cipher_len, &plain.data, &plain.len);
  if (decrypted != TEE_SUCCESS) return nullptr;
  return parse_plain(plain);
}

JSON_Value *decrypt_json_with_aes_gcm(TEE_ObjectHandle key, const uint8_t *cipher,
                                      uint32_t cipher_len, const uint8_t *iv, uint32_t iv_len,
                                      const uint8_t *encrypted_cek, uint32_t encrypted_cek_len,
                                      const uint8_t *header, uint32_t header_len,
                                      const uint8_t *tag, uint32_t tag_len) {
  const tee_ptr<char> aad(encode_aad(header, header_len));
  if (!aad) return nullptr;
  secret_bytes cek;
  if (!unwrap_cek(key, encrypted_cek, encrypted_cek_len, kGcmCekLen, &cek)) return nullptr;
  secret_bytes plain;
  const TEE_Result decrypted =
      aes_gcm_decrypt(cek.data, cek.len, iv, iv_len, bytes_of(aad.get()), len_of(aad.get()), tag,
                      tag_len, cipher, cipher_len, &plain.data, &plain.len);
  if (decrypted != TEE_SUCCESS) return nullptr;
  return parse_plain(plain);
}

static bool read_members(const JSON_Object *jwe, jwe_text *text,
                         const char *as = __builtin_FUNCTION()) {
  CHECK_AS(as, jwe != nullptr, false, "enc_obj is null in %s", as);
  text->protect = json_object_get_string(jwe, "protect");
  CHECK_AS(as, text->protect != nullptr, false, "protect is null in %s", as);
  text->iv = json_object_get_string(jwe, "iv");
  CHECK_AS(as, text->iv != nullptr, false, "iv is null in %s", as);
  text->ciphertext = json_object_get_string(jwe, "ciphertext");
  CHECK_AS(as, text->ciphertext != nullptr, false, "ciphertext is null in %s", as);
  text->tag = json_object_get_string(jwe, "tag");
  const JSON_Array *recipients = json_object_get_array(jwe, "recipients");
  CHECK_AS(as, recipients != nullptr, false, "recipients is null in %s", as);
  const JSON_Object *recipient = json_array_get_object(recipients, 0);
  CHECK_AS(as, recipient != nullptr, false, "recipient is null in %s", as);
  const JSON_Object *header = json_object_get_object(recipient, "header");
  CHECK_AS(as, header != nullptr, false, "header is null in %s", as);
  CHECK_AS(as, json_object_get_string(header, "alg") != nullptr, false, "alg is null in %s", as);
  text->encrypted_key = json_object_get_string(recipient, "encrypted_key");
  CHECK_AS(as, text->encrypted_key != nullptr, false, "encrypted_cek is null in %s", as);
  return true;
}

static bool decode(const char *text, const char *name, secret_bytes *bytes,
                   const char *as = __builtin_FUNCTION()) {
  bytes->len = base64urlDecodeStringRemoveEndZero(text, &bytes->data);
  CHECK_AS(as, bytes->len != 0, false, "%sbase64url decode error %s", name, as);
  return true;
}

static bool decode_members(const jwe_text &text, jwe_bytes *bytes,
                           const char *as = __builtin_FUNCTION()) {
  return decode(text.protect, "protect", &bytes->protect, as) &&
         decode(text.iv, "iv", &bytes->iv, as) &&
         decode(text.ciphertext, "ciphertext", &bytes->ciphertext, as) &&
         decode(text.tag, "tag", &bytes->tag, as) &&
         decode(text.encrypted_key, "encrypted_cek", &bytes->encrypted_cek, as);
}

JSON_Value *decrypt_json(TEE_ObjectHandle key, const JSON_Value *jwe) {
  jwe_text text = {};
  if (!read_members(json_value_get_object(jwe), &text)) return nullptr;
  jwe_bytes in;
  if (!decode_members(text, &in)) return nullptr;

  // Also a leading part of the A128GCM header chooses that scheme.
  const bool is_gcm = in.protect.len <= sizeof(kGcmHeader) - 1 &&
                      memcmp(in.protect.data, kGcmHeader, in.protect.len) == 0;
  const auto decrypt = is_gcm ? decrypt_json_with_aes_gcm : decrypt_json_with_aes_cbc;
  return decrypt(key, in.ciphertext.data, in.ciphertext.len, in.iv.data, in.iv.len,
                 in.encrypted_cek.data, in.encrypted_cek.len, in.protect.data, in.protect.len,
                 in.tag.data, in.tag.len);
}
