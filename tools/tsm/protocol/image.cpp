// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/protocol/image.h"

#include "common/files.h"
#include "tsm/protocol/crypto.h"

namespace tsm {
namespace {

constexpr std::string_view kMagic{"OTrP TA image\0\1\0", 16};  // with the version
constexpr size_t kDigestLen = 32;
constexpr size_t kDigestOffset = 20;
static_assert(kImageHeaderLen == kDigestOffset + kDigestLen);

}  // namespace

Bytes pack_image(std::string_view payload) {
  return Bytes(kMagic) + little_endian(kDigestLen, 2) + little_endian(0, 2) + sha256(payload) +
         Bytes(payload);
}

std::optional<Image> parse_image(std::string_view image) {
  if (image.size() < kImageHeaderLen) return std::nullopt;
  if (image.substr(kMagic.size(), 2) != little_endian(kDigestLen, 2)) return std::nullopt;
  const std::string_view digest = image.substr(kDigestOffset, kDigestLen);
  const std::string_view payload = image.substr(kImageHeaderLen);
  return Image{.digest = Bytes(digest),
               .payload = payload,
               .has_own_magic = image.starts_with(kMagic),
               .digest_matches = sha256(payload) == digest};
}

std::string read_image_file(const std::string &file) {
  std::string image = tools::read_file(file);
  const std::optional<Image> parsed = parse_image(image);
  if (!parsed) {
    throw tools::UsageError(file +
                            " has no TA image header: expected an image made by `otrp-tsm image "
                            "pack " +
                            file + " -o IMAGE`");
  }
  if (parsed->has_own_magic && !parsed->digest_matches) {
    throw tools::UsageError(file + " is damaged: its payload is not what its header says");
  }
  return image;
}

}  // namespace tsm
