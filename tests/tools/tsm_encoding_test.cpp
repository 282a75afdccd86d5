// SPDX-License-Identifier: BSD-2-Clause
#include <gtest/gtest.h>

#include "common/encoding.h"

namespace tools {
namespace {

struct Vector {
  const char *bytes;
  const char *base64;
};

// RFC 4648 section 10.
constexpr Vector kVectors[] = {{"", ""},
                               {"f", "Zg=="},
                               {"fo", "Zm8="},
                               {"foo", "Zm9v"},
                               {"foob", "Zm9vYg=="},
                               {"fooba", "Zm9vYmE="},
                               {"foobar", "Zm9vYmFy"}};

TEST(Encoding, PublishedBase64Vectors) {
  for (const Vector &vector : kVectors) {
    SCOPED_TRACE(vector.bytes);
    std::string unpadded = vector.base64;
    while (unpadded.ends_with('=')) unpadded.pop_back();
    EXPECT_EQ(base64_encode(vector.bytes), vector.base64);
    EXPECT_EQ(base64_decode(vector.base64), vector.bytes);
    EXPECT_EQ(base64url_encode(vector.bytes), unpadded);
    EXPECT_EQ(base64url_decode(unpadded), vector.bytes);
  }
}

TEST(Encoding, TheTwoAlphabetsDifferInTwoCharacters) {
  EXPECT_EQ(base64_encode("\xFB\xEF\xFF"), "++//");
  EXPECT_EQ(base64url_encode("\xFB\xEF\xFF"), "--__");
  EXPECT_EQ(base64url_decode("++//"), std::nullopt);
  EXPECT_EQ(base64_decode("--__"), std::nullopt);
}

TEST(Encoding, WhatNoEncoderWritesIsNotDecoded) {
  for (const char *text : {"Zg", "Z", "Zg=", "Zg===", "Zh==", "Zm9=", "Z=g=", "Zm9v\n", "===="}) {
    EXPECT_EQ(base64_decode(text), std::nullopt) << text;
  }
  for (const char *text : {"Z", "Zg==", "Zh", "Zm9", "Zm 9v"}) {
    EXPECT_EQ(base64url_decode(text), std::nullopt) << text;
  }
  for (const char *text : {"0", "0g", "-1", "0x"})
    EXPECT_EQ(hex_decode(text), std::nullopt) << text;
}

TEST(Encoding, HexIsLowerCaseOutAndEitherCaseIn) {
  EXPECT_EQ(hex_encode(std::string_view("\x00\xAB\xF1", 3)), "00abf1");
  EXPECT_EQ(hex_decode("abF1"), "\xAB\xF1");
}

}  // namespace
}  // namespace tools
