// SPDX-License-Identifier: BSD-2-Clause
#include "crypto/tlv_box.h"

#include "cursor.h"
#include "failure.h"

static constexpr uint32_t kRecordHeaderLen = 2 * sizeof(uint16_t);
static constexpr uint32_t kIntLen = sizeof(uint32_t);

static void destroy_bytes(uint8_t *bytes, uint32_t len) {
  if (bytes == nullptr) return;
  wipe(bytes, len);
  TEE_Free(bytes);
}

static void destroy_item(void *value) {
  auto *item = static_cast<tlv_item *>(value);
  destroy_bytes(item->value, item->len);
  TEE_Free(item);
}

using item_ptr = owned<tlv_item *, destroy_item>;

tlv_box *tlv_box_create() {
  box_ptr box(reinterpret_cast<tlv_box *>(allocate_bytes(sizeof(tlv_box))));
  CHECK(box, nullptr, "Out of memory, need %dB", static_cast<int>(sizeof(tlv_box)));
  box->items = key_list_create(destroy_item);
  return box->items != nullptr ? box.release() : nullptr;
}

void tlv_box_destroy(tlv_box *box) {
  if (box == nullptr) return;
  key_list_destroy(box->items);
  destroy_bytes(box->serialized, box->serialized_len);
  TEE_Free(box);
}

int tlv_box_putobject(tlv_box *box, uint16_t type, const void *value, uint32_t len) {
  if (box->serialized != nullptr) return TLV_SERIALIZED;
  if (len > UINT16_MAX || (value == nullptr && len != 0)) return TLV_ERROR;
  item_ptr item(reinterpret_cast<tlv_item *>(allocate_bytes(sizeof(tlv_item))));
  CHECK(item, TLV_OUT_OF_MEMORY, "Out of memory, need %uB",
        static_cast<unsigned>(sizeof(tlv_item)));
  item->type = type;
  item->len = static_cast<uint16_t>(len);
  item->value = allocate_bytes(len);
  CHECK(item->value != nullptr, TLV_OUT_OF_MEMORY, "Out of memory, need %dB",
        static_cast<int>(len));
  if (len != 0) memcpy(item->value, value, len);
  // All types at their full length would be more than a length can say.
  const uint32_t record_len = kRecordHeaderLen + len;
  if (record_len > UINT32_MAX - box->serialized_len) return TLV_ERROR;
  const int added = key_list_add(box->items, type, item.get());
  if (added != 0) return added;
  (void)item.release();
  box->serialized_len += record_len;
  return 0;
}

int tlv_box_put_int(tlv_box *box, uint16_t type, uint32_t value) {
  uint8_t bytes[kIntLen];
  writer out = {bytes, sizeof bytes};
  put_u32(&out, value);
  return tlv_box_put_bytes(box, type, bytes, sizeof bytes);
}

int tlv_box_put_bytes(tlv_box *box, uint16_t type, const uint8_t *value, uint32_t len) {
  return tlv_box_putobject(box, type, value, len);
}

int tlv_box_serialize(tlv_box *box) {
  if (box->serialized != nullptr) return TLV_SERIALIZED;
  box->serialized = allocate_bytes(box->serialized_len);
  CHECK(box->serialized != nullptr, TLV_OUT_OF_MEMORY, "Out of memory, need %dB",
        static_cast<int>(box->serialized_len));
  writer out = {box->serialized, box->serialized_len};
  for (const key_list_entry *entry = box->items->head; entry != nullptr; entry = entry->next) {
    const auto *item = static_cast<const tlv_item *>(entry->value);
    put_u16(&out, item->type);
    put_u16(&out, item->len);
    put(&out, {item->value, item->len});
  }
  return out.ok ? 0 : TLV_ERROR;
}

const uint8_t *tlv_box_get_buffer(const tlv_box *box) {
  return box->serialized;
}

uint32_t tlv_box_get_size(const tlv_box *box) {
  return box->serialized_len;
}

// Steps over the next record.
static bool take_record(reader *in, uint16_t *type, reader *value) {
  uint16_t len = 0;
  if (!take_u16(in, type) || !take_u16(in, &len)) return false;
  *value = {in->at, len};
  const uint8_t *bytes = nullptr;
  return len == 0 || take(in, len, &bytes);
}

// Among whole records.
static bool find_record(reader in, uint16_t wanted, reader *value) {
  uint16_t type = 0;
  while (take_record(&in, &type, value)) {
    if (type == wanted) return true;
  }
  return false;
}

// Whether the bytes are whole records of distinct types.
static bool is_box(const uint8_t *bytes, uint32_t len) {
  for (reader in = {bytes, len}; in.left != 0;) {
    const reader before = {bytes, len - in.left};
    uint16_t type = 0;
    reader value = {};
    if (!take_record(&in, &type, &value) || find_record(before, type, &value)) return false;
  }
  return true;
}

tlv_box *tlv_box_parse(const uint8_t *bytes, uint32_t len) {
  box_ptr box(tlv_box_create());
  if (!box || (bytes == nullptr && len != 0)) return nullptr;
  secret_bytes copy;
  copy.data = allocate_bytes(len);
  CHECK(copy.data != nullptr, nullptr, "Out of memory, need %dB", static_cast<int>(len));
  copy.len = len;
  if (len != 0) memcpy(copy.data, bytes, len);
  if (!is_box(copy.data, len)) return nullptr;
  box->serialized_len = len;
  box->serialized = copy.release();
  return box.release();
}

// A closed box is read where it is serialized.
static bool find_value(const tlv_box *box, uint16_t type, reader *value) {
  if (box->serialized != nullptr) {
    return find_record({box->serialized, box->serialized_len}, type, value);
  }
  void *found = nullptr;
  if (key_list_get(box->items, type, &found) != 0) return false;
  const auto *item = static_cast<const tlv_item *>(found);
  *value = {item->value, item->len};
  return true;
}

int tlv_box_get_int(const tlv_box *box, uint16_t type, uint32_t *value) {
  reader bytes = {};
  return find_value(box, type, &bytes) && take_u32(&bytes, value) ? 0 : TLV_ERROR;
}

int tlv_box_get_bytes(const tlv_box *box, uint16_t type, uint8_t *bytes, uint32_t *len) {
  reader value = {};
  if (!find_value(box, type, &value) || *len < value.left) return TLV_ERROR;
  if (*len != 0) memset(bytes, 0, *len);
  if (value.left != 0) memcpy(bytes, value.at, value.left);
  *len = value.left;
  return 0;
}

int tlv_box_get_bytes_ptr(const tlv_box *box, uint16_t type, const uint8_t **bytes, uint32_t *len) {
  reader value = {};
  if (!find_value(box, type, &value)) return TLV_NOT_FOUND;
  *bytes = value.at;
  *len = value.left;
  return 0;
}
