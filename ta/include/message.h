// SPDX-License-Identifier: BSD-2-Clause
/// What the message pipeline and the stages of a message agree on.
#ifndef MESSAGE_H
#define MESSAGE_H

#include <stdint.h>

#include "platform.h"

struct jsmn_object;

/// What the verify stage gets and fills.
struct request_context {
  const uint8_t *message;    // the message text, in the caller's input buffer
  uint32_t message_len;      // bytes
  const char *request_name;  // outer key of the envelope, from the message table
  uint8_t *payload;          // the decoded to-be-signed request and a NUL; the pipeline's to free
  uint32_t payload_len;      // bytes, without the NUL
  jsmn_object *tokens;       // the message's, NULL when it was not read; the pipeline's to free
};

/// A decrypted TA image on its way to the normal world. The pipeline frees `data`.
struct ta_image {
  uint8_t *data;  // NULL for messages without an image
  uint32_t len;   // bytes
};

/// Checks the TSM's signature; on success the context's payload is set.
using verify_function = TEE_Result (*)(request_context *context);

/// Carries the message out. `tsmid` is the envelope header's or NULL; `tbs` the payload, NULL when
/// it is no JSON object; `request` the whole message. TEE_SUCCESS means that `*response` holds a
/// new JSON text, which says "pass" or "fail". Only InstallTA and UpdateTA set `*image`.
using process_function = TEE_Result (*)(const char *tsmid, const jsmn_object *tbs, char **response,
                                        ta_image *image, const jsmn_object *request);

/// Writes the signed envelope of `response` to `destination`, without a terminator. `*len` is the
/// capacity, which must exceed the envelope's length, and then that length.
using encode_function = TEE_Result (*)(const char *response, uint8_t *destination, uint32_t *len);

#endif
