// SPDX-License-Identifier: BSD-2-Clause
/// A list of values under distinct integer keys, the newest first. It owns its values.
///
/// Results are 0, or -1 for a failure that changed nothing.
#ifndef KEY_LIST_H
#define KEY_LIST_H

#include <stdint.h>

using value_destructor = void (*)(void *value);

struct key_list_entry {
  int key;
  void *value;
  key_list_entry *prev;
  key_list_entry *next;
};

struct key_list {
  int count;
  key_list_entry *head;
  value_destructor destroy_value;
};

/// NULL: no memory.
key_list *key_list_create(value_destructor destroy_value);

/// Takes `value` over when it succeeds. Fails when the key is in the list or memory ran out.
[[nodiscard]] int key_list_add(key_list *list, int key, void *value);

/// The value stays the list's. Fails when there is no such key.
[[nodiscard]] int key_list_get(const key_list *list, int key, void **value);

/// Destroys the values, too. NULL is accepted.
void key_list_destroy(key_list *list);

#endif
