// SPDX-License-Identifier: BSD-2-Clause
/// Base64 and base64url (RFC 4648, sections 4 and 5).
///
/// The encoders make NUL-terminated texts, the standard one padded with "=", the URL one not. The
/// decoders make bytes, without a NUL behind them but where it is said. They are lenient: a
/// character outside their alphabet is skipped wherever it stands, padding included, and so is a
/// last character alone; bits that are left over are dropped. What the standard alphabet has in
/// place of "-" and "_" a URL decoder takes as well.
///
/// Encoding takes the same time for all bytes of a length.
#ifndef BASE64_H
#define BASE64_H

#include <stdint.h>

#include "data_part.h"

/// Without `data` NULL and nothing in the log; for want of memory NULL and a line.
char *base64EncodeAddEndZero(const uint8_t *data, uint32_t len);
char *base64urlEncodeAddEndZero(const uint8_t *data, uint32_t len);

/// Number of characters, with the NUL, that the text of so many bytes needs room for.
inline uint64_t base64_room(uint32_t len) {
  return (uint64_t{len} + 2) / 3 * 4 + 1;
}

/// The URL text goes to zeros that have room for it. Returns its length.
uint32_t base64url_encode_to(const data_part &bytes, char *text);

/// Number of decoded bytes. `*bytes` receives a new buffer, which is the caller's also when that
/// number is 0; NULL, with a line in the log, when memory ran out. It is left alone when `text` is
/// NULL.
uint32_t base64DecodeStringRemoveEndZero(const char *text, uint8_t **bytes);
uint32_t base64urlDecodeStringRemoveEndZero(const char *text, uint8_t **bytes);

/// The same for `len` characters, among which a NUL is one that is skipped.
uint32_t base64urlDecodeStringRemoveEndZeroV2(const char *text, uint32_t len, uint8_t **bytes);

/// The same with a NUL behind the bytes, which is not counted: for bytes that are a text.
uint32_t base64urlDecodeStringAddEndZeroV2(const char *text, uint32_t len, uint8_t **bytes);

/// One piece of a URL text that comes in pieces. Decodes all whole groups of four characters to
/// `to` and moves what is left over, three characters at most, to the front of `text`, as the
/// beginning of the next piece; of the last piece the rest is decoded, too. `*len` is the length of
/// the piece with what was left over before it, and then of what is left over now. Returns the
/// number of bytes.
uint32_t base64urlDecodePiece(char *text, uint32_t *len, bool is_last, uint8_t *to);

#endif
