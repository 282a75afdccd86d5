// SPDX-License-Identifier: BSD-2-Clause
/// Device state information (DSI): which SDs exist, whose they are, which TAs they hold, and the
/// AIK of every SP. It is not stored: it is rebuilt from the records when the instance starts and
/// then edited in step with them.
///
/// At rest it is three compact JSON texts (`dsi_json_str_t`), which take less of the heap than
/// trees. They are sent and hashed as they are, and an edit takes the one that it changes apart
/// into its entries, no further. It comes into force when the new text is there; until then the DSI
/// is what it was. A text that cannot be read as JSON fails whatever is done with the DSI. Entries
/// are
///
///     SD:   {"name", "spid", "talist"}          AIK:   {"spaik", "spaiktype", "spid"}
///
/// with at most one AIK entry for an SP. Where an entry is removed, the list's last one goes.
#ifndef DSI_H
#define DSI_H

#include <stdint.h>

#include "ownership.h"
#include "platform.h"
#include "state/json.h"

struct dsi_json_str_t {
  char *sdl_json_str;  // SD entries
  char *spl_json_str;  // AIK entries
  char *tal_json_str;  // always an empty array
  json_array_form sdl_form;
  json_array_form spl_form;
  json_array_form tal_form;
  bool lacks_an_sd;  // an entry could not be loaded; until the next instance
};

struct dsi_t {
  JSON_Value *sdl;
  JSON_Value *spl;
  JSON_Value *tal;
};

/// The instance's DSI, from TA_CreateEntryPoint to TA_DestroyEntryPoint.
extern dsi_json_str_t *g_dsi;

void dsi_free(dsi_t *dsi);
void dsi_json_str_free(dsi_json_str_t *dsi);

using dsi_ptr = owned<dsi_t *, dsi_free>;
using dsi_text_ptr = owned<dsi_json_str_t *, dsi_json_str_free>;

/// A new DSI, built from the stored records; NULL when it cannot be. Writes nothing but an empty
/// SD list where there is none.
dsi_json_str_t *init_dsi();

/// Replaces the values of `out` by those of the texts: an array of entries for the list `edited`,
/// the texts themselves for the others. OTRP_NO_MEMORY when one does not parse.
[[nodiscard]] TEE_Result dsi_json_str_2_dsi(const dsi_json_str_t *in, dsi_t *out,
                                            JSON_Value *dsi_t::*edited = nullptr);

/// Replaces the texts of `out` by those of the values: all of them or, after a failure, none.
[[nodiscard]] TEE_Result dsi_2_dsi_json_str(const dsi_t *in, dsi_json_str_t *out);

/// The working form of `dsi`, for the operation named `as`, which logs: the list `edited` alone, by
/// its entries, or with NULL all of them as texts. It borrows the texts of `dsi`. `no_memory` is
/// the code when there is no room for the structure.
[[nodiscard]] TEE_Result open_dsi(const dsi_json_str_t *dsi, JSON_Value *dsi_t::*edited,
                                  TEE_Result no_memory, dsi_ptr *working,
                                  const char *as = __builtin_FUNCTION());

// ---- The document that is sent, and its hash

/// A new DSI document, or NULL. It borrows the texts of `dsi`, and is of use until they change.
JSON_Value *dsi_get_json_dsi(const dsi_json_str_t *dsi);

/// The document of g_dsi, or NULL.
JSON_Value *construct_dsi();

/// Compares the DSI hash with `hash`, 64 lower-case hexadecimal characters: the SHA-256 of the
/// base64 text of the compact document. TEE_ERROR_MAC_INVALID when it differs or is NULL.
[[nodiscard]] TEE_Result dsi_validate_dsi_hash(const dsi_json_str_t *dsi, const char *hash);

/// The same for g_dsi: OTRP_DSI_MISMATCH, or OTRP_DSI_HASH_FAILED for any other failure.
[[nodiscard]] TEE_Result validate_dsihash(const char *hash);

// ---- Entries

/// TEE_SUCCESS when `spl` has an entry for `spid`, TEE_ERROR_ITEM_NOT_FOUND when it has none,
/// TEE_ERROR_GENERIC when an entry before it has no "spid".
[[nodiscard]] TEE_Result judge_sp_exist(const JSON_Value *spl, const char *spid);

/// A new AIK entry as the last one of `spl`, for the operation named `as`, which logs.
[[nodiscard]] TEE_Result append_aik_entry(JSON_Value *spl, const char *spid, const uint8_t *key,
                                          uint32_t key_len, const char *spaiktype,
                                          const char *as = __builtin_FUNCTION());

/// Copies "name", "spid" and "talist" of an SD record into `entry`; a missing name or spid leaves
/// what `entry` has. For the operation named `as`, which logs.
[[nodiscard]] TEE_Result fill_sd_entry(JSON_Object *entry, const JSON_Object *record,
                                       const char *as = __builtin_FUNCTION());

/// Adds an AIK entry; one that the SP already has stays as it is, and that is no failure.
[[nodiscard]] TEE_Result dsi_add_sp_aik(dsi_json_str_t *dsi, const char *spid, const uint8_t *key,
                                        uint32_t key_len, const char *spaiktype);

/// Sets `*found` to 1 when an SD entry has this spid, or could have it were it there; else to 0.
[[nodiscard]] TEE_Result check_spid_in_dsi_sdl(const dsi_json_str_t *dsi, const char *spid,
                                               uint32_t *found);

[[nodiscard]] TEE_Result delete_dsi_spl_item_with_spid(dsi_json_str_t *dsi, const char *spid);

/// Appends an entry made from the stored SD record; does not look for an older one.
[[nodiscard]] TEE_Result dsi_load_sd_by_name(dsi_json_str_t *dsi, const char *sdname);

/// Removes the entry of that name, if there is one.
[[nodiscard]] TEE_Result dsi_delete_sd_by_name(dsi_json_str_t *dsi, const char *sdname);

/// Lets g_dsi show an SD as it is stored now: takes the entry out, OTRP_MISSING when there is none,
/// and makes a new one, the last, from the record. When that cannot be made the DSI is without the
/// SD until the next instance. Logs under the name of the operation `as`.
[[nodiscard]] TEE_Result refresh_sd_in_dsi(const char *sdname,
                                           const char *as = __builtin_FUNCTION());

#endif
