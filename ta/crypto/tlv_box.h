// SPDX-License-Identifier: BSD-2-Clause
/// A box of records, each a type and a value, and its serialized form: the records behind each
/// other, in any order,
///
///     type (2 bytes) | length of the value (2 bytes) | value
///
/// Numbers are little-endian, and a type stands once. A box is filled and then serialized, or
/// parsed; after either it takes no more records. Boxes hold private keys: values
/// and buffers are wiped before they are freed.
///
/// Results are 0 or one of the numbers below; a failure changes nothing.
#ifndef TLV_BOX_H
#define TLV_BOX_H

#include <stdint.h>

#include "crypto/key_list.h"
#include "ownership.h"

enum tlv_result : int {
  TLV_ERROR = -1,      // type taken or absent, value too long, capacity too small
  TLV_NOT_FOUND = -2,  // no such type, where a pointer is asked for
  TLV_OUT_OF_MEMORY = -3,
  TLV_SERIALIZED = -6,  // the box is closed
};

struct tlv_item {
  uint16_t type;
  uint16_t len;
  uint8_t *value;
};

struct tlv_box {
  key_list *items;      // under their types; none in a parsed box
  uint8_t *serialized;  // NULL while the box is open
  uint32_t serialized_len;
};

/// A new empty box; NULL: no memory.
tlv_box *tlv_box_create();

/// NULL is accepted.
void tlv_box_destroy(tlv_box *box);

using box_ptr = owned<tlv_box *, tlv_box_destroy>;

/// Copies a value of at most 65535 bytes into an open box.
[[nodiscard]] int tlv_box_putobject(tlv_box *box, uint16_t type, const void *value, uint32_t len);

/// The same; an int takes 4 bytes.
[[nodiscard]] int tlv_box_put_int(tlv_box *box, uint16_t type, uint32_t value);
[[nodiscard]] int tlv_box_put_bytes(tlv_box *box, uint16_t type, const uint8_t *value,
                                    uint32_t len);

/// Closes the box. Its records are written from the newest to the oldest.
[[nodiscard]] int tlv_box_serialize(tlv_box *box);

/// The box's own; NULL before it is serialized.
const uint8_t *tlv_box_get_buffer(const tlv_box *box);

/// Length of the serialized form, also before it is made.
uint32_t tlv_box_get_size(const tlv_box *box);

/// A new box; NULL when the bytes are not whole records, a type repeats, or memory ran out.
tlv_box *tlv_box_parse(const uint8_t *bytes, uint32_t len);

/// TLV_ERROR for a value too short for an int, as for none.
[[nodiscard]] int tlv_box_get_int(const tlv_box *box, uint16_t type, uint32_t *value);

/// `*len` is the capacity and then the value's length; what the value leaves of the capacity is
/// zeroed.
[[nodiscard]] int tlv_box_get_bytes(const tlv_box *box, uint16_t type, uint8_t *bytes,
                                    uint32_t *len);

/// The same without a copy: `*bytes` points into the box, and no longer than it lives.
[[nodiscard]] int tlv_box_get_bytes_ptr(const tlv_box *box, uint16_t type, const uint8_t **bytes,
                                        uint32_t *len);

#endif
