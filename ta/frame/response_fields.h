// SPDX-License-Identifier: BSD-2-Clause
/// Members that the to-be-signed responses have in common.
#ifndef RESPONSE_FIELDS_H
#define RESPONSE_FIELDS_H

#include "platform.h"
#include "state/json.h"

struct jsmn_object;

/// Sets "ver" (always "1.0"), and "rid" and "tid" with the request's own characters, escape
/// sequences and all. OTRP_BAD_REQUEST when the request lacks one, OTRP_NO_MEMORY, or the setter's
/// -1.
[[nodiscard]] TEE_Result add_ver_rid_tid(JSON_Object *response, const jsmn_object *tbs);

/// Sets the outcome. A `result` other than 0 gives "reason" and "status" "fail". 0 gives "status"
/// "pass" and "content": the object of `content`, with the DSI as its "dsi" when `with_dsi` is
/// set, encrypted for the TSM `tsmid`. `content` stays the caller's.
///
/// After a failure nothing can be sent: OTRP_MISSING without a response object,
/// OTRP_NO_MEMORY, or the code of the key lookup.
[[nodiscard]] TEE_Result finish_tbs_msg_status(const char *tsmid, TEE_Result result,
                                               JSON_Object *response, JSON_Value *content,
                                               bool with_dsi);

#endif
