// SPDX-License-Identifier: BSD-2-Clause
#include "security/tsm_trust.h"

#include <ca_tsm_key.h>

#include "crypto/base64.h"
#include "crypto/constant_time.h"
#include "crypto/corvel_client.h"
#include "crypto/rsa.h"
#include "crypto/symmetric.h"
#include "cursor.h"
#include "failure.h"
#include "otrp_result.h"
#include "ownership.h"
#include "platform.h"
#include "record_names.h"
#include "state/object_store.h"
#include "state/token_reader.h"

namespace {

const uint8_t kCaTsmExponent[] = {1, 0, 1};
static_assert(sizeof(kCaTsmModulus) * 8 == kRsaKeyBits);

constexpr uint32_t kEntryBlockLen = 12;
constexpr uint16_t kEntryBlockVersion = 3;
constexpr uint16_t kEntryBlockKeyLen = 256;

constexpr uint32_t kDigestBufferLen = 256;
constexpr uint32_t kMaxDeviceIdLen = 63;

}  // namespace

// ---- The CA-TSM key

TEE_ObjectHandle convert_tsm_n_e_to_pubkey(const uint8_t *n, uint32_t n_len, const uint8_t *e,
                                           uint32_t e_len) {
  // An exponent longer than the modulus would make the platform panic.
  const bool fits = n != nullptr && e != nullptr && n_len <= UINT32_MAX / 8 && e_len <= n_len;
  if (!fits) return TEE_HANDLE_NULL;
  key_object key;
  if (TEE_AllocateTransientObject(TEE_TYPE_RSA_PUBLIC_KEY, n_len * 8, out(key)) != TEE_SUCCESS) {
    return TEE_HANDLE_NULL;
  }
  TEE_Attribute attributes[2];
  TEE_InitRefAttribute(&attributes[0], TEE_ATTR_RSA_MODULUS, n, n_len);
  TEE_InitRefAttribute(&attributes[1], TEE_ATTR_RSA_PUBLIC_EXPONENT, e, e_len);
  if (TEE_PopulateTransientObject(key.get(), attributes, 2) != TEE_SUCCESS) return TEE_HANDLE_NULL;
  return key.release();
}

TEE_ObjectHandle convert_ca_tsm_to_pubkey() {
  return convert_tsm_n_e_to_pubkey(kCaTsmModulus, sizeof kCaTsmModulus, kCaTsmExponent,
                                   sizeof kCaTsmExponent);
}

TEE_Result get_ca_tsm_encoded_string(char **text) {
  *text = nullptr;
  uint32_t encoded_len = 0;
  const tee_ptr<uint8_t> encoded(encode_public_key({kCaTsmModulus, sizeof kCaTsmModulus},
                                                   {kCaTsmExponent, sizeof kCaTsmExponent},
                                                   &encoded_len));
  CHECK(encoded, TEE_ERROR_OUT_OF_MEMORY, "get_ca_tsm_encoded_string, malloc mem error");
  *text = base64urlEncodeAddEndZero(encoded.get(), encoded_len);
  CHECK(*text != nullptr, TEE_ERROR_OUT_OF_MEMORY, "base64urlEncodeAddEndZero get output NULL");
  return TEE_SUCCESS;
}

TEE_Result get_ca_tsm_encoded_string_hash(uint8_t **hash, uint32_t *hash_len) {
  *hash = nullptr;
  *hash_len = 0;
  tee_ptr<char> text;
  TRY_LOG(get_ca_tsm_encoded_string(out(text)), "get_ca_tsm_encoded_string error code: 0x%x");
  tee_ptr<uint8_t> digest(allocate_bytes(kDigestBufferLen));
  CHECK(digest, TEE_ERROR_OUT_OF_MEMORY, "malloc sha256 mem error");
  uint32_t digest_len = kDigestBufferLen;
  TRY_LOG(do_digest_with_sha(TEE_ALG_SHA256, text.get(), static_cast<uint32_t>(strlen(text.get())),
                             digest.get(), &digest_len),
          "do_digest_with_sha error code: 0x%x");
  *hash = digest.release();
  *hash_len = digest_len;
  return TEE_SUCCESS;
}

// The last steps of both checks against the CA-TSM key, with the same texts.
static TEE_Result check_ca_signature(const data_part *parts, uint32_t num_parts,
                                     const secret_bytes &signature,
                                     const char *as = __builtin_FUNCTION()) {
  const key_object ca_tsm(convert_ca_tsm_to_pubkey());
  CHECK_AS(as, ca_tsm, OTRP_NO_MEMORY, "convert_ca_tsm_to_pubkey get key NULL");
  const TEE_Result result =
      sha_verify_signature(ca_tsm.get(), parts, num_parts, signature.data, signature.len);
  CHECK_AS(as, result == TEE_SUCCESS, OTRP_CA_CHECK_FAILED, "sha_verify_signature error code: 0x%x",
           result);
  return TEE_SUCCESS;
}

// ---- The key chain

static bool is_hex_like(char c) {
  return (c >= '0' && c <= '9') || (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}

// Letters behind F count on; the comparison of the hash then fails.
static uint32_t hex_value(char c) {
  return ((static_cast<uint32_t>(c) & 0x1F) + 9) % 25;
}

// The bytes of a hexadecimal text in a new buffer, or NULL.
static uint8_t *convert_java_hash_string_to_c_byte_array(const char *text, uint32_t *len) {
  *len = 0;
  CHECK(text != nullptr, nullptr, "convert_java_hash_string_to_c_byte_array input is NULL");
  const size_t num_chars = strlen(text);
  CHECK(num_chars != 0 && num_chars % 2 == 0, nullptr, "input in param bad format");
  const auto num_bytes = static_cast<uint32_t>(num_chars / 2);
  tee_ptr<uint8_t> bytes(allocate_bytes(num_bytes));
  if (!bytes) return nullptr;
  for (uint32_t i = 0; i < num_bytes; ++i) {
    const char high = text[2 * i];
    const char low = text[2 * i + 1];
    if (!is_hex_like(high) || !is_hex_like(low)) return nullptr;
    bytes.get()[i] = static_cast<uint8_t>(hex_value(high) * 16 + hex_value(low));
  }
  *len = num_bytes;
  return bytes.release();
}

static TEE_Result check_ca_tsm_hash(const char *claimed_text,
                                    const char *as = __builtin_FUNCTION()) {
  uint32_t claimed_len = 0;
  const tee_ptr<uint8_t> claimed(
      convert_java_hash_string_to_c_byte_array(claimed_text, &claimed_len));
  CHECK_AS(as, claimed, OTRP_NO_MEMORY, "convert_java_hash_string_to_c_byte_array get NULL");
  tee_ptr<uint8_t> own;
  uint32_t own_len = 0;
  TRY_LOG_AS(as, get_ca_tsm_encoded_string_hash(out(own), &own_len),
             "get_ca_tsm_encoded_string_hash error code: 0x%x");
  CHECK_AS(as, claimed_len == own_len && equal_in_constant_time(claimed.get(), own.get(), own_len),
           OTRP_CA_CHECK_FAILED, "ca_tsm not match with ca_tsm_in_tee");
  return TEE_SUCCESS;
}

TEE_Result verify_tsm_pub_key(const JSON_Object *entry) {
  const char *tsmid = json_object_get_string(entry, "tsmid");
  const char *key_text = json_object_get_string(entry, "tsm_pub_key");
  const char *signature_text = json_object_get_string(entry, "signature");
  CHECK(tsmid != nullptr && key_text != nullptr && signature_text != nullptr, OTRP_MISSING,
        "verify_tsm_pub_key input is NULL");
  secret_bytes signature;
  signature.len = base64urlDecodeStringRemoveEndZero(signature_text, &signature.data);
  CHECK(signature.len != 0, OTRP_NO_MEMORY, "Failed to base64 decode signature");
  secret_bytes key;
  key.len = base64urlDecodeStringRemoveEndZero(key_text, &key.data);
  CHECK(key.len != 0, OTRP_NO_MEMORY, "Failed to base64 decode tam pub key\n");

  const data_part tsmid_part = text_part(tsmid);
  uint8_t block[kEntryBlockLen];
  writer out = {block, kEntryBlockLen};
  put_u32(&out, TEE_ALG_RSASSA_PKCS1_V1_5_SHA256);
  put_u16(&out, kEntryBlockVersion);
  put_u16(&out, kEntryBlockKeyLen);
  put_u16(&out, static_cast<uint16_t>(tsmid_part.len));
  put_u16(&out, static_cast<uint16_t>(signature.len));
  const data_part parts[] = {{block, kEntryBlockLen}, tsmid_part, {key.data, key.len}};
  return check_ca_signature(parts, 3, signature);
}

TEE_Result save_tsm_pub_key_to_persistent_object(const char *tsmid, const char *key_text) {
  tee_ptr<char> id;
  concat_pobj_name(TSM_INFO_PREFIX, tsmid, out(id));
  CHECK(id && tsmid[0] != 0, OTRP_NO_MEMORY, "create tsm_info_name is null");
  TRY_LOG(save_data_to_persistent_object(key_text, static_cast<uint32_t>(strlen(key_text)),
                                         id.get(), static_cast<uint32_t>(strlen(id.get())), true),
          "save_data_to_persistent_object error 0x%x\n");
  return TEE_SUCCESS;
}

static TEE_Result admit_entry(const JSON_Object *entry, const char *as = __builtin_FUNCTION()) {
  TRY_LOG_AS(as, verify_tsm_pub_key(entry), "verify_tsm_pub_key error code: 0x%x");
  TRY_LOG_AS(as,
             save_tsm_pub_key_to_persistent_object(json_object_get_string(entry, "tsmid"),
                                                   json_object_get_string(entry, "tsm_pub_key")),
             "save_tsm_pub_key_to_persistent_object error code: 0x%x");
  return TEE_SUCCESS;
}

TEE_Result handle_tsm_key_chain(const char *payload) {
  CHECK(payload != nullptr, OTRP_MISSING, "handle_tsm_key_chain input is NULL");
  const json_ptr document(json_parse_string(payload));
  CHECK(document, OTRP_NO_MEMORY, "parse tsm key chain payload error");
  const JSON_Object *request =
      json_object_get_object(json_value_get_object(document.get()), "GetDeviceStateTBSRequest");
  CHECK(request != nullptr, OTRP_BAD_REQUEST, "parse string from payload error");
  const JSON_Object *chain = json_object_get_object(request, "tsm_key_chain");
  CHECK(chain != nullptr, OTRP_MISSING, "json_object_get_object get tsm_key_chain is NULL");

  TRY(check_ca_tsm_hash(json_object_get_string(chain, "ca_tsm_hash")));
  const JSON_Array *entries = json_object_get_array(chain, "tsm_list");
  const size_t num_entries = json_array_get_count(entries);
  for (size_t i = 0; i < num_entries; ++i) {
    TRY(admit_entry(json_array_get_object(entries, i)));
  }
  return TEE_SUCCESS;
}

// ---- Stored keys

TEE_Result get_tsm_pubkey_by_tsmid(const char *tsmid, TEE_ObjectHandle *key) {
  if (key != nullptr) *key = TEE_HANDLE_NULL;
  CHECK(tsmid != nullptr && key != nullptr, OTRP_MISSING, "get_tsm_pubkey_by_tsmid input is NULL");

  tee_ptr<char> id;
  concat_pobj_name(TSM_INFO_PREFIX, tsmid, out(id));
  CHECK(id, OTRP_MISSING, "malloc for tsm_info_name Fail");
  secret_bytes text;
  const TEE_Result loaded = load_payload(id.get(), &text);
  if (loaded != TEE_SUCCESS || text.data == nullptr || text.len == 0) {
    trace_error(__func__, __LINE__, "read tsm info from persistent object Fail");
    return loaded;  // an empty record is no failure
  }
  secret_bytes encoded;
  encoded.len =
      base64urlDecodeStringRemoveEndZero(reinterpret_cast<const char *>(text.data), &encoded.data);
  CHECK(encoded.len != 0, OTRP_NO_MEMORY, "base64urlDecodeStringRemoveEndZero get NULL");

  tee_ptr<uint8_t> n;
  tee_ptr<uint8_t> e;
  uint32_t n_len = 0;
  uint32_t e_len = 0;
  TRY_LOG(read_pubkey_buf_to_n_and_e(encoded.data, encoded.len, out(n), &n_len, out(e), &e_len),
          "read_pubkey_buf_to_n_and_e get pubkey error code: 0x%x");
  *key = convert_tsm_n_e_to_pubkey(n.get(), n_len, e.get(), e_len);
  CHECK(*key != TEE_HANDLE_NULL, OTRP_MISSING, "convert_tsm_n_e_to_pubkey error get NULL");
  return TEE_SUCCESS;
}

// ---- signature2

static TEE_Result read_device_id(char (&id)[kMaxDeviceIdLen + 1],
                                 const char *as = __builtin_FUNCTION()) {
  uint32_t len = kMaxDeviceIdLen;
  TRY_LOG_AS(as, corvel_get_device_id(id, &len), "Failed to get TEE device ID with 0x%x\n");
  id[len] = 0;
  return TEE_SUCCESS;
}

TEE_Result verify_tsm_installta_updateta_signature(const jsmn_object *tbs, const char *tsmid,
                                                   const char *taid, const jsmn_object *request) {
  const slice_ptr tid(jsmn_object_get_string(tbs, "tid"));
  CHECK(tid && tid->data != nullptr, OTRP_BAD_REQUEST, "get tid error\n");
  const slice_ptr rid(jsmn_object_get_string(tbs, "rid"));
  CHECK(rid && rid->data != nullptr, OTRP_BAD_REQUEST, "get rid error");
  const slice_ptr slice(jsmn_object_get_string(request, "signature2"));
  CHECK(slice && slice->data != nullptr, OTRP_NO_MEMORY, "Failed to allocate signature jsmn str\n");
  const tee_ptr<char> text(jsmn_string_dup(slice->data, slice->len));
  CHECK(text, OTRP_NO_MEMORY, "Failed to allocate signature\n");

  char device_id[kMaxDeviceIdLen + 1];
  TRY(read_device_id(device_id));
  const data_part parts[] = {{tid->data, tid->len},
                             {rid->data, rid->len},
                             text_part(device_id),
                             text_part(taid != nullptr ? taid : ""),
                             text_part(tsmid != nullptr ? tsmid : "")};
  secret_bytes signature;
  signature.len = base64urlDecodeStringRemoveEndZero(text.get(), &signature.data);
  CHECK(signature.len != 0, OTRP_NO_MEMORY, "Failed to base64 decode signature");
  return check_ca_signature(parts, 5, signature);
}
