#include <gtest/gtest.h>

#include "tsm/crypto.h"
#include "tsm/jwe.h"

namespace tsm {
namespace {

Bytes unhex(std::string_view text) {
  return hex_decode(text).value();
}
Bytes unbase64url(std::string_view text) {
  return base64url_decode(text).value();
}

RsaKey key_of(std::string_view n, std::string_view d) {
  return RsaKey::from_numbers(unbase64url(n), unbase64url("AQAB"), unbase64url(d)).value();
}

// RFC 7518 appendix B.1.
TEST(Crypto, A128CbcHs256OfTheStandard) {
  const Bytes cek = unhex("000102030405060708090a0b0c0d0e0f101112131415161718191a1b1c1d1e1f");
  const Bytes iv = unhex("1af38c2dc2b96ffdd86694092341bc04");
  const std::string plaintext =
      "A cipher system must not be required to be secret, and it must be able to fall into the "
      "hands of the enemy without inconvenience";
  const std::string aad = "The second principle of Auguste Kerckhoffs";

  Sealed sealed = seal_content(ContentCipher::kA128CbcHs256, cek, iv, aad, plaintext);
  EXPECT_EQ(hex_encode(sealed.ciphertext),
            "c80edfa32ddf39d5ef00c0b468834279a2e46a1b8049f792f76bfe54b903a9c9a94ac9b47ad2655c5f10"
            "f9aef71427e2fc6f9b3f399a221489f16362c703233609d45ac69864e3321cf82935ac4096c86e133314"
            "c54019e8ca7980dfa4b9cf1b384c486f3a54c51078158ee5d79de59fbd34d848b3d69550a67646344427"
            "ade54b8851ffb598f7f80074b9473c82e2db");
  EXPECT_EQ(hex_encode(sealed.tag), "652c3fa36b0a7c5b3219fab3a30bc1c4");
  EXPECT_EQ(open_content(ContentCipher::kA128CbcHs256, cek, iv, aad, sealed), plaintext);
}

// RFC 7515 appendix A.2.
TEST(Crypto, Rs256OfTheStandard) {
  const RsaKey key = key_of(
      "ofgWCuLjybRlzo0tZWJjNiuSfb4p4fAkd_wWJcyQoTbji9k0l8W26mPddxHmfHQp-Vaw-4qPCJrcS2mJPMEzP1Pt0Bm"
      "4d4QlL-yRT-SFd2lZS-pCgNMsD1W_YpRPEwOWvG6b32690r2jZ47soMZo9wGzjb_7OMg0LOL-bSf63kpaSHSXndS5z5r"
      "exMdbBYUsLA9e-KXBdQOS-UTo7WTBEMa2R2CapHg665xsmtdVMTBQY4uDZlxvb3qCo5ZwKh9kG4LT6_I5IhlJH7aGhyx"
      "XFvUK-DWNmoudF8NAco9_h9iaGNj8q2ethFkMLs91kzk2PAcDTW9gb54h4FRWyuXpoQ",
      "Eq5xpGnNCivDflJsRQBXHx1hdR1k6Ulwe2JZD50LpXyWPEAeP88vLNO97IjlA7_GQ5sLKMgvfTeXZx9SE-7YwVol2NXO"
      "oAJe46sui395IW_GO-pWJ1O0BkTGoVEn2bKVRUCgu-GjBVaYLU6f3l9kJfFNS3E0QbVdxzubSu3Mkqzjkn439X0M_V51"
      "gfpRLI9JYanrC4D4qAdGcopV_0ZHHzQlBjudU2QvXt4ehNYTCBr6XCLQUShb1juUO1ZdiYoFaFQT5Tw8bGUl_x_jTj3c"
      "cPDVZFD9pIuhLhBOneufuBiB4cS98l2SR_RQyGWSeWjnczT0QU91p1DhOVRuOopznQ");
  const std::string input =
      "eyJhbGciOiJSUzI1NiJ9.eyJpc3MiOiJqb2UiLA0KICJleHAiOjEzMDA4MTkzODAsDQogImh0dHA6Ly9leGFtcGxlLmN"
      "vbS9pc19yb290Ijp0cnVlfQ";
  const std::string signature =
      "cC4hiUPoj9Eetdgtv3hF80EGrhuB__dzERat0XF9g2VtQgr9PJbu3XOiZj5RZmh7AAuHIm4Bh-0Qc_lF5YKt_O8W2Fp5"
      "jujGbds9uJdbF9CUAr7t1dnZcAcQjbKBYNX4BAynRFdiuB--f_nZLgrnbyTyWzO75vRK5h6xBArLIARNPvkSjtQBMHlb"
      "1L07Qe7K0GarZRmB_eSN9383LcOLn6_dO--xi12jzDwusC-eOkHWEsqtFZESc6BfI7noOPqvhJ1phCnvWh6IeYI2w9QO"
      "YEUipUTI8np6LbgGY9Fs98rqVt5AXLIhWkWywlVmtVrBp0igcN_IoypGlUPQGe77Rw";
  EXPECT_EQ(base64url_encode(rs256_sign(key, input)), signature);
  EXPECT_TRUE(rs256_verify(key, input, unbase64url(signature)));
  EXPECT_FALSE(rs256_verify(key, input + "A", unbase64url(signature)));
  EXPECT_FALSE(rs256_verify(key, input, ""));
}

// RFC 7516 appendix A.2, its members in the places where the protocol carries them.
TEST(Jwe, Rsa1_5AndA128CbcHs256OfTheStandard) {
  const RsaKey key = key_of(
      "sXchDaQebHnPiGvyDOAT4saGEUetSyo9MKLOoWFsueri23bOdgWp4Dy1WlUzewbgBHod5pcM9H95GQRV3JDXboIRROSB"
      "igeC5yjU1hGzHHyXss8UDprecbAYxknTcQkhslANGRUZmdTOQ5qTRsLAt6BTYuyvVRdhS8exSZEy_c4gs_7svlJJQ4H9"
      "_NxsiIoLwAEk7-Q3UXERGYw_75IDrGA84-lA_-Ct4eTlXHBIY2EaV7t7LjJaynVJCpkv4LKjTTAumiGUIuQhrNhZLuF_"
      "RJLqHpM2kgWFLU7-VTdL1VbC2tejvcI2BlMkEpk1BzBZI0KQB0GaDWFLN-aEAw3vRw",
      "VFCWOqXr8nvZNyaaJLXdnNPXZKRaWCjkU5Q2egQQpTBMwhprMzWzpR8Sxq1OPThh_J6MUD8Z35wky9b8eEO0pwNS8xlh"
      "1lOFRRBoNqDIKVOku0aZb-rynq8cxjDTLZQ6Fz7jSjR1Klop-YKaUHc9GsEofQqYruPhzSA-QgajZGPbE_0ZaVDJHfyd"
      "7UUBUKunFMScbflYAAOYJqVIVwaYR5zWEEceUjNnTNo_CVSj-VvXLO5VZfCUAVLgW4dpf1SrtZjSt34YLsRarSb127re"
      "G_DUwg9Ch-KyvjT1SkHgUWRVGcyly7uvVGRSDwsXypdrNinPA4jlhoNdizK2zF2CWQ");
  Json jwe = {
      {"protect", "eyJhbGciOiJSU0ExXzUiLCJlbmMiOiJBMTI4Q0JDLUhTMjU2In0"},
      {"recipients",
       Json::array(
           {{{"header", {{"alg", "RSA1_5"}}},
             {"encrypted_key",
              "UGhIOguC7IuEvf_NPVaXsGMoLOmwvc1GyqlIKOK1nN94nHPoltGRhWhw7Zx0-kFm1NJn8LE9XShH59_i"
              "8J0PH5ZZyNfGy2xGdULU7sHNF6Gp2vPLgNZ__deLKxGHZ7PcHALUzoOegEI-8E66jX2E4zyJKx-YxzZI"
              "ItRzC5hlRirb6Y5Cl_p-ko3YvkkysZIFNPccxRU7qve1WYPxqbb2Yw8kZqa2rMWI5ng8OtvzlV7elprC"
              "buPhcCdZ6XDP0_F8rkXds2vE4X-ncOIM8hAYHHi29NX0mcKiRaD0-D-ljQTP-cFPgwCp6X-nZZd9OHBv"
              "-B3oWh2TbqmScqXMR4gp_A"}}})},
      {"iv", "AxY8DCtDaGlsbGljb3RoZQ"},
      {"ciphertext", "KDlTtXchhZTGufMYmOYGS4HffxPSUrfmqCHXaI9wOGY"},
      {"tag", "9hH0vgRfYgPnAHOd8stkvw"}};
  EXPECT_EQ(jwe_decrypt(key, jwe), "Live long and prosper.");
}

TEST(Jwe, EveryDamagedMemberIsNoticed) {
  const RsaKey key = RsaKey::generate();
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
  const RsaKey key = RsaKey::generate();
  const Bytes encoded = key.encoded();
  ASSERT_EQ(encoded.size(), 267u);
  EXPECT_EQ(encoded.substr(0, 4), Bytes("\0\1\0\0", 4));
  EXPECT_EQ(encoded.substr(260), Bytes("\3\0\0\0\1\0\1", 7));
  EXPECT_EQ(RsaKey::from_encoded(encoded)->encoded(), encoded);
  EXPECT_FALSE(RsaKey::from_encoded(encoded)->has_private_half());
  for (size_t len = 0; len < encoded.size(); ++len) {
    EXPECT_FALSE(RsaKey::from_encoded(Bytes(encoded.data(), len))) << len;
  }
  EXPECT_FALSE(RsaKey::from_encoded(encoded + "x"));
  EXPECT_FALSE(RsaKey::from_encoded(Bytes("\xFF\xFF\xFF\xFF", 4) + encoded.substr(4)));
}

}  // namespace
}  // namespace tsm
