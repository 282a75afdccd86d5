// SPDX-License-Identifier: BSD-2-Clause
/// What the agent keeps over the end of its instance, as byte strings under IDs, and as JSON.
///
/// An object's data stream is
///
///     N (a word, little-endian) | N bytes of payload | what is left of a longer one
///
/// A save writes over what is there and cuts nothing off, so N alone says where the payload ends.
/// This is the one place that knows the platform's storage; nothing stays open behind a call.
/// IDs have at most 64 bytes; codes of the platform are passed through.
#ifndef OBJECT_STORE_H
#define OBJECT_STORE_H

#include <stdint.h>

#include "data_part.h"
#include "ownership.h"
#include "platform.h"
#include "state/json.h"

/// Creates the object or writes it over, length and payload in one write: the platform leaves the
/// old record or the new one, whatever happens meanwhile. A creation that gets no further leaves an
/// empty object, which readers take for none. `overwrite` is the flag of that name in the creation
/// call; what is there already is written over either way.
/// TEE_ERROR_OUT_OF_MEMORY, with nothing changed, when the payload cannot be copied.
[[nodiscard]] TEE_Result save_data_to_persistent_object(const void *data, uint32_t len,
                                                        const char *id, uint32_t id_len,
                                                        bool overwrite);

/// The payload in a new buffer, with a NUL behind it that is not counted. `*len` is what was really
/// there, when the object ends before its payload should. An object without a whole length prefix
/// is no failure: `*data` is NULL then, and `*len` the number of its bytes, 0 for an empty object.
[[nodiscard]] TEE_Result allocate_and_load_data_from_persistent_object(const char *id,
                                                                       uint32_t id_len,
                                                                       uint8_t **data,
                                                                       uint32_t *len);

/// The same for an ID that is a text.
[[nodiscard]] TEE_Result load_payload(const char *id, secret_bytes *payload);

/// The same for a record that everyone expects: one that is missing or empty is created first, with
/// the payload `initial`; `not_created`, unless it is NULL, is what is said when that fails. Any
/// other failure leaves the record alone, since creating it would lose what is in it. So does
/// TEE_ERROR_BAD_FORMAT, for one without a whole length prefix.
[[nodiscard]] TEE_Result load_or_create(const char *id, const data_part &initial,
                                        const char *not_created, secret_bytes *payload,
                                        const char *as = __builtin_FUNCTION());

/// TEE_ERROR_ITEM_NOT_FOUND when there is no such object, TEE_ERROR_BAD_PARAMETERS when there can
/// be none of that ID.
[[nodiscard]] TEE_Result delete_persistent_object(const char *id, uint32_t id_len);

/// Joins the two to a new text, NULL when one of them is missing or memory ran out.
void concat_pobj_name(const char *prefix, const char *name, char **id);

/// The record `prefix` + `name` as a new JSON value.
///
/// TEE_ERROR_ITEM_NOT_FOUND when there certainly is no such record. Any other failure leaves that
/// open: a code of the storage, or OTRP_NO_MEMORY for a record that did not parse.
[[nodiscard]] TEE_Result read_json_by_name(const char *prefix, const char *name,
                                           JSON_Value **value);

/// The same; NULL when there is none that parses.
JSON_Value *get_json_by_name(const char *prefix, const char *name);

/// The same for one kind of record. OTRP_NOT_FOUND (OTRP_SP_NOT_FOUND for an SP) with NULL.
[[nodiscard]] TEE_Result get_ta_info_persistent_object_to_json_value(const char *taid,
                                                                     JSON_Value **value);
[[nodiscard]] TEE_Result get_sd_info_persistent_object_to_json_value(const char *sdname,
                                                                     JSON_Value **value);
[[nodiscard]] TEE_Result get_sp_info_persistent_object_to_json_value(const char *spid,
                                                                     JSON_Value **value);

#endif
