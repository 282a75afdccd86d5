// SPDX-License-Identifier: BSD-2-Clause
/// What becomes of a request frame on its way to an answer frame.
///
///     in:   reserved word | L1 | L1 bytes | L2 | L2 bytes | message ID | M | M bytes of JSON
///     out:  status | R | R bytes of JSON [ | T | T bytes of TA image ]
///
/// Words have 32 bits, little-endian. The two blocks are not used and not empty. Failures of the
/// frame, of verification and of signing appear in the status word alone; an operation that fails
/// answers with a signed response that says so.
#ifndef PIPELINE_H
#define PIPELINE_H

#include <stdint.h>

#include "platform.h"
#include "state/token_reader.h"

/// Status and R.
constexpr uint32_t kAnswerHeadLen = 8;
void put_answer_head(uint8_t *out, TEE_Result status, uint32_t response_len);

/// Handles one request. `*out_len` is the capacity of `out` and then what was written; with a TA
/// image that did not fit, what would have been. Both buffers are shared with the normal world,
/// and `out` serves as working memory for the decoded payload, which is wiped before returning.
///
/// TEE_SUCCESS when the frame was whole, whatever came of the message in it. Otherwise
/// TEE_ERROR_BAD_PARAMETERS, TEE_ERROR_SHORT_BUFFER, OTRP_NO_MEMORY or TEE_ERROR_OUT_OF_MEMORY,
/// and `*out_len` is as it was.
[[nodiscard]] TEE_Result OTrP_TaInvokeCmd(const void *in, uint32_t in_len, void *out,
                                          uint32_t *out_len);

/// Puts a slice, and a NUL, into memory that is shared, and says where in a new slice, or NULL.
jsmn_string *borrow_share_memory(void *destination, const jsmn_string *slice);

/// Wipes such a copy.
void return_borrow_share_memory(void *destination, const jsmn_string *slice);

/// Writes the image's length and the image to `destination`.
[[nodiscard]] TEE_Result add_ta_bin_to_out_buf(void *destination, const uint8_t *image,
                                               uint32_t image_len);

#endif
