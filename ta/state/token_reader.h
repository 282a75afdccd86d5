// SPDX-License-Identifier: BSD-2-Clause
/// Reads a few members of a large text at the price of its tokens: requests are mostly ciphertext,
/// which nobody wants twice on the heap.
///
/// Values are pointers into the text, with its escape sequences. So the text has to stay for as
/// long as they are used, and freeing them leaves it alone.
///
/// A lookup takes the token that follows the first string equal to the key, in text order and at
/// any depth, be that string a member's name or a value. So the first of two members wins, inner
/// members are seen from outside, and a value that looks like a name counts as one.
#ifndef TOKEN_READER_H
#define TOKEN_READER_H

#include <stdint.h>

#include "ownership.h"

struct jsmn_token;

struct jsmn_string {
  const char *data;  // not NUL-terminated; NULL: no such value
  uint32_t len;
};

struct jsmn_object {
  jsmn_token *tokens;  // in text order; the first is the object itself
  uint32_t count;
  jsmn_string *text;  // it and the tokens belong to the object
};

/// A new empty slice, for the caller to point at a text; NULL: no memory.
jsmn_string *jsmn_init_string();

/// A new object over the text of `slice`, up to a NUL in it. NULL, and a line in the log, when the
/// text is no JSON whose first value is an object, or memory ran out.
jsmn_object *jsmn_init_object(const jsmn_string *slice);

/// A new slice of the value behind `key`, without the quotes of a string. A value that is missing
/// has NULL `data`, an empty string has not. NULL: no memory.
jsmn_string *jsmn_object_get_string(const jsmn_object *object, const char *key);

/// The same for an object; NULL when the value is something else.
jsmn_object *jsmn_object_get_object(const jsmn_object *object, const char *key);

/// Both accept NULL.
void jsmn_free_string(jsmn_string *slice);
void jsmn_free_object(jsmn_object *object);

/// The characters as a text of the caller's own; NULL for NULL, or for want of memory.
char *jsmn_string_dup(const char *data, uint32_t len);

using slice_ptr = owned<jsmn_string *, jsmn_free_string>;
using token_object_ptr = owned<jsmn_object *, jsmn_free_object>;

#endif
