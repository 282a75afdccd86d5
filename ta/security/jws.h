// SPDX-License-Identifier: BSD-2-Clause
/// JSON Web Signatures (RFC 7515), RS256: RSASSA-PKCS1-v1_5 with SHA-256 over
///
///     base64url(protected header) "." base64url(payload)
///
/// both as they stand in the envelope. A request's envelope is, in any order of members,
///
///     {NAME: {"payload", "protect", "signature", "header": {"tsmid"}}}
///
/// and a response's, in this order,
///
///     {NAME: {"payload", "signature", "protect", "header": {"deviceId"[, "spekid"]}}}
#ifndef JWS_H
#define JWS_H

#include <stdint.h>

#include "message.h"
#include "ownership.h"
#include "platform.h"
#include "state/json.h"
#include "state/token_reader.h"

#define JWS_HEADER_RS256 "{\"alg\":\"RS256\"}"

/// How a message is verified: checks the signature with the key of the header's tsmid and
/// sets the context's payload. A GetDeviceState request brings that key along; a GetTAInfo
/// request is not signed, and its payload is the message itself.
///
/// OTRP_BAD_REQUEST for a malformed or badly signed message; OTRP_NO_MEMORY, also when it is no
/// JSON object; codes of the key chain and the key lookup. When the lookup succeeds without a key
/// (an empty record), TEE_SUCCESS and no payload.
[[nodiscard]] TEE_Result verify_decode_by_name(request_context *context);

/// `payload`, `protect` and `signature` are base64url, as received, and may lie in memory that the
/// normal world changes meanwhile. `*decoded` receives the payload that was signed, decoded from
/// the very characters that were hashed, with a NUL behind it; it is for use only after success.
[[nodiscard]] bool verify_signature(TEE_ObjectHandle key, const jsmn_string *payload,
                                    const jsmn_string *protect, const jsmn_string *signature,
                                    secret_bytes *decoded);

/// The envelope of a response as a new text, or NULL. `header`, unless it is NULL, replaces the
/// generated one; it is freed whatever comes of the call. Where `key` is NULL, the device's
/// own signs.
char *construct_json_signature(const char *name, const char *payload, const char *protect,
                               JSON_Value *header, TEE_ObjectHandle key);

/// Puts `response` into a signed envelope at `destination`, where no NUL follows it. `*len` is the
/// capacity, which must exceed the envelope's length, and then that length.
[[nodiscard]] TEE_Result sign_encode_by_name_with_key(const char *response, const char *name,
                                                      uint8_t *destination, uint32_t *len,
                                                      TEE_ObjectHandle key);

/// Sign the two base64url texts. `*signature` receives a new buffer.
[[nodiscard]] TEE_Result sign_with_tee_key(const jsmn_string *payload, const jsmn_string *protect,
                                           uint8_t **signature, uint32_t *signature_len);
[[nodiscard]] TEE_Result sign_with_spaik_key(const jsmn_string *payload, const jsmn_string *protect,
                                             uint8_t **signature, uint32_t *signature_len,
                                             TEE_ObjectHandle key);

/// Sets "header" in a response: "deviceId", and "spekid" when `mode` is 2, as a build can
/// set it.
[[nodiscard]] bool add_signature_header(JSON_Object *envelope, uint32_t mode);

#endif
