// SPDX-License-Identifier: BSD-2-Clause
/// Inside of the JSON document model: how a document lies in memory.
///
/// A value is a node. A container points at its first child, each child at the next one, and the
/// last child back at its parent, so that a walk over a tree of any depth needs no stack:
///
///     parent --first--> child --next--> child --next--> last child --next--> parent
///
/// Nodes and texts are made in blocks: a parsed or copied document is one, a value that is set
/// later another. The block of a value that moves into another document stays what it is, and is
/// freed with the node that begins it.
///
///     length | node that begins it | more nodes | texts
#ifndef JSON_NODE_H
#define JSON_NODE_H

#include "state/json.h"

constexpr uint32_t kMaxDepth = 19;  // containers around a parsed value
constexpr uint32_t kMaxMembers = 960;
constexpr uint32_t kMaxElements = 122880;
constexpr uint16_t kLongName = UINT16_MAX;

enum json_type : uint8_t {
  kJsonNull,
  kJsonFalse,
  kJsonTrue,
  kJsonNumber,
  kJsonString,
  kJsonVerbatim,  // an array as its text, which is someone else's
  kJsonSlice,     // a value as a part of such a text
  kJsonArray,
  kJsonObject,
};

enum json_flag : uint8_t {
  kLastChild = 1,
  kBeginsBlock = 2,
  kOwnsName = 4,  // the name, or the text, is an allocation of its own
  kOwnsText = 8,
  kPlainName = 16,  // is written as it stands
  kPlainText = 32,
};

struct JSON_Value {
  JSON_Value *next;  // NULL: part of no document
  char *name;        // NULL: not a member
  union {
    double number;
    char *text;
    JSON_Value *first;
  };
  uint32_t count;            // children, of a verbatim array too, or bytes of the text or slice
  uint16_t capped_name_len;  // kLongName: or longer
  json_type type;
  uint8_t flags;
};
static_assert(sizeof(JSON_Value) <= 32);

struct JSON_Object {
  JSON_Value node;
};

struct JSON_Array {
  JSON_Value node;
  mutable JSON_Value *walked_to;  // the element that was asked for last; NULL: none
  mutable uint32_t walked_index;
};
static_assert(alignof(JSON_Array) == alignof(JSON_Value));

inline bool is_container(const JSON_Value *value) {
  return value->type >= kJsonArray;
}
inline bool has_children(const JSON_Value *value) {
  return is_container(value) && value->count != 0;
}
inline bool is_last_child(const JSON_Value *value) {
  return (value->flags & kLastChild) != 0;
}

// ---- Blocks

/// What a block is to hold.
struct json_extent {
  uint64_t num_nodes;
  uint64_t num_arrays;  // of the nodes
  uint64_t text_len;    // all texts and names, with their NULs
};

/// What of a block is not used yet.
struct json_room {
  uint8_t *nodes;
  char *texts;
};

/// A new block; its first node is a value that belongs to no document. NULL: no memory.
JSON_Value *new_block(const json_extent &extent, json_type type, json_room *room);

JSON_Value *new_node(json_room *room, json_type type);

/// The copy is NUL-terminated.
inline char *new_text(json_room *room, const char *text, uint32_t len) {
  char *copy = room->texts;
  memcpy(copy, text, len);
  copy[len] = 0;
  room->texts += len + 1;
  return copy;
}

// ---- Trees

/// `plain`: whether the name is known to be written as it stands.
void set_name(JSON_Value *member, char *name, uint32_t len, bool plain);

inline uint32_t name_len(const JSON_Value *member) {
  if (member->capped_name_len != kLongName) return member->capped_name_len;
  return static_cast<uint32_t>(strlen(member->name));
}

/// `*last` receives the member before the one that is found, or else the object's last member; NULL
/// when that is none.
JSON_Value *find_member(const JSON_Value *object, const char *name, uint32_t len,
                        JSON_Value **last);

inline void make_last(JSON_Value *parent, JSON_Value *child) {
  child->next = parent;
  child->flags |= kLastChild;
}

inline void lead_to(JSON_Value *child, JSON_Value *sibling) {
  child->next = sibling;
  child->flags &= static_cast<uint8_t>(~kLastChild);
}

/// `last` is the parent's last child so far; NULL when it has none.
inline void append_child(JSON_Value *parent, JSON_Value *last, JSON_Value *child) {
  make_last(parent, child);
  ++parent->count;
  if (last != nullptr) {
    lead_to(last, child);
  } else {
    parent->first = child;
  }
}

/// How a slice, which is of a text that comes back, answers json_array_match().
json_match slice_match(const JSON_Value *slice, const char *name, const char *text);

// ---- Characters
//
// Texts are looked through eight characters at a time. Each has a byte of a number, the first one
// the lowest, and the high bit of that byte is free for an answer.

constexpr uint64_t kHighBits = 0x8080808080808080;

inline uint64_t load_eight(const char *at) {
  uint64_t eight;
  memcpy(&eight, at, sizeof eight);
  if constexpr (__BYTE_ORDER__ == __ORDER_BIG_ENDIAN__) eight = __builtin_bswap64(eight);
  return eight;
}

constexpr uint64_t eight_times(uint8_t c) {
  return uint64_t{0x0101010101010101} * c;
}

inline bool all_ascii(uint64_t eight) {
  return (eight & kHighBits) == 0;
}

/// Candidates: the high bits of the characters that are less than `limit`, which is one of ASCII. A
/// subtraction borrows from the byte above, so there may be more, but the first one is true. So may
/// be the bits of characters beyond ASCII, which are none.
inline uint64_t less_than(uint64_t eight, uint8_t limit) {
  return eight - eight_times(limit);
}

/// The same for those that are `c`.
inline uint64_t same_as(uint64_t eight, char c) {
  return less_than(eight ^ eight_times(static_cast<uint8_t>(c)), 1);
}

/// Special: control characters, quotes and backslashes.
inline uint64_t special(uint64_t eight) {
  const uint64_t candidates = less_than(eight, 0x20) | same_as(eight, '"') | same_as(eight, '\\');
  return candidates & ~eight & kHighBits;
}

inline bool is_special(char c) {
  return static_cast<uint8_t>(c) < 0x20 || c == '"' || c == '\\';
}

/// The letter that stands for a character behind a backslash; 0 when it stands for itself.
char escape_letter(char c);

/// Not plain: what is not written as it stands, and control characters.
inline uint64_t not_plain(uint64_t eight) {
  return special(eight) | (same_as(eight, '/') & ~eight & kHighBits);
}

/// The index of the first of the candidates, of which there is one at least: the bytes up to it are
/// counted by their lowest bits. There are machines for which to count bits is a library's matter.
inline uint32_t first_of(uint64_t candidates) {
  const uint64_t below = (candidates - 1) & ~candidates;
  return static_cast<uint32_t>((below & eight_times(1)) * eight_times(1) >> 56) - 1;
}

/// The first special character of a text that ends at `end` with a NUL.
inline const char *find_special(const char *at, const char *end) {
  for (; end - at >= 8; at += 8) {
    const uint64_t found = special(load_eight(at));
    if (found != 0) return at + first_of(found);
  }
  while (!is_special(*at)) ++at;
  return at;
}

#endif
