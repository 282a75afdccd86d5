// SPDX-License-Identifier: BSD-2-Clause
/// Bytes as text: base64 and base64url (RFC 4648) and hexadecimal.
///
/// Decoders are strict: a character, length, padding or spare bit that no encoder would have
/// written makes them return nothing.
#ifndef COMMON_ENCODING_H
#define COMMON_ENCODING_H

#include <optional>
#include <string>
#include <string_view>

namespace tools {

using Bytes = std::string;  // any bytes, not only text

std::string base64_encode(std::string_view bytes);     // with padding
std::string base64url_encode(std::string_view bytes);  // without padding
void base64url_append(std::string_view bytes, std::string *text);
std::optional<Bytes> base64_decode(std::string_view text);
std::optional<Bytes> base64url_decode(std::string_view text);

std::string hex_encode(std::string_view bytes);  // lower case
std::optional<Bytes> hex_decode(std::string_view text);

/// `value` as `width` little-endian bytes.
Bytes little_endian(size_t value, int width);

}  // namespace tools

#endif
