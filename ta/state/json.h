// SPDX-License-Identifier: BSD-2-Clause
/// JSON documents as trees: what the agent builds, changes or reads as a whole. Two builds of one
/// document give one text, byte for byte, since hashes and signatures are taken over it.
///
/// A name stands once in an object, where it was set first, whatever is set under it later.
/// A value belongs to the caller until it is set into an object or appended to an array; from then
/// on it lives and dies with that document. Pointers to it stay valid over that, and until it is
/// removed, replaced or freed. What json_*_get_* returns is borrowed.
///
/// Texts are NUL-terminated. A failure is NULL or JSONFailure, whatever it is due to: no memory, a
/// NULL argument, a limit; it changes nothing and is not logged. An edit needs no memory but for
/// the value that it adds. All memory is wiped before it is freed.
///
/// Limits: 19 containers around a parsed value, 960 members in an object, 122880 elements in an
/// array. No function needs stack that grows with a document.
#ifndef JSON_H
#define JSON_H

#include <stddef.h>

#include "data_part.h"
#include "ownership.h"

struct JSON_Value;
struct JSON_Object;
struct JSON_Array;

enum JSON_Status : int { JSONSuccess = 0, JSONFailure = -1 };

/// Parses the value that `text` starts with, white space aside; what comes after it is ignored.
JSON_Value *json_parse_string(const char *text);

JSON_Value *json_value_init_object();
JSON_Value *json_value_init_array();

/// What is to be known of an array's text before it can stand in a document as it is. Zeros:
/// nothing is known.
struct json_array_form {
  bool comes_back;  // it would be read, and written again as the same text
  uint32_t num_elements;
};

/// Looks through a text that json_serialize_to_string has made.
json_array_form json_look_through(const char *text);

/// The array that `text` is, for a document that is only written. Where the text is known to come
/// back it stays what it is, and has no elements that could be asked for; else it is parsed. It is
/// borrowed, by copies too.
JSON_Value *json_value_init_verbatim(const char *text, const json_array_form &form);

/// The same for an array that is to be edited: its elements stay the parts of the text that they
/// are. They can be written, removed, and asked by json_array_match().
JSON_Value *json_value_init_slices(const char *text, const json_array_form &form);

/// A document of its own, also when `value` is a part of one.
JSON_Value *json_value_deep_copy(const JSON_Value *value);

/// Frees a whole document. NULL is accepted.
void json_value_free(JSON_Value *value);

using json_ptr = owned<JSON_Value *, json_value_free>;

// ---- Views: NULL for what is not there, or is something else

JSON_Object *json_value_get_object(const JSON_Value *value);
JSON_Array *json_value_get_array(const JSON_Value *value);

JSON_Value *json_object_get_value(const JSON_Object *object, const char *name);
const char *json_object_get_string(const JSON_Object *object, const char *name);
data_part json_object_get_text(const JSON_Object *object, const char *name);  // with its length
JSON_Object *json_object_get_object(const JSON_Object *object, const char *name);
JSON_Array *json_object_get_array(const JSON_Object *object, const char *name);

/// 0 for NULL.
size_t json_array_get_count(const JSON_Array *array);

/// The number of elements of an array, verbatim or not; 0 for all else.
size_t json_value_count_elements(const JSON_Value *value);

/// A walk by ascending index takes constant time per step.
const char *json_array_get_string(const JSON_Array *array, size_t index);
JSON_Object *json_array_get_object(const JSON_Array *array, size_t index);

enum json_match { kJsonNoObject, kJsonNoText, kJsonOtherText, kJsonSameText };

/// What the element at `index`, if it is an object, has as its member `name`: no text, or which one
/// beside `text`. A NULL `text` is like no other.
json_match json_array_match(const JSON_Array *array, size_t index, const char *name,
                            const char *text);

// ---- Edits

/// A member of that name is replaced where it stands; a new one goes to the end.
///
/// json_object_set_value takes `value` over only when it succeeds. It refuses one that is part of
/// a document already, or that holds `object`. A string must be well-formed UTF-8, a number finite.
/// json_object_set_base64url sets the text that the bytes are encoded to; for want of memory it
/// logs what the encoder would.
[[nodiscard]] JSON_Status json_object_set_value(JSON_Object *object, const char *name,
                                                JSON_Value *value);
[[nodiscard]] JSON_Status json_object_set_string(JSON_Object *object, const char *name,
                                                 const char *string);
[[nodiscard]] JSON_Status json_object_set_base64url(JSON_Object *object, const char *name,
                                                    const data_part &bytes);
[[nodiscard]] JSON_Status json_object_set_number(JSON_Object *object, const char *name,
                                                 double number);

/// The same for the end of an array.
[[nodiscard]] JSON_Status json_array_append_value(JSON_Array *array, JSON_Value *value);
[[nodiscard]] JSON_Status json_array_append_string(JSON_Array *array, const char *string);

/// The same for a value that has an owner, which holds it no longer after a success. The name is
/// not copied: it is a literal, or else outlives the document.
[[nodiscard]] JSON_Status json_object_take(JSON_Object *object, const char *name, json_ptr *value);
[[nodiscard]] JSON_Status json_array_take(JSON_Array *array, json_ptr *value);

/// Frees an element; the array's last one moves there.
[[nodiscard]] JSON_Status json_array_remove(JSON_Array *array, size_t index);

// ---- Texts

/// Whether a string can be set: well-formed UTF-8.
[[nodiscard]] bool json_is_utf8(const char *string);

/// A new text without white space outside strings. Slashes are escaped, control characters that
/// have no letter of their own and bytes above 0x7F stand as they are.
char *json_serialize_to_string(const JSON_Value *value);

/// The same with its length, for a text that is long.
[[nodiscard]] bool json_serialize_to_bytes(const JSON_Value *value, secret_bytes *text);

/// The same, one member or element a line, indented by four spaces a level.
char *json_serialize_to_string_pretty(const JSON_Value *value);

using json_text = secret_text;

#endif
