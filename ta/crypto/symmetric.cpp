// SPDX-License-Identifier: BSD-2-Clause
#include "crypto/symmetric.h"

#include "crypto/constant_time.h"
#include "failure.h"
#include "ownership.h"
#include "platform.h"

TEE_ObjectHandle allocate_aes_key(const uint8_t *key, uint32_t key_len) {
  key_object object;
  TEE_Result result = TEE_AllocateTransientObject(TEE_TYPE_AES, key_len * 8, out(object));
  CHECK(result == TEE_SUCCESS, nullptr, "allocate aes object error 0x%x\n", result);

  TEE_Attribute secret;
  TEE_InitRefAttribute(&secret, TEE_ATTR_SECRET_VALUE, key, key_len);
  result = TEE_PopulateTransientObject(object.get(), &secret, 1);
  CHECK(result == TEE_SUCCESS, nullptr, "init secure key fail, 0x%x\n", result);
  return object.release();
}

// The operation keeps a copy of the key, so the key object need not outlive this stage.
static TEE_Result start_aes(uint32_t algorithm, TEE_OperationMode mode, const data_part &key,
                            operation *aes, const char *as = __builtin_FUNCTION()) {
  TRY_LOG_AS(as, TEE_AllocateOperation(out(*aes), algorithm, mode, key.len * 8),
             "TEE_AllocateOperation fail for aes 0x%x\n");
  const key_object key_holder(allocate_aes_key(static_cast<const uint8_t *>(key.data), key.len));
  if (!key_holder) return TEE_ERROR_GENERIC;
  TRY_LOG_AS(as, TEE_SetOperationKey(aes->get(), key_holder.get()),
             "set operation key error, 0x%x\n");
  return TEE_SUCCESS;
}

// ---- AES-GCM

static TEE_Result start_gcm(TEE_OperationMode mode, const data_part &key, const data_part &iv,
                            const data_part &aad, operation *aes,
                            const char *as = __builtin_FUNCTION()) {
  TRY(start_aes(TEE_ALG_AES_GCM, mode, key, aes, as));
  // The sender chose the nonce; TEE_AEInit panics on an empty one.
  CHECK_AS(as, iv.len != 0, TEE_ERROR_NOT_SUPPORTED, "aes TEE_AEInit error 0x%x\n",
           TEE_ERROR_NOT_SUPPORTED);
  TRY_LOG_AS(as, TEE_AEInit(aes->get(), iv.data, iv.len, kGcmTagLen * 8, 0, 0),
             "aes TEE_AEInit error 0x%x\n");
  TEE_AEUpdateAAD(aes->get(), aad.data, aad.len);
  return TEE_SUCCESS;
}

TEE_Result aes_gcm_encrypt(const uint8_t *key, uint32_t key_len, const uint8_t *iv, uint32_t iv_len,
                           const uint8_t *aad, uint32_t aad_len, const uint8_t *plain,
                           uint32_t plain_len, uint8_t **cipher, uint32_t *cipher_len,
                           uint8_t **tag, uint32_t *tag_len) {
  CHECK(cipher != nullptr && cipher_len != nullptr && tag != nullptr && tag_len != nullptr,
        TEE_ERROR_BAD_PARAMETERS,
        "aes_gcm_encrypt bad parameter aes_cipher %p aes_cipher_length %p tag %p tag_length %p\n",
        static_cast<void *>(cipher), static_cast<void *>(cipher_len), static_cast<void *>(tag),
        static_cast<void *>(tag_len));
  *cipher = nullptr;
  *cipher_len = 0;
  *tag = nullptr;
  *tag_len = 0;

  operation aes;
  TRY(start_gcm(TEE_MODE_ENCRYPT, {key, key_len}, {iv, iv_len}, {aad, aad_len}, &aes));

  tee_ptr<uint8_t> data(allocate_bytes(plain_len));
  CHECK(data, TEE_ERROR_OUT_OF_MEMORY, "No memory for data buf\n");
  tee_length produced = plain_len;
  TRY_LOG(TEE_AEUpdate(aes.get(), plain, plain_len, data.get(), &produced),
          "aes update error 0x%x\n");

  tee_ptr<uint8_t> data_tag(allocate_bytes(kGcmTagLen));
  CHECK(data_tag, TEE_ERROR_OUT_OF_MEMORY, "tag TEE_Malloc fail, %d\n", __LINE__);
  tee_length data_tag_len = kGcmTagLen;
  tee_length rest = plain_len - produced;
  TRY_LOG(TEE_AEEncryptFinal(aes.get(), nullptr, 0, data.get() + produced, &rest, data_tag.get(),
                             &data_tag_len),
          "aes encrypt final error 0x%x\n");

  *cipher = data.release();
  *cipher_len = static_cast<uint32_t>(produced + rest);
  *tag = data_tag.release();
  *tag_len = static_cast<uint32_t>(data_tag_len);
  return TEE_SUCCESS;
}

TEE_Result aes_gcm_decrypt(const uint8_t *key, uint32_t key_len, const uint8_t *iv, uint32_t iv_len,
                           const uint8_t *aad, uint32_t aad_len, const uint8_t *tag,
                           uint32_t tag_len, const uint8_t *cipher, uint32_t cipher_len,
                           uint8_t **plain, uint32_t *plain_len) {
  CHECK(plain != nullptr && plain_len != nullptr, TEE_ERROR_BAD_PARAMETERS,
        "aes_gcm_decrypt bad parameter plain_data %p plain_data_length %p",
        static_cast<void *>(plain), static_cast<void *>(plain_len));
  *plain = nullptr;
  *plain_len = 0;

  operation aes;
  TRY(start_gcm(TEE_MODE_DECRYPT, {key, key_len}, {iv, iv_len}, {aad, aad_len}, &aes));

  secret_bytes data;
  if (cipher_len < UINT32_MAX) data.data = allocate_bytes(cipher_len + 1);
  CHECK(data.data != nullptr, TEE_ERROR_OUT_OF_MEMORY, "No memory for data buf\n");
  data.len = cipher_len;
  tee_length produced = cipher_len;
  TRY_LOG(TEE_AEUpdate(aes.get(), cipher, cipher_len, data.data, &produced),
          "aes update error 0x%x\n");
  // A shorter tag would be easier to forge.
  CHECK(tag_len == kGcmTagLen, TEE_ERROR_MAC_INVALID, "aes decrypt final error 0x%x\n",
        TEE_ERROR_MAC_INVALID);
  tee_length rest = cipher_len - produced;
  TRY_LOG(TEE_AEDecryptFinal(aes.get(), nullptr, 0, data.data + produced, &rest,
                             const_cast<uint8_t *>(tag), tag_len),
          "aes decrypt final error 0x%x\n");

  *plain = data.release();
  *plain_len = static_cast<uint32_t>(produced + rest);
  return TEE_SUCCESS;
}

// ---- AES-CBC

static TEE_Result start_cbc(TEE_OperationMode mode, const data_part &key, const data_part &iv,
                            operation *aes, const char *as = __builtin_FUNCTION()) {
  TRY(start_aes(TEE_ALG_AES_CBC_NOPAD, mode, key, aes, as));
  // The sender chose the IV; TEE_CipherInit panics on a length that is not a block's.
  CHECK_AS(as, iv.len == kAesBlockLen, TEE_ERROR_BAD_PARAMETERS, "aes update error 0x%x\n",
           TEE_ERROR_BAD_PARAMETERS);
  TEE_CipherInit(aes->get(), iv.data, iv.len);
  return TEE_SUCCESS;
}

// The whole input in one update and a final step; `*produced` is the capacity of `output` first.
static TEE_Result run_cbc(TEE_OperationHandle aes, const data_part &input, uint8_t *output,
                          uint32_t *produced, const char *as = __builtin_FUNCTION()) {
  tee_length updated = *produced;
  TRY_LOG_AS(as, TEE_CipherUpdate(aes, input.data, input.len, output, &updated),
             "aes update error 0x%x\n");
  tee_length rest = *produced - updated;
  TRY_LOG_AS(as, TEE_CipherDoFinal(aes, nullptr, 0, output + updated, &rest),
             "aes final error 0x%x\n");
  *produced = static_cast<uint32_t>(updated + rest);
  return TEE_SUCCESS;
}

TEE_Result aes_cbc_encrypt(const uint8_t *key, uint32_t key_len, const uint8_t *iv, uint32_t iv_len,
                           const uint8_t *plain, uint32_t plain_len, uint8_t **cipher,
                           uint32_t *cipher_len) {
  CHECK(cipher != nullptr && cipher_len != nullptr, TEE_ERROR_BAD_PARAMETERS,
        "bad parameter cipher_data %p cipher_data_length %p\n", static_cast<void *>(cipher),
        static_cast<void *>(cipher_len));
  *cipher = nullptr;
  *cipher_len = 0;

  tee_ptr<uint8_t> data;
  if (plain_len <= UINT32_MAX - kAesBlockLen) data.reset(allocate_bytes(plain_len + kAesBlockLen));
  CHECK(data, TEE_ERROR_OUT_OF_MEMORY, "No memory for data buf\n");

  const uint32_t pad = kAesBlockLen - plain_len % kAesBlockLen;
  secret_bytes padded;
  padded.data = allocate_bytes(plain_len + pad);
  CHECK(padded.data != nullptr, TEE_ERROR_OUT_OF_MEMORY, "No memory for data buf\n");
  padded.len = plain_len + pad;
  if (plain_len != 0) memcpy(padded.data, plain, plain_len);
  memset(padded.data + plain_len, static_cast<int>(pad), pad);

  operation aes;
  TRY(start_cbc(TEE_MODE_ENCRYPT, {key, key_len}, {iv, iv_len}, &aes));
  uint32_t produced = plain_len + kAesBlockLen;
  TRY(run_cbc(aes.get(), {padded.data, padded.len}, data.get(), &produced));

  *cipher = data.release();
  *cipher_len = produced;
  return TEE_SUCCESS;
}

TEE_Result aes_cbc_decrypt(const uint8_t *key, uint32_t key_len, const uint8_t *iv, uint32_t iv_len,
                           const uint8_t *cipher, uint32_t cipher_len, uint8_t **plain,
                           uint32_t *plain_len) {
  CHECK(plain != nullptr && plain_len != nullptr, TEE_ERROR_BAD_PARAMETERS,
        "bad parameter plain_data %p plain_data_length %p\n", static_cast<void *>(plain),
        static_cast<void *>(plain_len));
  *plain = nullptr;
  *plain_len = 0;

  secret_bytes data;
  const bool fits = cipher_len <= UINT32_MAX - kAesBlockLen;
  if (fits) data.data = allocate_bytes(cipher_len + kAesBlockLen);
  CHECK(data.data != nullptr, TEE_ERROR_OUT_OF_MEMORY, "No memory for data buf\n");
  data.len = cipher_len + kAesBlockLen;

  operation aes;
  TRY(start_cbc(TEE_MODE_DECRYPT, {key, key_len}, {iv, iv_len}, &aes));
  // A part of a block would make the final step panic.
  CHECK(cipher_len % kAesBlockLen == 0, TEE_ERROR_BAD_FORMAT, "aes final error 0x%x\n",
        TEE_ERROR_BAD_FORMAT);
  uint32_t produced = data.len;
  TRY(run_cbc(aes.get(), {cipher, cipher_len}, data.data, &produced));
  uint32_t unpadded = 0;
  TRY_LOG(remove_pkcs_pading_length(data.data, produced, &unpadded),
          "remove_pkcs_pading_length error 0x%x\n");

  memset(data.data + unpadded, 0, data.len - unpadded);
  *plain = data.release();
  *plain_len = unpadded;
  return TEE_SUCCESS;
}

TEE_Result aes_cbc_decrypt_with_update_block(const uint8_t *key, uint32_t key_len,
                                             const uint8_t *iv, uint32_t iv_len, uint8_t *buffer,
                                             uint32_t buffer_len, uint8_t **plain,
                                             uint32_t *plain_len) {
  CHECK(plain != nullptr && plain_len != nullptr, TEE_ERROR_BAD_PARAMETERS,
        "bad parameter plain_data %p plain_data_length %p\n", static_cast<void *>(plain),
        static_cast<void *>(plain_len));
  secret_bytes data;
  data.data = buffer;
  data.len = buffer_len;

  operation aes;
  TRY(start_cbc(TEE_MODE_DECRYPT, {key, key_len}, {iv, iv_len}, &aes));
  CHECK(buffer_len % kAesBlockLen == 0, TEE_ERROR_BAD_FORMAT, "aes update error 0x%x, length: %d\n",
        TEE_ERROR_BAD_FORMAT, static_cast<int>(buffer_len % kAesBlockLen));
  for (uint32_t offset = 0; offset < buffer_len; offset += kAesBlockLen) {
    tee_length updated = kAesBlockLen;
    const TEE_Result result =
        TEE_CipherUpdate(aes.get(), buffer + offset, kAesBlockLen, buffer + offset, &updated);
    CHECK(result == TEE_SUCCESS && updated == kAesBlockLen,
          result != TEE_SUCCESS ? result : TEE_ERROR_GENERIC, "aes update error 0x%x, length: %d\n",
          result, static_cast<int>(updated));
  }
  tee_length rest = 0;
  TRY_LOG(TEE_CipherDoFinal(aes.get(), nullptr, 0, buffer + buffer_len, &rest),
          "aes final error 0x%x\n");
  uint32_t unpadded = 0;
  TRY_LOG(remove_pkcs_pading_length(buffer, buffer_len + static_cast<uint32_t>(rest), &unpadded),
          "remove_pkcs_pading_length error 0x%x\n");

  *plain = data.release();
  *plain_len = unpadded;
  return TEE_SUCCESS;
}

TEE_Result remove_pkcs_pading_length(const uint8_t *data, uint32_t len, uint32_t *unpadded_len) {
  const uint8_t pad = len == 0 ? 0 : data[len - 1];
  CHECK(pad != 0 && pad <= kAesBlockLen && pad <= len, TEE_ERROR_BAD_FORMAT,
        "Bad padding pad 0x%x\n", pad);
  for (uint32_t k = 2; k <= pad; ++k) {
    CHECK(data[len - k] == pad, TEE_ERROR_BAD_FORMAT, "Bad padding data, %d pad 0x%x\n",
          static_cast<int>(k), pad);
  }
  *unpadded_len = len - pad;
  return TEE_SUCCESS;
}

// ---- HMAC-SHA256

// Platforms take HMAC-SHA256 keys of 192 to 1024 bits.
static constexpr uint32_t kMinHmacKeyLen = 24;

// A shorter key is filled up with zeros, which HMAC itself would do (RFC 2104, 2).
static TEE_Result populate_hmac_key(TEE_ObjectHandle object, const data_part &key) {
  uint8_t filled[kMinHmacKeyLen] = {};
  const bool is_short = key.len < kMinHmacKeyLen;
  if (is_short && key.len != 0) memcpy(filled, key.data, key.len);
  TEE_Attribute secret;
  TEE_InitRefAttribute(&secret, TEE_ATTR_SECRET_VALUE, is_short ? filled : key.data,
                       is_short ? kMinHmacKeyLen : key.len);
  const TEE_Result result = TEE_PopulateTransientObject(object, &secret, 1);
  wipe(filled, sizeof filled);
  return result;
}

// `mac` holds kHmacSha256Len bytes. `last_step` is what the caller calls the last one when it
// fails.
static TEE_Result hmac_sha256(const data_part &data, const data_part &key, const char *last_step,
                              uint8_t *mac, uint32_t *mac_len,
                              const char *as = __builtin_FUNCTION()) {
  const uint32_t bits = 8 * (key.len < kMinHmacKeyLen ? kMinHmacKeyLen : key.len);
  key_object key_holder;
  TRY_LOG_AS(as, TEE_AllocateTransientObject(TEE_TYPE_HMAC_SHA256, bits, out(key_holder)),
             "Failed in TEE_AllocateTransientObject 0x%x\n");
  TRY_LOG_AS(as, populate_hmac_key(key_holder.get(), key),
             "Failed in TEE_PopulateTransientObject 0x%x\n");

  operation hmac;
  TRY_LOG_AS(as, TEE_AllocateOperation(out(hmac), TEE_ALG_HMAC_SHA256, TEE_MODE_MAC, bits),
             "Failed in TEE_AllocateOperation 0x%x\n");
  TRY_LOG_AS(as, TEE_SetOperationKey(hmac.get(), key_holder.get()),
             "Failed in TEE_SetOperationKey 0x%x\n");
  TEE_MACInit(hmac.get(), nullptr, 0);
  TEE_MACUpdate(hmac.get(), data.data, data.len);
  tee_length produced = kHmacSha256Len;
  const TEE_Result result = TEE_MACComputeFinal(hmac.get(), nullptr, 0, mac, &produced);
  CHECK_AS(as, result == TEE_SUCCESS, result, "Failed in %s 0x%x\n", last_step, result);
  *mac_len = static_cast<uint32_t>(produced);
  return TEE_SUCCESS;
}

TEE_Result Compute_HmacSha256(const uint8_t *data, uint32_t data_len, const uint8_t *key,
                              uint32_t key_len, uint8_t **mac, uint32_t *mac_len) {
  *mac = nullptr;
  *mac_len = 0;

  tee_ptr<uint8_t> buffer(allocate_bytes(kHmacSha256Len));
  if (!buffer) return TEE_ERROR_OUT_OF_MEMORY;
  uint32_t produced = 0;
  TRY(hmac_sha256({data, data_len}, {key, key_len}, "TEE_MACCompareFinal", buffer.get(),
                  &produced));
  CHECK(produced >= T_LEN, TEE_ERROR_BAD_STATE, "mac_len %u is not larger than T_LEN %u", produced,
        T_LEN);

  *mac = buffer.release();
  *mac_len = T_LEN;
  return TEE_SUCCESS;
}

TEE_Result Verify_HmacSha256(const uint8_t *data, uint32_t data_len, const uint8_t *key,
                             uint32_t key_len, const uint8_t *mac, uint32_t mac_len) {
  secret_bytes real_mac;
  real_mac.data = allocate_bytes(kHmacSha256Len);
  CHECK(real_mac.data != nullptr, TEE_ERROR_OUT_OF_MEMORY, "No memory for real_mac");
  real_mac.len = kHmacSha256Len;
  uint32_t produced = 0;
  TRY(hmac_sha256({data, data_len}, {key, key_len}, "TEE_MACComputeFinal", real_mac.data,
                  &produced));
  CHECK(mac_len <= produced && equal_in_constant_time(real_mac.data, mac, mac_len),
        TEE_ERROR_MAC_INVALID, "MAC unmatch");
  return TEE_SUCCESS;
}

// ---- Digests

TEE_Result do_digest_with_sha(uint32_t algorithm, const void *data, uint32_t data_len,
                              uint8_t *digest, uint32_t *digest_len) {
  operation sha;
  TRY_LOG(TEE_AllocateOperation(out(sha), algorithm, TEE_MODE_DIGEST, 0),
          "TEE_AllocateOperation failed: %08x\n");
  tee_length produced = *digest_len;
  TRY_LOG(TEE_DigestDoFinal(sha.get(), data, data_len, digest, &produced),
          "TEE_DigestDoFinal failed: %08x\n");
  *digest_len = static_cast<uint32_t>(produced);
  return TEE_SUCCESS;
}

TEE_Result compute_string_array_digest_with_update(uint32_t algorithm, const data_part *parts,
                                                   uint32_t num_parts, uint8_t *digest,
                                                   uint32_t *digest_len) {
  operation sha;
  TRY_LOG(TEE_AllocateOperation(out(sha), algorithm, TEE_MODE_DIGEST, 0),
          "TEE_AllocateOperation failed: %08x\n");
  for (uint32_t i = 0; i < num_parts; ++i) TEE_DigestUpdate(sha.get(), parts[i].data, parts[i].len);
  tee_length produced = *digest_len;
  TRY_LOG(TEE_DigestDoFinal(sha.get(), nullptr, 0, digest, &produced),
          "TEE_DigestDoFinal failed: %08x\n");
  *digest_len = static_cast<uint32_t>(produced);
  return TEE_SUCCESS;
}

// ---- Random

uint8_t *gen_random_bytes(uint32_t len) {
  uint8_t *bytes = allocate_bytes(len);
  CHECK(bytes != nullptr, nullptr, "No memory for random data");
  TEE_GenerateRandom(bytes, len);
  return bytes;
}
