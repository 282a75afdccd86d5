// SPDX-License-Identifier: BSD-2-Clause
#include "crypto/key_list.h"

#include "failure.h"
#include "ownership.h"

key_list *key_list_create(value_destructor destroy_value) {
  auto *list = reinterpret_cast<key_list *>(allocate_bytes(sizeof(key_list)));
  CHECK(list != nullptr, nullptr, "Out of memory, need %dB", static_cast<int>(sizeof(key_list)));
  list->destroy_value = destroy_value;
  return list;
}

static key_list_entry *find(const key_list *list, int key) {
  key_list_entry *entry = list->head;
  while (entry != nullptr && entry->key != key) entry = entry->next;
  return entry;
}

int key_list_add(key_list *list, int key, void *value) {
  if (find(list, key) != nullptr) return -1;
  auto *entry = reinterpret_cast<key_list_entry *>(allocate_bytes(sizeof(key_list_entry)));
  if (entry == nullptr) return -1;
  *entry = {key, value, nullptr, list->head};
  if (list->head != nullptr) list->head->prev = entry;
  list->head = entry;
  ++list->count;
  return 0;
}

int key_list_get(const key_list *list, int key, void **value) {
  const key_list_entry *entry = find(list, key);
  if (entry == nullptr) return -1;
  *value = entry->value;
  return 0;
}

void key_list_destroy(key_list *list) {
  if (list == nullptr) return;
  for (key_list_entry *entry = list->head; entry != nullptr;) {
    key_list_entry *next = entry->next;
    list->destroy_value(entry->value);
    TEE_Free(entry);
    entry = next;
  }
  TEE_Free(list);
}
