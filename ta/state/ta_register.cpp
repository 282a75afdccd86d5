// SPDX-License-Identifier: BSD-2-Clause
#include "state/ta_register.h"

#include "cursor.h"
#include "failure.h"
#include "otrp_result.h"
#include "ownership.h"
#include "platform.h"
#include "record_names.h"
#include "state/object_store.h"

namespace {

constexpr uint32_t kTaidLen = 32;
constexpr uint32_t kDigestLen = 32;
constexpr uint32_t kRowLen = kTaidLen + kDigestLen;
constexpr uint32_t kCountLen = 4;

constexpr uint32_t kDigestLenOffset = 16;
constexpr uint32_t kDigestOffset = 20;
static_assert(kDigestOffset + kDigestLen == kTaImageHeaderLen);

constexpr uint32_t kRegisterIdLen = sizeof(TA_REGISTER_ID) - 1;

struct table {
  secret_bytes payload;
  uint32_t num_rows = 0;

  const uint8_t *row(uint32_t i) const { return payload.data + kCountLen + i * kRowLen; }
  data_part range(uint32_t from, uint32_t to) const { return {row(from), (to - from) * kRowLen}; }
};

const char kNotSaved[] = "can not init ta_register_info " TA_REGISTER_ID;
const char kNotChanged[] =
    "can not init ta_register_info " TA_REGISTER_ID ", create_sd function fail";

}  // namespace

// A new copy of the digest in the image's header, or NULL.
static uint8_t *read_ta_bin_ta_hash(const uint8_t *ta_image) {
  uint16_t len = 0;
  reader in = {ta_image + kDigestLenOffset, kTaImageHeaderLen - kDigestLenOffset};
  CHECK(take_u16(&in, &len) && len == kDigestLen, nullptr,
        "read ta hash size should be 32, but hash size is %d", len);
  uint8_t *digest = allocate_bytes(kDigestLen);
  CHECK(digest != nullptr, nullptr, "malloc ta mem get NULL");
  memcpy(digest, ta_image + kDigestOffset, kDigestLen);
  return digest;
}

// ---- The stored table

static TEE_Result load_table(table *rows, const char *as = __builtin_FUNCTION()) {
  const uint8_t no_rows[kCountLen] = {};
  TRY(load_or_create(TA_REGISTER_ID, {no_rows, kCountLen}, kNotSaved, &rows->payload, as));
  reader in = {rows->payload.data, rows->payload.len};
  uint32_t num_rows = UINT32_MAX;
  CHECK_AS(as, take_u32(&in, &num_rows) && num_rows <= in.left / kRowLen, TEE_ERROR_BAD_FORMAT,
           "ta_register_info holds %u bytes, not %u rows", rows->payload.len, num_rows);
  rows->num_rows = num_rows;
  return TEE_SUCCESS;
}

// The last row of `taid`, or num_rows when there is none.
static uint32_t find_row(const table &rows, const char *taid) {
  for (uint32_t i = rows.num_rows; i > 0; --i) {
    if (memcmp(rows.row(i - 1), taid, kTaidLen) == 0) return i - 1;
  }
  return rows.num_rows;
}

// ---- Operations

// A table of the rows before, one row in between, or none, and the rows after.
static TEE_Result save_rows(const data_part (&parts)[4], const char *not_saved,
                            const char *as = __builtin_FUNCTION()) {
  uint32_t len = kCountLen;
  for (const data_part &part : parts) len += part.len;
  const tee_ptr<uint8_t> data(allocate_bytes(len));
  writer out = {data.get(), data ? len : 0};
  put_u32(&out, (len - kCountLen) / kRowLen);
  for (const data_part &part : parts) put(&out, part);
  CHECK_AS(as, out.ok, OTRP_NO_MEMORY, "malloc data_buf but get NULL");

  const TEE_Result saved =
      save_data_to_persistent_object(data.get(), len, TA_REGISTER_ID, kRegisterIdLen, false);
  CHECK_AS(as, saved == TEE_SUCCESS, saved, "%s", not_saved);
  return TEE_SUCCESS;
}

TEE_Result save_ta_register_info(const char *taid, const uint8_t *ta_image,
                                 int32_t operation_code) {
  tee_ptr<uint8_t> digest;
  if (ta_image != nullptr) {
    digest.reset(read_ta_bin_ta_hash(ta_image));
    CHECK(digest, OTRP_MISSING, "read ta_decrypted tahash get NULL");
  }
  const bool valid = taid != nullptr && strlen(taid) == kTaidLen && operation_code >= kRegisterTa &&
                     operation_code <= kUnregisterTa && (digest || operation_code == kUnregisterTa);
  CHECK(valid, OTRP_MISSING, "input format not valid!");

  table rows;
  TRY(load_table(&rows));
  const uint32_t row = find_row(rows, taid);
  const bool listed = row < rows.num_rows;
  const bool is_new = operation_code == kRegisterTa;
  CHECK(!is_new || !listed, OTRP_TA_EXISTS, "this ta %s has been installed", taid);
  CHECK(is_new || listed, OTRP_NOT_FOUND, "this ta %s has not been installed", taid);
  data_part parts[] = {rows.range(0, row),
                       {taid, kTaidLen},
                       {digest.get(), kDigestLen},
                       rows.range(is_new ? row : row + 1, rows.num_rows)};
  if (operation_code == kUnregisterTa) parts[1] = parts[2] = {};
  return save_rows(parts, is_new ? kNotSaved : kNotChanged);
}
