// SPDX-License-Identifier: BSD-2-Clause
/// TA images: a file behind a header that carries its digest, as the device's register reads it.
///
///     | magic "OTrP TA image\0" (14) | version, 1 (2) | digest length, 32 (2) | 0 (2) |
///     | SHA-256 digest of the payload (32) | payload |
///
/// Numbers are little-endian. Images of other makers are taken as well: only the digest length and
/// the digest have a fixed place.
#ifndef TSM_PROTOCOL_IMAGE_H
#define TSM_PROTOCOL_IMAGE_H

#include <optional>
#include <string>
#include <string_view>

#include "common/encoding.h"

namespace tsm {

constexpr size_t kImageHeaderLen = 52;

struct Image {
  tools::Bytes digest;       // as the header says
  std::string_view payload;  // of the image that was parsed
  bool has_own_magic;        // packed by pack_image(), so the digest covers the payload
  bool digest_matches;
};

tools::Bytes pack_image(std::string_view payload);

/// Nothing when there is no header: too short, or another digest length than 32.
std::optional<Image> parse_image(std::string_view image);

/// The image in a file; throws tools::UsageError for one without a header, or that is damaged.
std::string read_image_file(const std::string &file);

}  // namespace tsm

#endif
