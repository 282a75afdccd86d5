// SPDX-License-Identifier: BSD-2-Clause
#include <gtest/gtest.h>

#include "common/encoding.h"

namespace tools {
namespace {

// RFC 4648, section 10, and the two characters in which the alphabets differ.
constexpr std::pair<const char *, const char *> kVectors[] = {{"", ""},
                                                              {"f", "Zg=="},
                                                              {"fo", "Zm8="},
                                                              {"foo", "Zm9v"},
                                                              {"foob", "Zm9vYg=="},
                                                              {"fooba", "Zm9vYmE="},
                                                              {"foobar", "Zm9vYmFy"},
                                                              {"\xFB\xEF\xFF", "++//"}};

TEST(Encoding, PublishedBase64Vectors) {
  for (const auto &[bytes, text] : kVectors) {
    SCOPED_TRACE(text);
    std::string url = text;
    while (url.ends_with('=')) url.pop_back();
    if (url == "++//") url = "--__";
    EXPECT_EQ(base64_encode(bytes), text);
    EXPECT_EQ(base64_decode(text), bytes);
    EXPECT_EQ(base64url_encode(bytes), url);
    EXPECT_EQ(base64url_decode(url), bytes);
  }
}

TEST(Encoding, WhatNoEncoderWritesIsNotDecoded) {
  for (const char *text :
       {"Zg", "Z", "Zg=", "Zg===", "Zh==", "Zm9=", "Z=g=", "Zm9v\n", "====", "--__"}) {
    EXPECT_EQ(base64_decode(text), std::nullopt) << text;
  }
  for (const char *text : {"Z", "Zg==", "Zh", "Zm9", "Zm 9v", "++//"}) {
    EXPECT_EQ(base64url_decode(text), std::nullopt) << text;
  }
  for (const char *text : {"0", "0g", "-1", "0x"}) {
    EXPECT_EQ(hex_decode(text), std::nullopt) << text;
  }
}

TEST(Encoding, HexIsLowerCaseOutAndEitherCaseIn) {
  EXPECT_EQ(hex_encode(std::string_view("\x00\xAB\xF1", 3)), "00abf1");
  EXPECT_EQ(hex_decode("abF1"), "\xAB\xF1");
}

}  // namespace
}  // namespace tools
