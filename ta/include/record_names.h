// SPDX-License-Identifier: BSD-2-Clause
/// Under which IDs the agent stores. Where there is one object for each SD, SP, TA or TSM, its name
/// stands behind a prefix, and both must fit TEE_OBJECT_ID_MAX_LEN bytes.
#ifndef RECORD_NAMES_H
#define RECORD_NAMES_H

#define SD_LIST_ID "SD_LIST_ID"                 // which SDs there are, by name
#define SD_INFO_PREFIX "SD_INFO_"               // an SD, by its name
#define SP_INFO_PREFIX "SP_INFO_"               // an SP with its AIK, by its ID
#define TA_INFO_PREFIX "TA_INFO_"               // a TA, by its ID
#define TSM_INFO_PREFIX "TSM_INFO_"             // a TSM's key, by its ID
#define TA_REGISTER_ID "OTRP_TA_REGISTER_INFO"  // the digests of the TA images

#endif
