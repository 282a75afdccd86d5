// SPDX-License-Identifier: BSD-2-Clause
#include "state/json.h"

#include "crypto/base64.h"
#include "failure.h"
#include "state/json_node.h"

// ---- Blocks

namespace {

struct block_header {
  alignas(JSON_Value) uint32_t len;  // of the whole block
};

}  // namespace

JSON_Value *new_block(const json_extent &extent, json_type type, json_room *room) {
  const uint64_t nodes_len = extent.num_nodes * sizeof(JSON_Value) +
                             extent.num_arrays * (sizeof(JSON_Array) - sizeof(JSON_Value));
  const uint64_t len = sizeof(block_header) + nodes_len + extent.text_len;
  if (len > UINT32_MAX) return nullptr;
  uint8_t *block = allocate_bytes(static_cast<uint32_t>(len));
  if (block == nullptr) return nullptr;
  reinterpret_cast<block_header *>(block)->len = static_cast<uint32_t>(len);
  room->nodes = block + sizeof(block_header);
  room->texts = reinterpret_cast<char *>(room->nodes + nodes_len);
  JSON_Value *first = new_node(room, type);
  first->flags = kBeginsBlock;
  return first;
}

JSON_Value *new_node(json_room *room, json_type type) {
  auto *node = reinterpret_cast<JSON_Value *>(room->nodes);
  node->type = type;
  room->nodes += type == kJsonArray ? sizeof(JSON_Array) : sizeof(JSON_Value);
  return node;
}

static void release_text(char *text, uint32_t len) {
  wipe(text, len);
  TEE_Free(text);
}

static void release_node(JSON_Value *node) {
  if ((node->flags & kOwnsName) != 0) release_text(node->name, name_len(node));
  if ((node->flags & kOwnsText) != 0) release_text(node->text, node->count);
  if ((node->flags & kBeginsBlock) == 0) return;
  auto *block = reinterpret_cast<block_header *>(node) - 1;
  wipe(block, block->len);
  TEE_Free(block);
}

static JSON_Value *first_leaf(JSON_Value *at) {
  while (has_children(at)) at = at->first;
  return at;
}

// Children go before their parent, so that a block goes after everything that hangs from it.
void json_value_free(JSON_Value *value) {
  if (value == nullptr || value->next != nullptr) return;
  for (JSON_Value *at = first_leaf(value); at != value;) {
    JSON_Value *next = is_last_child(at) ? at->next : first_leaf(at->next);
    release_node(at);
    at = next;
  }
  release_node(value);
}

static JSON_Value *new_single(json_type type) {
  json_room room;
  return new_block({1, type == kJsonArray ? 1u : 0u, 0}, type, &room);
}

JSON_Value *json_value_init_object() {
  return new_single(kJsonObject);
}

JSON_Value *json_value_init_array() {
  return new_single(kJsonArray);
}

// ---- Copies

// The node that follows in the text of the document `root`; NULL behind its last one.
static const JSON_Value *next_in_text(const JSON_Value *at, const JSON_Value *root) {
  if (has_children(at)) return at->first;
  while (at != root && is_last_child(at)) at = at->next;
  return at != root ? at->next : nullptr;
}

static json_extent measure_tree(const JSON_Value *root) {
  json_extent extent = {};
  for (const JSON_Value *at = root; at != nullptr; at = next_in_text(at, root)) {
    ++extent.num_nodes;
    if (at->type == kJsonArray) ++extent.num_arrays;
    if (at->type == kJsonString) extent.text_len += uint64_t{at->count} + 1;
    if (at != root && at->name != nullptr) extent.text_len += uint64_t{name_len(at)} + 1;
  }
  return extent;
}

static void copy_content(const JSON_Value *from, JSON_Value *to, json_room *room) {
  if (from->type == kJsonNumber) to->number = from->number;
  if (from->type != kJsonString && from->type != kJsonVerbatim && from->type != kJsonSlice) return;
  to->text = from->type == kJsonString ? new_text(room, from->text, from->count) : from->text;
  to->count = from->count;
  to->flags |= from->flags & kPlainText;
}

static JSON_Value *copy_child(const JSON_Value *from, JSON_Value *parent, JSON_Value *last,
                              json_room *room) {
  JSON_Value *child = new_node(room, from->type);
  if (from->name != nullptr) {
    child->name = new_text(room, from->name, name_len(from));
    child->capped_name_len = from->capped_name_len;
    child->flags |= from->flags & kPlainName;
  }
  copy_content(from, child, room);
  append_child(parent, last, child);
  return child;
}

JSON_Value *json_value_deep_copy(const JSON_Value *value) {
  if (value == nullptr) return nullptr;
  json_room room;
  JSON_Value *to = new_block(measure_tree(value), value->type, &room);
  if (to == nullptr) return nullptr;
  copy_content(value, to, &room);
  for (const JSON_Value *from = value;;) {
    if (has_children(from)) {
      from = from->first;
      to = copy_child(from, to, nullptr, &room);
      continue;
    }
    // What has just been copied is a last child; its `next` is its parent.
    for (; from != value && is_last_child(from); from = from->next) to = to->next;
    if (from == value) return to;
    from = from->next;
    to = copy_child(from, to->next, to, &room);
  }
}

// ---- Views

JSON_Object *json_value_get_object(const JSON_Value *value) {
  if (value == nullptr || value->type != kJsonObject) return nullptr;
  return reinterpret_cast<JSON_Object *>(const_cast<JSON_Value *>(value));
}

JSON_Array *json_value_get_array(const JSON_Value *value) {
  if (value == nullptr || value->type != kJsonArray) return nullptr;
  return reinterpret_cast<JSON_Array *>(const_cast<JSON_Value *>(value));
}

static const char *value_text(const JSON_Value *value) {
  return value != nullptr && value->type == kJsonString ? value->text : nullptr;
}

static uint16_t capped(uint32_t len) {
  return len < kLongName ? static_cast<uint16_t>(len) : kLongName;
}

void set_name(JSON_Value *member, char *name, uint32_t len, bool plain) {
  member->name = name;
  member->capped_name_len = capped(len);
  member->flags &= static_cast<uint8_t>(~kPlainName);
  if (plain) member->flags |= kPlainName;
}

JSON_Value *find_member(const JSON_Value *object, const char *name, uint32_t len,
                        JSON_Value **last) {
  const uint16_t capped_len = capped(len);
  *last = nullptr;
  JSON_Value *at = object->first;
  for (uint32_t i = 0; i < object->count; ++i, at = at->next) {
    if (at->capped_name_len == capped_len && strcmp(at->name, name) == 0) return at;
    *last = at;
  }
  return nullptr;
}

JSON_Value *json_object_get_value(const JSON_Object *object, const char *name) {
  if (object == nullptr || name == nullptr) return nullptr;
  JSON_Value *last;
  return find_member(&object->node, name, static_cast<uint32_t>(strlen(name)), &last);
}

const char *json_object_get_string(const JSON_Object *object, const char *name) {
  return value_text(json_object_get_value(object, name));
}

data_part json_object_get_text(const JSON_Object *object, const char *name) {
  const JSON_Value *value = json_object_get_value(object, name);
  const char *text = value_text(value);
  return {text, text != nullptr ? value->count : 0};
}

JSON_Object *json_object_get_object(const JSON_Object *object, const char *name) {
  return json_value_get_object(json_object_get_value(object, name));
}

JSON_Array *json_object_get_array(const JSON_Object *object, const char *name) {
  return json_value_get_array(json_object_get_value(object, name));
}

size_t json_array_get_count(const JSON_Array *array) {
  return array != nullptr ? array->node.count : 0;
}

size_t json_value_count_elements(const JSON_Value *value) {
  const bool listed =
      value != nullptr && (value->type == kJsonArray || value->type == kJsonVerbatim);
  return listed ? value->count : 0;
}

// The element at `index`, which must be there. Starts from where the last walk ended, if it can.
static JSON_Value *walk_to(const JSON_Array *array, uint32_t index) {
  if (array->walked_to == nullptr || array->walked_index > index) {
    array->walked_to = array->node.first;
    array->walked_index = 0;
  }
  for (; array->walked_index < index; ++array->walked_index) {
    array->walked_to = array->walked_to->next;
  }
  return array->walked_to;
}

static JSON_Value *element(const JSON_Array *array, size_t index) {
  if (index >= json_array_get_count(array)) return nullptr;
  return walk_to(array, static_cast<uint32_t>(index));
}

const char *json_array_get_string(const JSON_Array *array, size_t index) {
  return value_text(element(array, index));
}

JSON_Object *json_array_get_object(const JSON_Array *array, size_t index) {
  return json_value_get_object(element(array, index));
}

json_match json_array_match(const JSON_Array *array, size_t index, const char *name,
                            const char *text) {
  const JSON_Value *value = element(array, index);
  if (value != nullptr && value->type == kJsonSlice) return slice_match(value, name, text);
  const JSON_Object *object = json_value_get_object(value);
  if (object == nullptr) return kJsonNoObject;
  const char *member = json_object_get_string(object, name);
  if (member == nullptr) return kJsonNoText;
  return text != nullptr && strcmp(member, text) == 0 ? kJsonSameText : kJsonOtherText;
}

// ---- Edits

// RFC 3629: no overlong forms, no surrogates, nothing above U+10FFFF.
static bool is_utf8(const char *text, size_t len) {
  const auto *at = reinterpret_cast<const uint8_t *>(text);
  const uint8_t *end = at + len;
  while (at != end) {
    if (end - at >= 8 && all_ascii(load_eight(reinterpret_cast<const char *>(at)))) {
      at += 8;
      continue;
    }
    const uint8_t lead = *at++;
    if (lead < 0x80) continue;
    if (lead < 0xC2 || lead > 0xF4) return false;
    // The second byte alone tells overlong forms, surrogates and what lies beyond the last plane.
    const uint8_t low = lead == 0xE0 ? 0xA0 : lead == 0xF0 ? 0x90 : 0x80;
    const uint8_t high = lead == 0xED ? 0x9F : lead == 0xF4 ? 0x8F : 0xBF;
    if (*at < low || *at > high) return false;
    ++at;
    for (int more = lead < 0xE0 ? 0 : lead < 0xF0 ? 1 : 2; more > 0; --more, ++at) {
      if ((*at & 0xC0) != 0x80) return false;
    }
  }
  return true;
}

bool json_is_utf8(const char *text) {
  return is_utf8(text, strlen(text));
}

namespace {

// What is to be known of a text before it becomes one of a document.
struct text_form {
  size_t len;
  bool plain;  // of ASCII, and written as it stands
  bool utf8;
};

}  // namespace

// Most texts are base64, and plain to their end.
static text_form form_of(const char *text) {
  const size_t len = strlen(text);
  size_t at = 0;
  while (len - at >= 8) {
    const uint64_t eight = load_eight(text + at);
    if (!all_ascii(eight) || not_plain(eight) != 0) break;
    at += 8;
  }
  while (at != len && static_cast<uint8_t>(text[at]) < 0x80 && !is_special(text[at]) &&
         text[at] != '/') {
    ++at;
  }
  return {len, at == len, at == len || is_utf8(text + at, len - at)};
}

static void set_text(JSON_Value *value, char *text, const text_form &form) {
  value->text = text;
  value->count = static_cast<uint32_t>(form.len);
  if (form.plain) value->flags |= kPlainText;
}

// A value in a block of its own, together with its name, where it has one, and room for a text.
static JSON_Value *new_value(json_type type, const char *name, uint64_t text_len, json_room *room) {
  const text_form form = name != nullptr ? form_of(name) : text_form{};
  if (name != nullptr) text_len += uint64_t{form.len} + 1;
  JSON_Value *value = new_block({1, 0, text_len}, type, room);
  if (value == nullptr || name == nullptr) return value;
  const auto len = static_cast<uint32_t>(form.len);
  set_name(value, new_text(room, name, len), len, form.plain);
  return value;
}

static JSON_Value *new_string(const char *name, const char *text, const text_form &form) {
  json_room room;
  JSON_Value *value = new_value(kJsonString, name, uint64_t{form.len} + 1, &room);
  if (value == nullptr) return nullptr;
  set_text(value, new_text(&room, text, static_cast<uint32_t>(form.len)), form);
  return value;
}

// Whether `container` is `value` or lies in it: a tree must not be hung into itself.
static bool holds(const JSON_Value *value, const JSON_Value *container) {
  if (!has_children(value)) return value == container;
  const JSON_Value *at = container;
  while (at->next != nullptr && at != value) at = at->next;
  return at == value;
}

namespace {

// Where a member of some name goes: in place of `old`, or, when that is NULL, behind `last`.
struct member_place {
  JSON_Value *old;
  JSON_Value *last;  // the member before `old`, or the last one; NULL when there is none
};

}  // namespace

// False when the object is full.
static bool find_place(const JSON_Object *object, const char *name, member_place *place) {
  place->old = find_member(&object->node, name, static_cast<uint32_t>(strlen(name)), &place->last);
  return place->old != nullptr || object->node.count < kMaxMembers;
}

static void detach_and_free(JSON_Value *child) {
  child->next = nullptr;
  json_value_free(child);
}

// `child` comes behind `before`, which is NULL for the first place, and before `next`.
static void link_child(JSON_Value *parent, JSON_Value *before, JSON_Value *child) {
  (before != nullptr ? before->next : parent->first) = child;
}

static void put_member(JSON_Object *object, const member_place &place, JSON_Value *member) {
  JSON_Value *parent = &object->node;
  if (place.old == nullptr) {
    append_child(parent, place.last, member);
    return;
  }
  if (is_last_child(place.old)) {
    make_last(parent, member);
  } else {
    lead_to(member, place.old->next);
  }
  link_child(parent, place.last, member);
  detach_and_free(place.old);
}

// The name is not copied.
static JSON_Status link_member(JSON_Object *object, const char *name, JSON_Value *value) {
  if (object == nullptr || name == nullptr || value == nullptr) return JSONFailure;
  member_place place;
  const text_form form = form_of(name);
  if (value->next != nullptr || holds(value, &object->node) || form.len >= UINT32_MAX ||
      !find_place(object, name, &place)) {
    return JSONFailure;
  }
  set_name(value, const_cast<char *>(name), static_cast<uint32_t>(form.len), form.plain);
  put_member(object, place, value);
  return JSONSuccess;
}

JSON_Status json_object_set_value(JSON_Object *object, const char *name, JSON_Value *value) {
  const size_t len = name != nullptr ? strlen(name) : UINT32_MAX;
  if (len >= UINT32_MAX) return JSONFailure;
  secret_text copy(reinterpret_cast<char *>(allocate_bytes(static_cast<uint32_t>(len) + 1)));
  if (copy) memcpy(copy.get(), name, len);
  if (link_member(object, copy.get(), value) != JSONSuccess) return JSONFailure;
  (void)copy.release();
  value->flags |= kOwnsName;
  return JSONSuccess;
}

JSON_Status json_object_set_string(JSON_Object *object, const char *name, const char *string) {
  if (object == nullptr || name == nullptr || string == nullptr) return JSONFailure;
  const text_form form = form_of(string);
  member_place place;
  if (!form.utf8 || !find_place(object, name, &place)) return JSONFailure;
  JSON_Value *member = new_string(name, string, form);
  if (member == nullptr) return JSONFailure;
  put_member(object, place, member);
  return JSONSuccess;
}

JSON_Status json_object_set_base64url(JSON_Object *object, const char *name,
                                      const data_part &bytes) {
  member_place place;
  if (object == nullptr || name == nullptr || bytes.data == nullptr ||
      !find_place(object, name, &place)) {
    return JSONFailure;
  }
  json_room room;
  JSON_Value *member = new_value(kJsonString, name, base64_room(bytes.len), &room);
  CHECK_AS("base64urlEncodeAddEndZero", member != nullptr, JSONFailure, "bad parameter");
  set_text(member, room.texts, {base64url_encode_to(bytes, room.texts), true, true});
  put_member(object, place, member);
  return JSONSuccess;
}

JSON_Status json_object_set_number(JSON_Object *object, const char *name, double number) {
  if (object == nullptr || name == nullptr || number - number != 0) return JSONFailure;
  member_place place;
  if (!find_place(object, name, &place)) return JSONFailure;
  json_room room;
  JSON_Value *member = new_value(kJsonNumber, name, 0, &room);
  if (member == nullptr) return JSONFailure;
  member->number = number;
  put_member(object, place, member);
  return JSONSuccess;
}

static void append(JSON_Array *array, JSON_Value *value) {
  const uint32_t count = array->node.count;
  append_child(&array->node, count != 0 ? walk_to(array, count - 1) : nullptr, value);
}

JSON_Status json_array_append_value(JSON_Array *array, JSON_Value *value) {
  if (array == nullptr || value == nullptr || array->node.count == kMaxElements) return JSONFailure;
  if (value->next != nullptr || holds(value, &array->node)) return JSONFailure;
  append(array, value);
  return JSONSuccess;
}

JSON_Status json_array_append_string(JSON_Array *array, const char *string) {
  if (array == nullptr || string == nullptr || array->node.count == kMaxElements)
    return JSONFailure;
  const text_form form = form_of(string);
  if (!form.utf8) return JSONFailure;
  JSON_Value *value = new_string(nullptr, string, form);
  if (value == nullptr) return JSONFailure;
  append(array, value);
  return JSONSuccess;
}

JSON_Status json_object_take(JSON_Object *object, const char *name, json_ptr *value) {
  const JSON_Status set = link_member(object, name, value->get());
  if (set == JSONSuccess) (void)value->release();
  return set;
}

JSON_Status json_array_take(JSON_Array *array, json_ptr *value) {
  const JSON_Status appended = json_array_append_value(array, value->get());
  if (appended == JSONSuccess) (void)value->release();
  return appended;
}

JSON_Status json_array_remove(JSON_Array *array, size_t index) {
  if (index >= json_array_get_count(array)) return JSONFailure;
  const auto at = static_cast<uint32_t>(index);
  const uint32_t last_index = array->node.count - 1;
  JSON_Value *before = at != 0 ? walk_to(array, at - 1) : nullptr;
  JSON_Value *removed = walk_to(array, at);
  if (at == last_index) {
    if (before != nullptr) make_last(&array->node, before);
  } else {
    JSON_Value *end = walk_to(array, last_index - 1);
    JSON_Value *last = end->next;
    if (end != removed) {
      make_last(&array->node, end);
      lead_to(last, removed->next);
    }
    link_child(&array->node, before, last);
  }
  --array->node.count;
  array->walked_to = nullptr;
  detach_and_free(removed);
  return JSONSuccess;
}
