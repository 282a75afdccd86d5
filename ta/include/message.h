// SPDX-License-Identifier: BSD-2-Clause
/// What the message pipeline and the stages of a message agree on.
#ifndef MESSAGE_H
#define MESSAGE_H

#include <stdint.h>

#include "platform.h"

struct jsmn_object;

/// A request on its way into its process function.
struct request_context {
  const uint8_t *message;    // its text, which the normal world may change meanwhile
  uint32_t message_len;      // bytes
  const char *request_name;  // outer key of the envelope, from the message table
  uint8_t *payload;          // what was signed, and a NUL; the pipeline's to free
  uint32_t payload_len;      // bytes, without the NUL
  jsmn_object *tokens;       // the message's, NULL when it was not read; the pipeline's to free
};

/// A TA image, in the clear, that the answer will carry. The pipeline frees `data`.
struct ta_image {
  uint8_t *data;  // NULL for messages without an image
  uint32_t len;   // bytes
};

/// Checks the TSM's signature; on success the context's payload is set.
using verify_function = TEE_Result (*)(request_context *context);

/// Carries the message out. `tsmid` is the envelope header's or NULL; `tbs` the payload, NULL when
/// it is no JSON object; `request` the whole message. TEE_SUCCESS means that `*response` holds a
/// new JSON text, which says "pass" or "fail". `*image` stays empty unless one came along.
using process_function = TEE_Result (*)(const char *tsmid, const jsmn_object *tbs, char **response,
                                        ta_image *image, const jsmn_object *request);

/// Puts `response` into a signed envelope at `destination`; see sign_encode_by_name_with_key().
using encode_function = TEE_Result (*)(const char *response, uint8_t *destination, uint32_t *len);

#endif
