// SPDX-License-Identifier: BSD-2-Clause
/// The status query: is a TA with this taid recorded on the device?
///
///     in:   reserved word | L | L bytes of JSON: {"taid"}
///     out:  status | N | N bytes of JSON: {"status": "0" or "-1", "msg"}
#ifndef STATUS_QUERY_H
#define STATUS_QUERY_H

#include <stdint.h>

#include "platform.h"

/// The longest answer with its header: what an output buffer must hold.
constexpr uint32_t kStatusAnswerLen = 57;

/// TEE_SUCCESS when the TA is recorded, OTRP_NOT_FOUND when not, TEE_ERROR_OUT_OF_MEMORY also when
/// the query is no JSON: with an answer in all three cases, and `*out_len` its length. Without an
/// answer: TEE_ERROR_BAD_PARAMETERS; TEE_ERROR_SHORT_BUFFER, with `*out_len` the length needed;
/// TEE_SUCCESS when L is 0 or runs past the input. Changes nothing.
[[nodiscard]] TEE_Result os_query_otrp(const void *in, uint32_t in_len, void *out,
                                       uint32_t *out_len);

#endif
