// SPDX-License-Identifier: BSD-2-Clause
#include <gtest/gtest.h>

#include "tsm/protocol/jwe.h"
#include "tsm_fake_device.h"

namespace tsm {
namespace {

TEST(Jwe, EveryDamagedMemberIsNoticed) {
  const RsaKey &key = key_of(kTee);
  for (const ContentCipher cipher : {ContentCipher::kA128CbcHs256, ContentCipher::kA128Gcm}) {
    const Json jwe = jwe_encrypt(key, R"({"a":1})", {.cipher = cipher});
    ASSERT_EQ(jwe_decrypt(key, jwe), R"({"a":1})");
    for (const char *path : {"/protect", "/iv", "/ciphertext", "/tag", "/recipients",
                             "/recipients/0/header/alg", "/recipients/0/encrypted_key"}) {
      SCOPED_TRACE(path);
      Json damaged = jwe;
      Json &member = damaged[Json::json_pointer(path)];
      if (member.is_string()) {
        std::string text = member;
        text.front() = text.front() == 'A' ? 'B' : 'A';
        member = text;
        EXPECT_EQ(jwe_decrypt(key, damaged), std::nullopt);
      }
      member = nullptr;
      EXPECT_EQ(jwe_decrypt(key, damaged), std::nullopt);
    }
  }
  const Json short_cek = jwe_object(protected_header_of(ContentCipher::kA128CbcHs256),
                                    rsa1_5_encrypt(key, "sixteen bytes..."), Bytes(16, 'i'),
                                    {Bytes(16, 'c'), Bytes(16, 't')});
  EXPECT_EQ(jwe_decrypt(key, short_cek), std::nullopt);
}

TEST(RsaKey, OnlyACompleteEncodingIsAKey) {
  const Bytes encoded = key_of(kTee).encoded();
  EXPECT_EQ(RsaKey::from_encoded(encoded)->encoded(), encoded);
  for (size_t len = 0; len < encoded.size(); ++len) {
    EXPECT_FALSE(RsaKey::from_encoded(Bytes(encoded.data(), len))) << len;
  }
  EXPECT_FALSE(RsaKey::from_encoded(encoded + "x"));
  EXPECT_FALSE(RsaKey::from_encoded(Bytes("\xFF\xFF\xFF\xFF", 4) + encoded.substr(4)));
}

}  // namespace
}  // namespace tsm
