// SPDX-License-Identifier: BSD-2-Clause
/// IDs of the agent's persistent objects: a prefix followed by the record's own name, or a fixed
/// ID.
#ifndef RECORD_NAMES_H
#define RECORD_NAMES_H

#define SD_LIST_ID "SD_LIST_ID"
#define SD_INFO_PREFIX "SD_INFO_"
#define SP_INFO_PREFIX "SP_INFO_"
#define TA_INFO_PREFIX "TA_INFO_"
#define TSM_INFO_PREFIX "TSM_INFO_"
#define TA_REGISTER_ID "OTRP_TA_REGISTER_INFO"

#endif
