// SPDX-License-Identifier: BSD-2-Clause
#include <gtest/gtest.h>

#include "common/encoding.h"

namespace tools {
namespace {

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
