// SPDX-License-Identifier: BSD-2-Clause
#include <gtest/gtest.h>

#include "tsm/protocol/image.h"

namespace tsm {
namespace {

TEST(Image, SaysWhetherItsDigestIsThatOfThePayload) {
  tools::Bytes image = pack_image("payload");
  EXPECT_TRUE(parse_image(image)->digest_matches);
  EXPECT_FALSE(parse_image(image.substr(0, kImageHeaderLen - 1)));
  image.back() = '!';
  EXPECT_FALSE(parse_image(image)->digest_matches);
  image[16] = 48;  // the digest's length
  EXPECT_FALSE(parse_image(image));
}

}  // namespace
}  // namespace tsm
