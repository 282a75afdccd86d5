// SPDX-License-Identifier: BSD-2-Clause
/// Shared by the messages that take something away from a security domain.
#ifndef DELETE_TA_H
#define DELETE_TA_H

#include "platform.h"
#include "state/json.h"

/// Checks that TSM `tsmid` manages the SD of this record. OTRP_RESPONSE_FAILED when the record
/// names no TSM, OTRP_DSI_MISMATCH when it names another.
[[nodiscard]] TEE_Result validate_tsm(const JSON_Value *sd_info, const char *tsmid);

#endif
