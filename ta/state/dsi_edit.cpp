// SPDX-License-Identifier: BSD-2-Clause
// Edits of the DSI's entries.

#include "failure.h"
#include "otrp_result.h"
#include "platform.h"
#include "record_names.h"
#include "state/dsi.h"
#include "state/object_store.h"

static TEE_Result put_back(const dsi_t *working, dsi_json_str_t *dsi, const char *as) {
  TRY_LOG_AS(as, dsi_2_dsi_json_str(working, dsi), "dsi_2_dsi_json_str error code: 0x%x");
  return TEE_SUCCESS;
}

// Finds the first entry whose member `key` is `value`; `*index` is the number of entries when
// none is. OTRP_MISSING when an entry on the way is no object.
static TEE_Result find_entry(const JSON_Array *entries, const char *key, const char *value,
                             size_t *index) {
  const size_t num_entries = json_array_get_count(entries);
  for (size_t i = 0; i < num_entries; ++i) {
    const json_match member = json_array_match(entries, i, key, value);
    if (member == kJsonNoObject) return OTRP_MISSING;
    if (member == kJsonSameText) {
      *index = i;
      return TEE_SUCCESS;
    }
  }
  *index = num_entries;
  return TEE_SUCCESS;
}

// ---- AIK entries

static TEE_Result add_aik(JSON_Value *spl, const char *spid, const uint8_t *key, uint32_t key_len,
                          const char *spaiktype, const char *as = __builtin_FUNCTION()) {
  const TEE_Result judged = judge_sp_exist(spl, spid);
  if (judged == TEE_SUCCESS) {
    trace_error(as, __LINE__, "judge_sp_exist exist");
    return TEE_SUCCESS;
  }
  CHECK_AS(as, judged == TEE_ERROR_ITEM_NOT_FOUND, judged, "judge_sp_exist execution error");
  return append_aik_entry(spl, spid, key, key_len, spaiktype, as);
}

TEE_Result dsi_add_sp_aik(dsi_json_str_t *dsi, const char *spid, const uint8_t *key,
                          uint32_t key_len, const char *spaiktype) {
  const char *as = __builtin_FUNCTION();
  CHECK(dsi != nullptr && spid != nullptr && key != nullptr && key_len != 0 && spaiktype != nullptr,
        TEE_ERROR_NO_DATA, "dsi_add_sp_aik input is null");
  dsi_ptr working;
  TRY(open_dsi(dsi, &dsi_t::spl, TEE_ERROR_OUT_OF_MEMORY, &working, as));
  TRY(add_aik(working->spl, spid, key, key_len, spaiktype, as));
  return put_back(working.get(), dsi, as);
}

static TEE_Result remove_aik(JSON_Value *spl, const char *spid) {
  JSON_Array *entries = json_value_get_array(spl);
  size_t index = 0;
  TRY(find_entry(entries, "spid", spid, &index));
  (void)json_array_remove(entries, index);  // no entry of that index, nothing removed
  return TEE_SUCCESS;
}

TEE_Result delete_dsi_spl_item_with_spid(dsi_json_str_t *dsi, const char *spid) {
  dsi_ptr working;
  TRY(open_dsi(dsi, &dsi_t::spl, TEE_ERROR_OUT_OF_MEMORY, &working));
  TRY(remove_aik(working->spl, spid));
  return put_back(working.get(), dsi, __func__);
}

// ---- SD entries

TEE_Result check_spid_in_dsi_sdl(const dsi_json_str_t *dsi, const char *spid, uint32_t *found) {
  *found = 0;
  dsi_ptr working;
  TRY(open_dsi(dsi, &dsi_t::sdl, TEE_ERROR_OUT_OF_MEMORY, &working));
  const JSON_Array *entries = json_value_get_array(working->sdl);
  size_t index = 0;
  TRY(find_entry(entries, "spid", spid, &index));
  // An SD that is not in the DSI may be the SP's as well.
  *found = index < json_array_get_count(entries) || dsi->lacks_an_sd ? 1 : 0;
  return TEE_SUCCESS;
}

// Appends an entry that is made from the SD's record.
static TEE_Result add_sd(JSON_Value *sdl, const char *sdname, const char *as) {
  json_ptr entry(json_value_init_object());
  CHECK_AS(as, entry, TEE_ERROR_OUT_OF_MEMORY, "Bad get item object sdl_item_value\n");
  const json_ptr record(get_json_by_name(SD_INFO_PREFIX, sdname));
  CHECK_AS(as, record, TEE_ERROR_GENERIC, "get_json_by_name %s %s error", SD_INFO_PREFIX,
           sdname != nullptr ? sdname : "(null)");
  TRY(fill_sd_entry(json_value_get_object(entry.get()), json_value_get_object(record.get()), as));
  return static_cast<TEE_Result>(json_array_take(json_value_get_array(sdl), &entry));
}

TEE_Result dsi_load_sd_by_name(dsi_json_str_t *dsi, const char *sdname) {
  const char *as = __builtin_FUNCTION();
  dsi_ptr working;
  TEE_Result result = open_dsi(dsi, &dsi_t::sdl, TEE_ERROR_OUT_OF_MEMORY, &working, as);
  if (result == TEE_SUCCESS) result = add_sd(working->sdl, sdname, as);
  if (result == TEE_SUCCESS) result = put_back(working.get(), dsi, as);
  if (result != TEE_SUCCESS) dsi->lacks_an_sd = true;
  return result;
}

static TEE_Result remove_sd(JSON_Value *sdl, const char *sdname, const char *as) {
  JSON_Array *entries = json_value_get_array(sdl);
  size_t index = 0;
  TRY(find_entry(entries, "name", sdname, &index));
  CHECK_AS(as, index < json_array_get_count(entries), OTRP_MISSING, "delete dsi sd with name fail");
  return json_array_remove(entries, index) == JSONSuccess ? TEE_SUCCESS : OTRP_NO_MEMORY;
}

// Stricter about the entries on the way, and content when none has the name.
static TEE_Result remove_sd_if_there(JSON_Value *sdl, const char *sdname,
                                     const char *as = __builtin_FUNCTION()) {
  JSON_Array *entries = json_value_get_array(sdl);
  CHECK_AS(as, entries != nullptr, TEE_ERROR_BAD_FORMAT, "get array from dsi->sdl is NULL");
  const size_t num_entries = json_array_get_count(entries);
  for (size_t i = 0; i < num_entries; ++i) {
    const json_match name = json_array_match(entries, i, "name", sdname);
    CHECK_AS(as, name != kJsonNoObject, OTRP_RESPONSE_FAILED, "json_array_get_object idx %u error",
             static_cast<unsigned>(i));
    CHECK_AS(as, name != kJsonNoText, OTRP_RESPONSE_FAILED,
             "json_object_get_string from sdl item is null");
    if (name != kJsonSameText) continue;
    CHECK_AS(as, json_array_remove(entries, i) == JSONSuccess, OTRP_RESPONSE_FAILED,
             "json array remove object fail");
    return TEE_SUCCESS;
  }
  return TEE_SUCCESS;
}

TEE_Result dsi_delete_sd_by_name(dsi_json_str_t *dsi, const char *sdname) {
  const char *as = __builtin_FUNCTION();
  dsi_ptr working;
  TRY(open_dsi(dsi, &dsi_t::sdl, TEE_ERROR_OUT_OF_MEMORY, &working, as));
  TRY(remove_sd_if_there(working->sdl, sdname, as));
  return put_back(working.get(), dsi, as);
}

// ---- Refreshing an SD
//
// Both steps edit one list, which goes back after the second one, whether or not that failed: a
// record that cannot be read takes its SD out.

static TEE_Result remove_g_dsi_sdl_item_by_sdname(const char *sdname, dsi_ptr *working) {
  const char *as = __builtin_FUNCTION();
  TRY(open_dsi(g_dsi, &dsi_t::sdl, OTRP_NO_MEMORY, working, as));
  return remove_sd((*working)->sdl, sdname, as);
}

static TEE_Result load_g_dsi_sdl_item_by_sdname(const char *sdname, dsi_t *working) {
  const TEE_Result added = add_sd(working->sdl, sdname, "dsi_load_sd_by_name");
  const TEE_Result stored = put_back(working, g_dsi, "dsi_load_sd_by_name");
  const TEE_Result result = added != TEE_SUCCESS ? added : stored;
  if (result != TEE_SUCCESS) g_dsi->lacks_an_sd = true;
  TRY_LOG(result, "dsi_load_sd_by_name error code: 0x%x");
  return TEE_SUCCESS;
}

TEE_Result refresh_sd_in_dsi(const char *sdname, const char *as) {
  dsi_ptr working;
  TRY_LOG_AS(as, remove_g_dsi_sdl_item_by_sdname(sdname, &working),
             "remove_g_dsi_sdl_item_by_sdname fail error code: 0x%x");
  TRY_LOG_AS(as, load_g_dsi_sdl_item_by_sdname(sdname, working.get()),
             "load_g_dsi_sdl_item_by_sdname fail error code: 0x%x");
  return TEE_SUCCESS;
}
