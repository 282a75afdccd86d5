// SPDX-License-Identifier: BSD-2-Clause
#include "failure.h"
#include "state/json_node.h"
#include "state/json_number.h"

namespace {

struct parser {
  const char *at;
  const char *end;  // its NUL
  json_room room;
};

struct json_measure {
  json_extent extent;
  uint32_t num_children;  // of the outermost container
  bool has_fraction;      // one of its numbers
};

struct decoded_string {
  char *text;  // in the block, or `own`
  uint32_t len;
  bool plain;  // is written as it stands
  secret_text own;
};

}  // namespace

static bool is_space(char c) {
  return c == ' ' || (c >= '\t' && c <= '\r');
}

static const char *skip_space(const char *at) {
  while (is_space(*at)) ++at;
  return at;
}

// ---- First pass: what the document needs
//
// It reads no grammar. On a text that is no JSON it may count anything, but the second pass stops
// at the first fault, and up to there every node and every text has been counted.

// From behind the opening quote to behind the closing one; NULL when there is none.
static const char *measure_string(const char *at, const char *end, json_extent *extent) {
  for (;;) {
    const char *start = at;
    at = find_special(at, end);
    extent->text_len += static_cast<uint64_t>(at - start) + 1;
    if (*at == '"') return at + 1;
    if (*at != '\\' || at[1] == 0) return nullptr;
    at += 2;
  }
}

static bool measure(const char *at, const char *end, json_measure *found) {
  *found = {{1, 0, 0}, 0, false};
  json_extent *extent = &found->extent;
  uint32_t depth = 0;
  do {
    switch (*at++) {
      case '"':
        at = measure_string(at, end, extent);
        if (at == nullptr) return false;
        break;
      case '[':
      case '{':
        if (at[-1] == '[') ++extent->num_arrays;
        ++depth;
        at = skip_space(at);
        if (*at == ']' || *at == '}') break;
        if (depth > kMaxDepth) return false;
        ++extent->num_nodes;
        if (depth == 1) ++found->num_children;
        break;
      case ',':
        ++extent->num_nodes;
        if (depth == 1) ++found->num_children;
        break;
      case '.':
        found->has_fraction = true;
        break;
      case ']':
      case '}':
        if (depth-- == 0) return false;
        break;
      case 0:
        return false;
    }
  } while (depth != 0);
  return true;
}

// ---- Strings

static bool take_code_unit(parser *in, uint32_t *unit) {
  if (in->at[0] != '\\' || in->at[1] != 'u') return false;
  in->at += 2;
  *unit = 0;
  for (int i = 0; i < 4; ++i) {
    const char c = *in->at++;
    const char lower = static_cast<char>(c | 0x20);
    if (c >= '0' && c <= '9') {
      *unit = *unit * 16 + static_cast<uint32_t>(c - '0');
    } else if (lower >= 'a' && lower <= 'f') {
      *unit = *unit * 16 + static_cast<uint32_t>(lower - 'a' + 10);
    } else {
      return false;
    }
  }
  return true;
}

static char *put_utf8(char *to, uint32_t code) {
  if (code < 0x80) {
    *to++ = static_cast<char>(code);
    return to;
  }
  const int num_more = code < 0x800 ? 1 : code < 0x10000 ? 2 : 3;
  const uint32_t lead = code < 0x800 ? 0xC0 : code < 0x10000 ? 0xE0 : 0xF0;
  *to++ = static_cast<char>(lead | (code >> (6 * num_more)));
  for (int i = num_more - 1; i >= 0; --i) {
    *to++ = static_cast<char>(0x80 | ((code >> (6 * i)) & 0x3F));
  }
  return to;
}

static bool take_unicode_escape(parser *in, char **to) {
  uint32_t code = 0;
  if (!take_code_unit(in, &code)) return false;
  if (code >= 0xDC00 && code <= 0xDFFF) return false;
  if (code >= 0xD800 && code <= 0xDBFF) {
    uint32_t low = 0;
    if (!take_code_unit(in, &low) || low < 0xDC00 || low > 0xDFFF) return false;
    code = 0x10000 + ((code - 0xD800) << 10) + (low - 0xDC00);
  }
  *to = put_utf8(*to, code);
  return true;
}

static char escaped_character(char letter) {
  switch (letter) {
    case '"':
    case '\\':
    case '/':
      return letter;
    case 'b':
      return '\b';
    case 'f':
      return '\f';
    case 'n':
      return '\n';
    case 'r':
      return '\r';
    case 't':
      return '\t';
    default:
      return 0;
  }
}

static bool take_escape(parser *in, char **to) {
  if (in->at[1] == 'u') return take_unicode_escape(in, to);
  const char c = escaped_character(in->at[1]);
  if (c == 0) return false;
  *(*to)++ = c;
  in->at += 2;
  return true;
}

static char *take_plain(parser *in, char *to) {
  const char *end = find_special(in->at, in->end);
  const auto len = static_cast<size_t>(end - in->at);
  memcpy(to, in->at, len);
  in->at = end;
  return to + len;
}

// Decodes a string, from behind its opening quote, into the block. One that shrinks to half of its
// raw size moves out, and leaves its place in the block to the next.
static bool process_string(parser *in, decoded_string *string) {
  const char *raw = in->at;
  char *text = in->room.texts;
  char *to = take_plain(in, text);
  const bool has_escapes = *in->at == '\\';
  while (*in->at == '\\') {
    if (!take_escape(in, &to)) return false;
    to = take_plain(in, to);
  }
  if (*in->at != '"') return false;
  *to = 0;
  string->text = text;
  // An escaped NUL ends the text.
  string->len = static_cast<uint32_t>(has_escapes ? strlen(text) : static_cast<size_t>(to - text));
  string->plain = !has_escapes && memchr(text, '/', string->len) == nullptr;

  const auto initial_size = static_cast<uint64_t>(in->at++ - raw) + 1;
  const uint32_t final_size = string->len + 1;
  CHECK(final_size <= initial_size, false,
        "%s: Unexpected case. Final size(%d) > initial_size(%d)\n", __func__,
        static_cast<int>(final_size), static_cast<int>(initial_size));
  if (final_size > initial_size / 2) {
    in->room.texts += final_size;
    return true;
  }
  string->own.reset(reinterpret_cast<char *>(allocate_bytes(final_size)));
  CHECK(string->own, false, "%s: bad malloc. Final size(%d) initial_size(%d)", __func__,
        static_cast<int>(final_size), static_cast<int>(initial_size));
  memcpy(string->own.get(), text, final_size);
  string->text = string->own.get();
  return true;
}

// ---- Numbers

static bool is_digit(char c) {
  return c >= '0' && c <= '9';
}

static const char *skip_digits(const char *at) {
  while (is_digit(*at)) ++at;
  return at;
}

// `at` is returned unchanged when there is no complete exponent.
static const char *take_exponent(const char *at, int64_t *exponent) {
  if ((*at | 0x20) != 'e') return at;
  const bool negative = at[1] == '-';
  const char *digit = negative || at[1] == '+' ? at + 2 : at + 1;
  if (!is_digit(*digit)) return at;
  int64_t size = 0;
  for (; is_digit(*digit); ++digit) {
    if (size < INT64_MAX / 20) size = size * 10 + (*digit - '0');
  }
  *exponent = negative ? -size : size;
  return digit;
}

static bool take_number(parser *in, double *value) {
  const bool negative = *in->at == '-';
  const char *start = negative ? in->at + 1 : in->at;
  const char *end = skip_digits(start);
  const bool has_point = *end == '.';
  if (has_point) end = skip_digits(end + 1);
  if (end - start == (has_point ? 1 : 0)) return false;
  int64_t exponent = 0;
  const char *at = take_exponent(end, &exponent);

  const bool leading_zero = *start == '0' && at - start > 1 && start[1] != '.';
  if (leading_zero || (*at | 0x20) == 'x') return false;
  double magnitude = 0;
  if (!nearest_double(start, end, exponent, &magnitude)) return false;
  *value = negative ? -magnitude : magnitude;
  in->at = at;
  return true;
}

// ---- Second pass: the document

static bool take_literal(parser *in, const char *literal) {
  const size_t len = strlen(literal);
  if (strncmp(in->at, literal, len) != 0) return false;
  in->at += len;
  return true;
}

// The type of the value that starts with `c`; false when none does.
static bool type_at(char c, json_type *type) {
  switch (c) {
    case '{':
      *type = kJsonObject;
      return true;
    case '[':
      *type = kJsonArray;
      return true;
    case '"':
      *type = kJsonString;
      return true;
    case 't':
      *type = kJsonTrue;
      return true;
    case 'f':
      *type = kJsonFalse;
      return true;
    case 'n':
      *type = kJsonNull;
      return true;
    default:
      *type = kJsonNumber;
      return c == '-' || is_digit(c);
  }
}

static bool take_string(parser *in, JSON_Value *value) {
  ++in->at;
  decoded_string string;
  if (!process_string(in, &string)) return false;
  value->text = string.text;
  value->count = string.len;
  if (string.plain) value->flags |= kPlainText;
  if (string.own.release() != nullptr) value->flags |= kOwnsText;
  return true;
}

// Takes a whole value, of a container only the opening bracket.
static bool take_value(parser *in, JSON_Value *value) {
  switch (value->type) {
    case kJsonNull:
      return take_literal(in, "null");
    case kJsonFalse:
      return take_literal(in, "false");
    case kJsonTrue:
      return take_literal(in, "true");
    case kJsonNumber:
      return take_number(in, &value->number);
    case kJsonString:
      return take_string(in, value);
    default:
      in->at = skip_space(in->at + 1);
      return true;
  }
}

// The next child's node, and for a member its name; NULL on a fault or beyond a limit.
static JSON_Value *add_element(parser *in, JSON_Value *array, JSON_Value *last) {
  json_type type;
  if (array->count == kMaxElements || !type_at(*in->at, &type)) return nullptr;
  JSON_Value *element = new_node(&in->room, type);
  append_child(array, last, element);
  return element;
}

static JSON_Value *add_member(parser *in, JSON_Value *object) {
  if (object->count == kMaxMembers || *in->at != '"') return nullptr;
  ++in->at;
  decoded_string name;
  if (!process_string(in, &name)) return nullptr;
  JSON_Value *last;
  if (find_member(object, name.text, name.len, &last) != nullptr) return nullptr;
  in->at = skip_space(in->at);
  if (*in->at != ':') return nullptr;
  in->at = skip_space(in->at + 1);

  json_type type;
  if (!type_at(*in->at, &type)) return nullptr;
  JSON_Value *member = new_node(&in->room, type);
  set_name(member, name.text, name.len, name.plain);
  if (name.own.release() != nullptr) member->flags |= kOwnsName;
  append_child(object, last, member);
  return member;
}

static JSON_Value *add_child(parser *in, JSON_Value *parent, JSON_Value *last) {
  return parent->type == kJsonArray ? add_element(in, parent, last) : add_member(in, parent);
}

static bool take_closing(parser *in, const JSON_Value *container) {
  if (*in->at != (container->type == kJsonArray ? ']' : '}')) return false;
  ++in->at;
  return true;
}

// The tree is whole after every step, so that it can be freed at any.
static bool take_document(parser *in, JSON_Value *root) {
  for (JSON_Value *value = root; value != nullptr;) {
    if (!take_value(in, value)) return false;
    if (is_container(value) && !take_closing(in, value)) {
      value = add_child(in, value, nullptr);
      continue;
    }
    // What is complete is the last child so far: its `next` is its parent.
    for (;;) {
      if (value == root) return true;
      JSON_Value *parent = value->next;
      in->at = skip_space(in->at);
      if (*in->at == ',') {
        in->at = skip_space(in->at + 1);
        value = add_child(in, parent, value);
        break;
      }
      if (!take_closing(in, parent)) return false;
      value = parent;
    }
  }
  return false;
}

JSON_Value *json_parse_string(const char *text) {
  if (text == nullptr) return nullptr;
  parser in = {skip_space(text), text + strlen(text), {}};
  json_measure found;
  json_type type;
  if (!type_at(*in.at, &type) || !measure(in.at, in.end, &found)) return nullptr;
  json_ptr document(new_block(found.extent, type, &in.room));
  if (!document || !take_document(&in, document.get())) return nullptr;
  return document.release();
}

// What has been serialized has no fault of grammar, but may be nested too deeply, or have control
// characters, for which there are no escapes; and a fraction may have lost what was behind its
// last digit, so that it is written otherwise the next time.
json_array_form json_look_through(const char *text) {
  json_measure found;
  if (*text != '[' || !measure(text, text + strlen(text), &found)) return {};
  return {!found.has_fraction, found.num_children};
}

JSON_Value *json_value_init_verbatim(const char *text, const json_array_form &form) {
  if (!form.comes_back) return json_parse_string(text);
  json_room room;
  JSON_Value *value = new_block({1, 0, 0}, kJsonVerbatim, &room);
  if (value == nullptr) return nullptr;
  value->text = const_cast<char *>(text);
  value->count = form.num_elements;
  return value;
}

// ---- Slices
//
// Of a text that comes back: it has no white space, and each bracket and quote has its partner.

// From behind the opening quote to behind the closing one.
static const char *skip_string(const char *at, const char *end) {
  for (at = find_special(at, end); *at != '"'; at = find_special(at + 2, end)) {
  }
  return at + 1;
}

// To the comma or the closing bracket behind the value.
static const char *skip_value(const char *at, const char *end) {
  for (uint32_t depth = 0;;) {
    const char c = *at;
    if (depth == 0 && (c == ',' || c == ']' || c == '}')) return at;
    ++at;
    if (c == '"') {
      at = skip_string(at, end);
    } else if (c == '[' || c == '{') {
      ++depth;
    } else if (c == ']' || c == '}') {
      --depth;
    }
  }
}

JSON_Value *json_value_init_slices(const char *text, const json_array_form &form) {
  if (!form.comes_back) return json_parse_string(text);
  json_room room;
  JSON_Value *array = new_block({uint64_t{form.num_elements} + 1, 1, 0}, kJsonArray, &room);
  if (array == nullptr) return nullptr;
  const char *end = text + strlen(text);
  JSON_Value *last = nullptr;
  for (const char *at = text; array->count != form.num_elements;) {
    ++at;  // a bracket or a comma
    JSON_Value *slice = new_node(&room, kJsonSlice);
    slice->text = const_cast<char *>(at);
    at = skip_value(at, end);
    slice->count = static_cast<uint32_t>(at - slice->text);
    append_child(array, last, slice);
    last = slice;
  }
  return array;
}

// Whether the string that `at` is inside of, up to its closing quote, is written for `text`.
static bool is_written_for(const char *at, const char *text) {
  for (; *text != 0; ++text) {
    const char letter = escape_letter(*text);
    if (letter != 0 && *at++ != '\\') return false;
    if (*at++ != (letter != 0 ? letter : *text)) return false;
  }
  return *at == '"';
}

json_match slice_match(const JSON_Value *slice, const char *name, const char *text) {
  const char *at = slice->text;
  const char *end = at + slice->count;
  if (*at != '{') return kJsonNoObject;
  while (*at != '}' && at[1] == '"') {
    const bool wanted = is_written_for(at + 2, name);
    at = skip_string(at + 2, end) + 1;
    if (wanted && *at != '"') return kJsonNoText;
    if (wanted)
      return text != nullptr && is_written_for(at + 1, text) ? kJsonSameText : kJsonOtherText;
    at = skip_value(at, end);
  }
  return kJsonNoText;
}
