// SPDX-License-Identifier: BSD-2-Clause
#include "security/jws.h"

#include <ta_config.h>

#include "crypto/base64.h"
#include "crypto/corvel_client.h"
#include "crypto/rsa.h"
#include "crypto/symmetric.h"
#include "failure.h"
#include "otrp_result.h"
#include "ownership.h"
#include "platform.h"
#include "security/tsm_trust.h"

namespace {

const char kGetDeviceStateRequest[] = "GetDeviceStateRequest";
const char kGetTaInfoRequest[] = "GetTAInfoRequest";

const data_part kDot = {".", 1};
constexpr uint32_t kNumSignedParts = 3;

constexpr uint32_t kModeWithSpekid = 2;

// The members of a request's envelope; slices of the message text.
struct envelope {
  token_object_ptr root;
  slice_ptr payload;
  slice_ptr protect;
  slice_ptr signature;
  slice_ptr tsmid;
};

}  // namespace

static bool is_present(const slice_ptr &slice) {
  return slice && slice->data != nullptr;
}

// ---- Verification

static TEE_Result read_envelope(const request_context *context, envelope *parts,
                                const char *as = __builtin_FUNCTION()) {
  const slice_ptr message(jsmn_init_string());
  CHECK_AS(as, message, OTRP_NO_MEMORY, "init root_object_jsmn_string error");
  message->data = reinterpret_cast<const char *>(context->message);
  message->len = context->message_len;
  parts->root.reset(jsmn_init_object(message.get()));
  CHECK_AS(as, parts->root, OTRP_NO_MEMORY, "parse root_object_jsmn_string to root_object error");
  const token_object_ptr request(jsmn_object_get_object(parts->root.get(), context->request_name));
  CHECK_AS(as, request, OTRP_BAD_REQUEST, "%s not found", context->request_name);

  parts->payload.reset(jsmn_object_get_string(request.get(), "payload"));
  CHECK_AS(as, is_present(parts->payload), OTRP_BAD_REQUEST, "get base64 payload error");
  parts->protect.reset(jsmn_object_get_string(request.get(), "protect"));
  CHECK_AS(as, is_present(parts->protect), OTRP_BAD_REQUEST, "get base64_protect error");
  parts->signature.reset(jsmn_object_get_string(request.get(), "signature"));
  CHECK_AS(as, is_present(parts->signature), OTRP_BAD_REQUEST, "get base64 signature error");
  const token_object_ptr header(jsmn_object_get_object(request.get(), "header"));
  CHECK_AS(as, header, OTRP_BAD_REQUEST, "request header is NULL");
  parts->tsmid.reset(jsmn_object_get_string(header.get(), "tsmid"));
  CHECK_AS(as, is_present(parts->tsmid), OTRP_BAD_REQUEST, "request header get tsmid is NULL");
  return TEE_SUCCESS;
}

// Admits the TSM keys of a GetDeviceState payload, which has not been verified yet.
static TEE_Result admit_key_chain(const jsmn_string *payload,
                                  const char *as = __builtin_FUNCTION()) {
  secret_bytes decoded;
  decoded.len = base64urlDecodeStringAddEndZeroV2(payload->data, payload->len, &decoded.data);
  CHECK_AS(as, decoded.len != 0, OTRP_BAD_REQUEST, "Invalid payload value");
  TRY_LOG_AS(as, handle_tsm_key_chain(reinterpret_cast<const char *>(decoded.data)),
             "handle_tsm_key_chain error code: 0x%x");
  return TEE_SUCCESS;
}

// ---- The signing input
//
// It lies in memory that the normal world shares. A piece at a time is fetched from there, once, so
// that what is hashed is what is decoded.

static constexpr uint32_t kPieceLen = 4096;
static constexpr uint32_t kLeftOverLen = 3;  // characters between two pieces

namespace {

struct signing_input {
  operation sha;
  tee_ptr<char> piece;  // what is left over, and then what is fetched

  void hash_text(const jsmn_string &text);
  void hash_and_decode(const jsmn_string &text, secret_bytes *decoded);
  uint32_t fetch(const jsmn_string &text, uint32_t offset, uint32_t left_over);
};

}  // namespace

// Returns the number of characters.
uint32_t signing_input::fetch(const jsmn_string &text, uint32_t offset, uint32_t left_over) {
  const uint32_t rest = text.len - offset;
  const uint32_t len = rest < kPieceLen ? rest : kPieceLen;
  memcpy(piece.get() + left_over, text.data + offset, len);
  TEE_DigestUpdate(sha.get(), piece.get() + left_over, len);
  return len;
}

void signing_input::hash_text(const jsmn_string &text) {
  for (uint32_t offset = 0; offset < text.len;) offset += fetch(text, offset, 0);
}

void signing_input::hash_and_decode(const jsmn_string &text, secret_bytes *decoded) {
  uint32_t left_over = 0;
  for (uint32_t offset = 0; offset < text.len;) {
    const uint32_t len = fetch(text, offset, left_over);
    offset += len;
    left_over += len;
    decoded->len += base64urlDecodePiece(piece.get(), &left_over, offset == text.len,
                                         decoded->data + decoded->len);
  }
}

static TEE_Result digest_signing_input(const jsmn_string *payload, const jsmn_string *protect,
                                       secret_bytes *decoded, uint8_t digest[kSha256Len],
                                       const char *as = __builtin_FUNCTION()) {
  // Three bytes for four characters, what two or three more give, and a NUL.
  decoded->data = allocate_bytes(payload->len / 4 * 3 + 3);
  signing_input input;
  input.piece.reset(reinterpret_cast<char *>(allocate_bytes(kLeftOverLen + kPieceLen)));
  CHECK_AS(as, decoded->data != nullptr && input.piece, TEE_ERROR_OUT_OF_MEMORY,
           "decode base64 but not memory");
  TRY_LOG_AS(as, TEE_AllocateOperation(out(input.sha), TEE_ALG_SHA256, TEE_MODE_DIGEST, 0),
             "TEE_AllocateOperation failed: %08x\n");
  input.hash_text(*protect);
  TEE_DigestUpdate(input.sha.get(), kDot.data, kDot.len);
  input.hash_and_decode(*payload, decoded);
  tee_length digest_len = kSha256Len;
  TRY_LOG_AS(as, TEE_DigestDoFinal(input.sha.get(), nullptr, 0, digest, &digest_len),
             "TEE_DigestDoFinal failed: %08x\n");
  return TEE_SUCCESS;
}

bool verify_signature(TEE_ObjectHandle key, const jsmn_string *payload, const jsmn_string *protect,
                      const jsmn_string *signature, secret_bytes *decoded) {
  secret_bytes bytes;
  bytes.len = base64urlDecodeStringRemoveEndZeroV2(signature->data, signature->len, &bytes.data);
  CHECK(bytes.len != 0, false, "base64urlDecodeStringRemoveEndZero decode length 0");
  uint8_t digest[kSha256Len];
  TEE_Result result = digest_signing_input(payload, protect, decoded, digest);
  if (result == TEE_SUCCESS) {
    result = sha_verify_digest(key, digest, kSha256Len, bytes.data, bytes.len);
  }
  CHECK(result == TEE_SUCCESS, false, "sha_verify_signature error");
  return true;
}

static TEE_Result take_whole_message(request_context *context,
                                     const char *as = __builtin_FUNCTION()) {
  secret_bytes payload;
  if (context->message_len < UINT32_MAX) {
    payload.data = allocate_bytes(context->message_len + 1);
  }
  CHECK_AS(as, payload.data != nullptr, OTRP_NO_MEMORY, "no memory for %u bytes of payload",
           context->message_len);
  memcpy(payload.data, context->message, context->message_len);
  context->payload = payload.release();
  context->payload_len = context->message_len;
  return TEE_SUCCESS;
}

TEE_Result verify_decode_by_name(request_context *context) {
  if (strcmp(context->request_name, kGetTaInfoRequest) == 0) return take_whole_message(context);
  envelope parts;
  TRY(read_envelope(context, &parts));
  const tee_ptr<char> tsmid(jsmn_string_dup(parts.tsmid->data, parts.tsmid->len));
  CHECK(tsmid, OTRP_NO_MEMORY, "tsmid_copy is null no memory");

  // The key to this signature may come in this very message: the chain has to be admitted first,
  // which each of its keys earns by the CA's signature alone.
  if (strcmp(context->request_name, kGetDeviceStateRequest) == 0) {
    TRY(admit_key_chain(parts.payload.get()));
  }

  key_object key;
  const TEE_Result found = get_tsm_pubkey_by_tsmid(tsmid.get(), out(key));
  if (found != TEE_SUCCESS || !key) {
    trace_error(__func__, __LINE__, "get tsm pubkey error, error code: 0x%x", found);
    return found;  // no failure when the TSM's record is empty, but there is no payload
  }
  secret_bytes payload;
  CHECK(verify_signature(key.get(), parts.payload.get(), parts.protect.get(), parts.signature.get(),
                         &payload),
        OTRP_BAD_REQUEST, "Fail to pass signature verification\n");
  CHECK(payload.len != 0, OTRP_BAD_REQUEST, "Invalid payload value");

  context->payload_len = payload.len;
  context->payload = payload.release();
  context->tokens = parts.root.release();
  return TEE_SUCCESS;
}

// ---- Signing

static TEE_Result sign(const jsmn_string *payload, const jsmn_string *protect, TEE_ObjectHandle key,
                       uint8_t **signature, uint32_t *signature_len,
                       const char *as = __builtin_FUNCTION()) {
  tee_ptr<uint8_t> buffer(allocate_bytes(kRsaSignatureLen));
  CHECK_AS(as, buffer, TEE_ERROR_OUT_OF_MEMORY, "no memory for signature");
  uint32_t len = kRsaSignatureLen;
  const data_part parts[] = {{protect->data, protect->len}, kDot, {payload->data, payload->len}};
  TRY(sha_compute_signature(key, parts, kNumSignedParts, buffer.get(), &len));
  *signature = buffer.release();
  *signature_len = len;
  return TEE_SUCCESS;
}

TEE_Result sign_with_tee_key(const jsmn_string *payload, const jsmn_string *protect,
                             uint8_t **signature, uint32_t *signature_len) {
  *signature = nullptr;
  *signature_len = 0;
  const key_object key(get_tee_key());
  CHECK(key, TEE_ERROR_GENERIC, "get_tee_key error");
  return sign(payload, protect, key.get(), signature, signature_len);
}

TEE_Result sign_with_spaik_key(const jsmn_string *payload, const jsmn_string *protect,
                               uint8_t **signature, uint32_t *signature_len, TEE_ObjectHandle key) {
  *signature = nullptr;
  *signature_len = 0;
  return sign(payload, protect, key, signature, signature_len);
}

static bool set_header(JSON_Object *header, uint32_t mode) {
  const char *as = "addHeader";
  if (json_object_set_string(header, "deviceId", "test_device_id") != JSONSuccess) return false;
  if (mode != kModeWithSpekid) return true;
  tee_ptr<char> sp_ek_id;
  const TEE_Result result = corvel_get_sp_ek_id(out(sp_ek_id));
  CHECK_AS(as, result == TEE_SUCCESS, false, "Failed to get SP_EK_ID from CORVEL: 0x%x", result);
  return json_object_set_string(header, "spekid", sp_ek_id.get()) == JSONSuccess;
}

bool add_signature_header(JSON_Object *envelope, uint32_t mode) {
  json_ptr header(json_value_init_object());
  if (!header || !set_header(json_value_get_object(header.get()), mode)) return false;
  return json_object_take(envelope, "header", &header) == JSONSuccess;
}

static jsmn_string slice_of(const char *text) {
  return {text, static_cast<uint32_t>(strlen(text))};
}

// Signs the payload that is in the envelope already.
static bool add_signature(JSON_Object *envelope, const char *protect, TEE_ObjectHandle key,
                          const char *as = __builtin_FUNCTION()) {
  const data_part payload = json_object_get_text(envelope, "payload");
  const jsmn_string payload_slice = {static_cast<const char *>(payload.data), payload.len};
  const jsmn_string protect_slice = slice_of(protect);
  tee_ptr<uint8_t> signature;
  uint32_t len = 0;
  const TEE_Result result =
      key != TEE_HANDLE_NULL
          ? sign_with_spaik_key(&payload_slice, &protect_slice, out(signature), &len, key)
          : sign_with_tee_key(&payload_slice, &protect_slice, out(signature), &len);
  if (result != TEE_SUCCESS) return false;
  CHECK_AS(as,
           json_object_set_base64url(envelope, "signature", {signature.get(), len}) == JSONSuccess,
           false, "base64url encode signature error");
  return true;
}

char *construct_json_signature(const char *name, const char *payload, const char *protect,
                               JSON_Value *header, TEE_ObjectHandle key) {
  json_ptr own_header(header);
  const json_ptr root(json_value_init_object());
  CHECK(name != nullptr && payload != nullptr && protect != nullptr, nullptr, "null parameter");
  CHECK(root, nullptr, "init response json error");
  json_ptr envelope(json_value_init_object());
  CHECK(envelope, nullptr, "json_parse_string error");
  JSON_Object *members = json_value_get_object(envelope.get());
  CHECK(json_object_set_base64url(members, "payload", text_part(payload)) == JSONSuccess, nullptr,
        "base64url encode payload error");
  const data_part header_part = text_part(protect);
  const tee_ptr<char> protect_text(
      base64urlEncodeAddEndZero(static_cast<const uint8_t *>(header_part.data), header_part.len));
  CHECK(protect_text, nullptr, "base64url encode protect error");

  const bool complete =
      add_signature(members, protect_text.get(), key) &&
      json_object_set_string(members, "protect", protect_text.get()) == JSONSuccess &&
      add_signature_header(members, TA_SIGNATURE_HEADER_MODE);
  if (!complete) return nullptr;
  if (own_header && json_object_take(members, "header", &own_header) != JSONSuccess) return nullptr;
  CHECK(json_object_take(json_value_get_object(root.get()), name, &envelope) == JSONSuccess,
        nullptr, "set signature_json to response json Fail");
  char *text = json_serialize_to_string(root.get());
  CHECK(text != nullptr, nullptr, "response to json string get NULL");
  return text;
}

TEE_Result sign_encode_by_name_with_key(const char *response, const char *name,
                                        uint8_t *destination, uint32_t *len, TEE_ObjectHandle key) {
  const uint32_t capacity = *len;
  *len = 0;
  CHECK(response != nullptr, OTRP_MISSING, "sign_encode_by_name_with_key input is NULL");
  const tee_ptr<char> envelope(
      construct_json_signature(name, response, JWS_HEADER_RS256, nullptr, key));
  CHECK(envelope, OTRP_RESPONSE_FAILED, "construct_json_signature error");
  const size_t envelope_len = strlen(envelope.get());
  CHECK(capacity > envelope_len, OTRP_RESPONSE_FAILED, "buffer is too small");
  memcpy(destination, envelope.get(), envelope_len);
  *len = static_cast<uint32_t>(envelope_len);
  return TEE_SUCCESS;
}
