// SPDX-License-Identifier: BSD-2-Clause
#include "state/dsi.h"

#include <ta_config.h>

#include "crypto/aik.h"
#include "crypto/base64.h"
#include "crypto/constant_time.h"
#include "crypto/symmetric.h"
#include "failure.h"
#include "otrp_result.h"
#include "platform.h"
#include "record_names.h"
#include "state/object_store.h"
#include "state/records.h"

dsi_json_str_t *g_dsi = nullptr;

namespace {

const char kSdEntryTemplate[] = "{\"name\":\"\",\"spid\":\"\",\"talist\":[]}";

// The lists come behind what is here: "cnt" and "sd" into "sdlist", and "teeaiklist".
const char kDsiTemplate[] =
    "{\"dsi\":{"
    "\"tfwdata\":{"
    "\"tbs\":\"TFW to be signed data is the tid\","
    "\"cert\":\"BASE64 encoded TFW certificate\","
    "\"sigalg\":\"Signing method\","
    "\"sig\":\"Tfw signed data,  BASE64 encoded\"},"
    "\"tee\":{"
    "\"name\":\"TEE name\","
    "\"ver\":\"TEE version\","
    "\"cert\":\"BASE64 encoded TEE cert\","
    "\"cacert\":\"JSON array value of CA certificates up to the root CA\","
    "\"sdlist\":{}}}}";

constexpr uint32_t kHashTextLen = 2 * kSha256Len;

}  // namespace

template <class T>
static T *allocate_zeroed() {
  return static_cast<T *>(TEE_Malloc(sizeof(T), TEE_MALLOC_FILL_ZERO));
}

// ---- The two forms

namespace {

struct list_forms {
  JSON_Value *dsi_t::*value;
  char *dsi_json_str_t::*text;
  json_array_form dsi_json_str_t::*form;
  const char *value_name;
  const char *text_name;
};

const list_forms kLists[] = {
    {&dsi_t::sdl, &dsi_json_str_t::sdl_json_str, &dsi_json_str_t::sdl_form, "sdl", "sdl_json_str"},
    {&dsi_t::spl, &dsi_json_str_t::spl_json_str, &dsi_json_str_t::spl_form, "spl", "spl_json_str"},
    {&dsi_t::tal, &dsi_json_str_t::tal_json_str, &dsi_json_str_t::tal_form, "tal", "tal_json_str"},
};
constexpr size_t kNumLists = sizeof kLists / sizeof kLists[0];

}  // namespace

static void drop_values(dsi_t *dsi, JSON_Value *dsi_t::*except = nullptr) {
  for (const list_forms &list : kLists) {
    if (list.value == except) continue;
    json_value_free(dsi->*list.value);
    dsi->*list.value = nullptr;
  }
}

void dsi_free(dsi_t *dsi) {
  if (dsi == nullptr) return;
  drop_values(dsi);
  TEE_Free(dsi);
}

void dsi_json_str_free(dsi_json_str_t *dsi) {
  if (dsi == nullptr) return;
  for (const list_forms &list : kLists) TEE_Free(dsi->*list.text);
  TEE_Free(dsi);
}

TEE_Result dsi_json_str_2_dsi(const dsi_json_str_t *in, dsi_t *out, JSON_Value *dsi_t::*edited) {
  CHECK(in != nullptr && out != nullptr, OTRP_MISSING, "dsi_json_str_2_dsi input is NULL");

  for (const list_forms &list : kLists) {
    const char *text = in->*list.text;
    if (text == nullptr) continue;
    JSON_Value **value = &(out->*list.value);
    json_value_free(*value);
    *value = list.value == edited ? json_value_init_slices(text, in->*list.form)
                                  : json_value_init_verbatim(text, in->*list.form);
    if (*value != nullptr) continue;
    drop_values(out);
    FAIL(OTRP_NO_MEMORY, "dsi_json_str_2_dsi %s string to json fail", list.text_name);
  }
  return TEE_SUCCESS;
}

TEE_Result dsi_2_dsi_json_str(const dsi_t *in, dsi_json_str_t *out) {
  CHECK(in != nullptr && out != nullptr, OTRP_MISSING, "dsi_2_dsi_json_str input is NULL");

  json_text texts[kNumLists];
  for (size_t i = 0; i < kNumLists; ++i) {
    const JSON_Value *value = in->*kLists[i].value;
    if (value == nullptr) continue;
    texts[i].reset(json_serialize_to_string(value));
    CHECK(texts[i], OTRP_NO_MEMORY, "dsi_2_dsi_json_str dsi->%s json to string fail",
          kLists[i].value_name);
  }
  for (size_t i = 0; i < kNumLists; ++i) {
    if (!texts[i]) continue;
    TEE_Free(out->*kLists[i].text);
    out->*kLists[i].text = texts[i].release();
    out->*kLists[i].form = json_look_through(out->*kLists[i].text);
  }
  return TEE_SUCCESS;
}

TEE_Result open_dsi(const dsi_json_str_t *dsi, JSON_Value *dsi_t::*edited, TEE_Result no_memory,
                    dsi_ptr *working, const char *as) {
  working->reset(allocate_zeroed<dsi_t>());
  CHECK_AS(as, *working, no_memory, "malloc dsi fail");
  TRY_LOG_AS(as, dsi_json_str_2_dsi(dsi, working->get(), edited),
             "dsi_json_str_2_dsi error code: 0x%x");
  if (edited != nullptr) drop_values(working->get(), edited);
  return TEE_SUCCESS;
}

// ---- Building it from the records

TEE_Result judge_sp_exist(const JSON_Value *spl, const char *spid) {
  const JSON_Array *entries = json_value_get_array(spl);
  const size_t num_entries = json_array_get_count(entries);
  for (size_t i = 0; i < num_entries; ++i) {
    const json_match listed = json_array_match(entries, i, "spid", spid);
    CHECK(listed >= kJsonOtherText, TEE_ERROR_GENERIC, "No spid fieldin sp json");
    if (listed == kJsonSameText) return TEE_SUCCESS;
  }
  return TEE_ERROR_ITEM_NOT_FOUND;
}

TEE_Result append_aik_entry(JSON_Value *spl, const char *spid, const uint8_t *key, uint32_t key_len,
                            const char *spaiktype, const char *as) {
  json_ptr entry(json_value_init_object());
  CHECK_AS(as, entry, TEE_ERROR_OUT_OF_MEMORY, "json_value_init_object teeaiklist_item_value fail");
  JSON_Object *members = json_value_get_object(entry.get());
  CHECK_AS(as, members != nullptr, TEE_ERROR_OUT_OF_MEMORY,
           "json_value_get_object teeaiklist_item_object fail");

  CHECK_AS(as, json_object_set_base64url(members, "spaik", {key, key_len}) == JSONSuccess,
           TEE_ERROR_OUT_OF_MEMORY, "base64urlEncodeAddEndZero pubkey fail");
  const bool filled = json_object_set_string(members, "spaiktype", spaiktype) == JSONSuccess &&
                      json_object_set_string(members, "spid", spid) == JSONSuccess &&
                      json_array_take(json_value_get_array(spl), &entry) == JSONSuccess;
  CHECK_AS(as, filled, TEE_ERROR_OUT_OF_MEMORY, "set dsi->spl fail");
  return TEE_SUCCESS;
}

static bool copy_text_member(JSON_Object *entry, const JSON_Object *record, const char *key) {
  if (json_object_get_string(record, key) == nullptr) return true;
  json_ptr copy(json_value_deep_copy(json_object_get_value(record, key)));
  return json_object_take(entry, key, &copy) == JSONSuccess;
}

TEE_Result fill_sd_entry(JSON_Object *entry, const JSON_Object *record, const char *as) {
  const bool named =
      copy_text_member(entry, record, "name") && copy_text_member(entry, record, "spid");
  CHECK_AS(as, named, TEE_ERROR_OUT_OF_MEMORY, "no memory for name and spid of sd object");
  const bool has_talist = json_object_get_array(record, "talist") != nullptr;
  json_ptr talist;
  if (has_talist) {
    talist.reset(json_value_deep_copy(json_object_get_value(record, "talist")));
  }
  CHECK_AS(as, json_object_take(entry, "talist", &talist) == JSONSuccess, TEE_ERROR_OUT_OF_MEMORY,
           "json_value_deep_copy talist from sd object fail, no mem for copy");
  return TEE_SUCCESS;
}

// An SP has one entry, however many SDs it has.
static TEE_Result dsi_init_sp(dsi_t *dsi, const char *spid) {
  const TEE_Result judged = judge_sp_exist(dsi->spl, spid);
  if (judged == TEE_SUCCESS) {
    trace_error(__func__, __LINE__, "judge_sp_exist exist");
    return TEE_SUCCESS;
  }
  CHECK(judged == TEE_ERROR_ITEM_NOT_FOUND, judged, "judge_sp_exist execution error");

  tee_ptr<uint8_t> key;
  uint32_t key_len = 0;
  const TEE_Result result = read_public_aik(spid, out(key), &key_len);
  if (result == OTRP_SP_NOT_FOUND) {
    trace_error(__func__, __LINE__,
                "init sp_info fail, return success to let tsm to updatesd to create new aik");
    return TEE_SUCCESS;
  }
  CHECK(result == TEE_SUCCESS, result, "read_public_aik fail error code 0x%x", result);
  return append_aik_entry(dsi->spl, spid, key.get(), key_len, "RSA");
}

static TEE_Result dsi_init_sd_by_name(dsi_t *dsi, const char *sdname) {
  json_ptr entry(json_parse_string(kSdEntryTemplate));
  if (!entry) return TEE_ERROR_OUT_OF_MEMORY;
  const json_ptr record(get_json_by_name(SD_INFO_PREFIX, sdname));
  CHECK(record, TEE_ERROR_GENERIC, "get_json_by_name %s %s error", SD_INFO_PREFIX,
        sdname != nullptr ? sdname : "(null)");
  const JSON_Object *members = json_value_get_object(record.get());
  const char *spid = json_object_get_string(members, "spid");
  CHECK(spid != nullptr, TEE_ERROR_GENERIC, "no spid in sd");

  TRY(dsi_init_sp(dsi, spid));
  TRY(fill_sd_entry(json_value_get_object(entry.get()), members));
  const JSON_Status added = json_array_take(json_value_get_array(dsi->sdl), &entry);
  return added == JSONSuccess ? TEE_SUCCESS : TEE_ERROR_OUT_OF_MEMORY;
}

static TEE_Result dsi_init_from_pobj(dsi_t *dsi) {
  json_ptr sd_list;
  JSON_Object *object = nullptr;
  JSON_Array *names = nullptr;
  TRY_LOG(get_sd_list_json_array(&names, &object, out(sd_list)),
          "get_sd_list_json_array error code: 0x%x");
  dsi->sdl = json_value_init_array();
  dsi->spl = json_value_init_array();
  dsi->tal = json_value_init_array();
  CHECK(dsi->sdl != nullptr && dsi->spl != nullptr && dsi->tal != nullptr, TEE_ERROR_OUT_OF_MEMORY,
        "No memory for sdl %p spl %p tal %p", static_cast<void *>(dsi->sdl),
        static_cast<void *>(dsi->spl), static_cast<void *>(dsi->tal));

  const size_t num_names = json_array_get_count(names);
  for (size_t i = 0; i < num_names; ++i) {
    TRY(dsi_init_sd_by_name(dsi, json_array_get_string(names, i)));
  }
  return TEE_SUCCESS;
}

dsi_json_str_t *init_dsi() {
  const dsi_ptr dsi(allocate_zeroed<dsi_t>());
  CHECK(dsi, nullptr, "No memory for dsi\n");
  dsi_text_ptr texts(allocate_zeroed<dsi_json_str_t>());
  CHECK(texts, nullptr, "No memory for dsi_json_str_t\n");
  if (dsi_init_from_pobj(dsi.get()) != TEE_SUCCESS) return nullptr;
  if (dsi_2_dsi_json_str(dsi.get(), texts.get()) != TEE_SUCCESS) return nullptr;
  return texts.release();
}

// ---- The document

// Makes `*list` a member of `into`; the setter's status when it cannot.
static TEE_Result hand_over(JSON_Object *into, const char *key, JSON_Value **list) {
  const JSON_Status set = json_object_set_value(into, key, *list);
  if (set == JSONSuccess) *list = nullptr;
  return static_cast<TEE_Result>(set);
}

static TEE_Result fill_sdlist_info(JSON_Object *tee, JSON_Value **sdl) {
  JSON_Object *sdlist = json_object_get_object(tee, "sdlist");
  const size_t num_sds = json_value_count_elements(*sdl);
  const JSON_Status set = json_object_set_number(sdlist, "cnt", static_cast<double>(num_sds));
  if (set != JSONSuccess) return static_cast<TEE_Result>(set);
  return hand_over(sdlist, "sd", sdl);
}

static TEE_Result fill_teeaiklist_info(JSON_Object *tee, JSON_Value **spl) {
  CHECK(hand_over(tee, "teeaiklist", spl) == TEE_SUCCESS, TEE_ERROR_OUT_OF_MEMORY,
        "fill_teeaiklist_info json_object_set_value teeaiklist fail");
  return TEE_SUCCESS;
}

// The document gets the lists themselves.
static JSON_Value *make_document(dsi_t *lists, const char *as = __builtin_FUNCTION()) {
  json_ptr document(json_parse_string(kDsiTemplate));
  JSON_Object *object = json_value_get_object(document.get());
  CHECK_AS(as, document && object != nullptr && lists != nullptr, nullptr,
           "malloc dsi_value %p dsi_object %p dsi %p\n", static_cast<void *>(document.get()),
           static_cast<void *>(object), static_cast<void *>(lists));

  JSON_Object *tee = json_object_get_object(json_object_get_object(object, "dsi"), "tee");
  TEE_Result result = fill_sdlist_info(tee, &lists->sdl);
  CHECK_AS(as, result == TEE_SUCCESS, nullptr, "fill_sdlist_info faill 0x%x", result);
  result = fill_teeaiklist_info(tee, &lists->spl);
  CHECK_AS(as, result == TEE_SUCCESS, nullptr, "fill_teeaiklist_info faill 0x%x", result);
  return document.release();
}

JSON_Value *dsi_get_json_dsi(const dsi_json_str_t *dsi) {
  const dsi_ptr working(allocate_zeroed<dsi_t>());
  if (working) {
    const TEE_Result result = dsi_json_str_2_dsi(dsi, working.get());
    CHECK(result == TEE_SUCCESS, nullptr, "dsi_json_str_2_dsi error code: 0x%x", result);
  }
  return make_document(working.get());
}

JSON_Value *construct_dsi() {
  JSON_Value *document = dsi_get_json_dsi(g_dsi);
  CHECK(document != nullptr, nullptr, "dsi_get_json_dsi error");
  if constexpr (TA_TRACE_LEVEL >= TEE_TRACE_DEBUG) {
    const json_text text(json_serialize_to_string(document));
    const json_ptr tree(json_parse_string(text.get()));
    const json_text dump(json_serialize_to_string_pretty(tree.get()));
    tee_trace(__func__, __LINE__, TEE_TRACE_DEBUG, "dsi_json %s", dump ? dump.get() : "");
  }
  return document;
}

// ---- Its hash

static bool dsi_serialize_to_json(dsi_t *lists, secret_bytes *text) {
  const json_ptr document(make_document(lists, "dsi_get_json_dsi"));
  CHECK(document, false, "dsi_get_json_dsi error");
  return json_serialize_to_bytes(document.get(), text);
}

static void write_hex(const uint8_t *bytes, uint32_t len, char *text) {
  const char digits[] = "0123456789abcdef";
  for (uint32_t i = 0; i < len; ++i) {
    text[2 * i] = digits[bytes[i] >> 4];
    text[2 * i + 1] = digits[bytes[i] & 15];
  }
}

// What a TSM hashes is what it got: the document in base64.
static TEE_Result digest_dsi(dsi_t *lists, uint8_t *digest, uint32_t digest_len,
                             const char *as = __builtin_FUNCTION()) {
  secret_bytes text;
  CHECK_AS(as, dsi_serialize_to_json(lists, &text), TEE_ERROR_GENERIC,
           "dsi_serialize_to_json error");
  const tee_ptr<char> encoded(base64EncodeAddEndZero(text.data, text.len));
  CHECK_AS(as, encoded, TEE_ERROR_OUT_OF_MEMORY, "base64EncodeAddEndZero error now_dsi_str error");
  const auto encoded_len = static_cast<uint32_t>(base64_room(text.len) - 1);
  return do_digest_with_sha(TEE_ALG_SHA256, encoded.get(), encoded_len, digest, &digest_len);
}

TEE_Result dsi_validate_dsi_hash(const dsi_json_str_t *dsi, const char *hash) {
  dsi_ptr working;
  TRY(open_dsi(dsi, nullptr, TEE_ERROR_OUT_OF_MEMORY, &working));

  const tee_ptr<uint8_t> digest(allocate_bytes(kSha256Len));
  CHECK(digest, TEE_ERROR_OUT_OF_MEMORY, "no memory for now_dsi_hash");
  TRY(digest_dsi(working.get(), digest.get(), kSha256Len));
  const tee_ptr<uint8_t> now(allocate_bytes(kHashTextLen));
  CHECK(now, TEE_ERROR_OUT_OF_MEMORY, "base64urlEncodeAddEndZero now_dsi_hash error");
  write_hex(digest.get(), kSha256Len, reinterpret_cast<char *>(now.get()));

  const bool matches = hash != nullptr && strlen(hash) == kHashTextLen &&
                       equal_in_constant_time(hash, now.get(), kHashTextLen);
  return matches ? TEE_SUCCESS : TEE_ERROR_MAC_INVALID;
}

TEE_Result validate_dsihash(const char *hash) {
  const TEE_Result result = dsi_validate_dsi_hash(g_dsi, hash);
  if (result == TEE_SUCCESS) return TEE_SUCCESS;
  return result == TEE_ERROR_MAC_INVALID ? OTRP_DSI_MISMATCH : OTRP_DSI_HASH_FAILED;
}
