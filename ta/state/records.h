// SPDX-License-Identifier: BSD-2-Clause
/// The agent's durable JSON records, all stored as compact text:
///
///     SD_LIST_ID         {"sd_list": [names]}
///     SD_INFO_<name>     {"name", "spid", "tsmid", "talist": [{"taid", "taname"}]}
///     SP_INFO_<spid>     {"spid", "spcert", "aik"}   the AIK's key box in base64
///     TA_INFO_<taid>     {"spid", "sdid", "taid", "ta_version"}
///
/// Saves overwrite. A member of the wrong type counts as missing. Storage codes are passed
/// through. Reading single records: state/object_store.h.
#ifndef RECORDS_H
#define RECORDS_H

#include <stdint.h>

#include "platform.h"
#include "state/json.h"

/// False for a text that is no UTF-8, which no record takes, or that has control characters which
/// the compact form writes raw, so that the record would not parse when it is read back. A missing
/// text (NULL) is not the business of this check.
[[nodiscard]] bool can_be_stored(const char *text);

// ---- SD list

/// The list as a new document, `*value`, with its object and "sd_list" array, which belong to it.
/// A missing or empty list is created first. OTRP_SD_LIST_BROKEN when the stored text is no such
/// list; it is not replaced then, nor when it cannot be loaded.
[[nodiscard]] TEE_Result get_sd_list_json_array(JSON_Array **array, JSON_Object **object,
                                                JSON_Value **value);

/// Sets `*found` to 1 when the name is listed and leaves it alone otherwise.
[[nodiscard]] TEE_Result check_sd_item_exist_in_sd_list(const JSON_Array *array, const char *sdname,
                                                        uint32_t *found);

/// Appends the name; the caller saves the list.
[[nodiscard]] TEE_Result add_sd_item_to_sd_list(const char *sdname, JSON_Array *array);

/// Removes the name; the last one takes its place. The caller saves the list.
[[nodiscard]] TEE_Result delete_sd_from_list(JSON_Object *sd_list, const char *sdname);

[[nodiscard]] TEE_Result save_sd_list(const JSON_Value *sd_list);

// ---- SD records

/// A new record with an empty "talist". A text that cannot be set gives its setter's -1; a record
/// that cannot even be begun TEE_SUCCESS, with nothing handed out.
[[nodiscard]] TEE_Result init_sd_info(const char *spid, const char *tsmid, const char *sdname,
                                      JSON_Object **object, JSON_Value **value);

[[nodiscard]] TEE_Result save_sd_info(const char *spid, const char *tsmid, const char *sdname);

/// Stores `value`, which stays the caller's, as the record of `sdname`.
[[nodiscard]] TEE_Result save_sd_info_with_json_value(const char *sdname, const JSON_Value *value);

/// `*found` becomes 1 when the record's "talist" has the TA, else 0.
[[nodiscard]] TEE_Result check_ta_exist_in_ta_list(const char *taid, const JSON_Value *sd_info,
                                                   uint32_t *found);

// ---- SP records

[[nodiscard]] TEE_Result init_sp_info(const char *spid, const char *spcert, const char *aik,
                                      JSON_Object **object, JSON_Value **value);
[[nodiscard]] TEE_Result save_sp_info(const char *spid, const char *spcert, const char *aik);
[[nodiscard]] TEE_Result delete_sp_info(const char *spid);

// ---- TA records

/// With `replace` an older record is deleted first, where there is one.
[[nodiscard]] TEE_Result save_ta_info_to_persistent_object(const char *spid, const char *sdname,
                                                           const char *taid, const char *ta_version,
                                                           bool replace);
[[nodiscard]] TEE_Result delete_ta_persistent_object(const char *taid);

#endif
