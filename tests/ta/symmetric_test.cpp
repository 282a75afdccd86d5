// SPDX-License-Identifier: BSD-2-Clause
// Known answers of others, and what the wrappers add: padding, truncation, refusals.
#include "crypto/symmetric.h"

#include "support/inside_agent.h"

namespace otrp_test {
namespace {

class Symmetric : public InsideAgent {};

TEST_F(Symmetric, AesCbcAnswersSp800_38a) {
  // NIST SP 800-38A, F.2.1; the fifth block is our padding.
  const std::string key = hex("2b7e151628aed2a6abf7158809cf4f3c");
  const std::string iv = hex("000102030405060708090a0b0c0d0e0f");
  const std::string plain =
      hex("6bc1bee22e409f96e93d7e117393172aae2d8a571e03ac9c9eb76fac45af8e51"
          "30c81c46a35ce411e5fbc1191a0a52eff69f2445df4f9b17ad2b417be66c3710");
  const std::string expected =
      hex("7649abac8119b246cee98e9b12e9197d5086cb9b507219ee95db113a917678b2"
          "73bed6b8e3c1743b7116e69e222295163ff1caa1681fac09120eca307586e1a7");
  secret_bytes cipher;
  ASSERT_EQ(aes_cbc_encrypt(u8(key), 16, u8(iv), 16, u8(plain), 64, &cipher.data, &cipher.len),
            TEE_SUCCESS);
  ASSERT_EQ(cipher.len, 80u);
  EXPECT_EQ(str(cipher).substr(0, 64), expected);

  secret_bytes back;
  ASSERT_EQ(aes_cbc_decrypt(u8(key), 16, u8(iv), 16, cipher.data, 80, &back.data, &back.len),
            TEE_SUCCESS);
  EXPECT_EQ(str(back), plain);

  uint8_t *in_place = cipher.release();
  ASSERT_EQ(aes_cbc_decrypt_with_update_block(u8(key), 16, u8(iv), 16, in_place, 80, &cipher.data,
                                              &cipher.len),
            TEE_SUCCESS);
  EXPECT_EQ(cipher.data, in_place);
  EXPECT_EQ(str(cipher), plain);
}

TEST_F(Symmetric, AesGcmAnswersTheGcmProposal) {
  // McGrew and Viega, test case 4.
  const std::string key = hex("feffe9928665731c6d6a8f9467308308");
  const std::string iv = hex("cafebabefacedbaddecaf888");
  const std::string aad = hex("feedfacedeadbeeffeedfacedeadbeefabaddad2");
  const std::string plain =
      hex("d9313225f88406e5a55909c5aff5269a86a7a9531534f7da2e4c303d8a318a72"
          "1c3c0c95956809532fcf0e2449a6b525b16aedf5aa0de657ba637b39");
  secret_bytes cipher;
  secret_bytes tag;
  ASSERT_EQ(aes_gcm_encrypt(u8(key), 16, u8(iv), 12, u8(aad), 20, u8(plain), 60, &cipher.data,
                            &cipher.len, &tag.data, &tag.len),
            TEE_SUCCESS);
  EXPECT_EQ(str(cipher), hex("42831ec2217774244b7221b784d0d49ce3aa212f2c02a4e035c17e2329aca12e"
                             "21d514b25466931c7d8f6a5aac84aa051ba30b396a0aac973d58e091"));
  EXPECT_EQ(str(tag), hex("5bc94fbc3221a5db94fae95ae7121a47"));

  secret_bytes back;
  const auto decrypt = [&](uint32_t tag_len) {
    back.reset();
    return aes_gcm_decrypt(u8(key), 16, u8(iv), 12, u8(aad), 20, tag.data, tag_len, cipher.data,
                           cipher.len, &back.data, &back.len);
  };
  ASSERT_EQ(decrypt(16), TEE_SUCCESS);
  EXPECT_EQ(str(back), plain);
  EXPECT_EQ(decrypt(4), TEE_ERROR_MAC_INVALID);
  tag.data[15] ^= 1;
  EXPECT_EQ(decrypt(16), TEE_ERROR_MAC_INVALID);
  EXPECT_EQ(back.data, nullptr);
}

TEST_F(Symmetric, HmacAnswersRfc4231) {
  const struct {
    std::string key, data, mac;
  } cases[] = {
      // Test cases 1 and 3.
      {std::string(20, 0x0b), "Hi There",
       "b0344c61d8db38535ca8afceaf0bf12b881dc200c9833da726e9376c2e32cff7"},
      {std::string(20, '\xaa'), std::string(50, '\xdd'),
       "773ea91e36800e46854db8ebd09181a72959098b3ef8c122d9635514ced565fe"},
  };
  for (const auto &c : cases) {
    const std::string known = hex(c.mac);
    secret_bytes mac;
    ASSERT_EQ(Compute_HmacSha256(u8(c.data), len_of(c.data), u8(c.key), len_of(c.key), &mac.data,
                                 &mac.len),
              TEE_SUCCESS);
    EXPECT_EQ(mac.len, 16u);
    EXPECT_EQ(std::string(reinterpret_cast<char *>(mac.data), 32), known);
    // A claim counts for as many bytes as it has.
    for (const size_t len : {1u, 16u, 32u}) {
      std::string claimed = known.substr(0, len);
      const auto verify = [&] {
        return Verify_HmacSha256(u8(c.data), len_of(c.data), u8(c.key), len_of(c.key), u8(claimed),
                                 len_of(claimed));
      };
      EXPECT_EQ(verify(), TEE_SUCCESS) << len;
      claimed.back() = static_cast<char>(claimed.back() ^ 0x80);
      EXPECT_EQ(verify(), TEE_ERROR_MAC_INVALID) << len;
      claimed = known + "x";
      EXPECT_EQ(verify(), TEE_ERROR_MAC_INVALID);
    }
  }
}

TEST_F(Symmetric, PaddingIsWholeOrRefused) {
  const struct {
    const char *name;
    std::vector<uint8_t> data;  // on the heap, exactly as long as it is
    TEE_Result result;
    uint32_t unpadded;
  } cases[] = {
      {"one byte", {'a', 'b', 'c', 1}, TEE_SUCCESS, 3},
      {"whole block", std::vector<uint8_t>(16, 16), TEE_SUCCESS, 0},
      {"nothing", {}, TEE_ERROR_BAD_FORMAT, 0},
      {"zero", {'a', 0}, TEE_ERROR_BAD_FORMAT, 0},
      {"seventeen", std::vector<uint8_t>(32, 17), TEE_ERROR_BAD_FORMAT, 0},
      {"uneven", {3, 3, 2}, TEE_ERROR_BAD_FORMAT, 0},
      {"longer than the data", {4, 4, 4}, TEE_ERROR_BAD_FORMAT, 0},
  };
  for (const auto &c : cases) {
    SCOPED_TRACE(c.name);
    uint32_t unpadded = 0;
    const auto len = static_cast<uint32_t>(c.data.size());
    EXPECT_EQ(remove_pkcs_pading_length(c.data.data(), len, &unpadded), c.result);
    EXPECT_EQ(unpadded, c.unpadded);
  }
}

TEST_F(Symmetric, LengthsThatASenderGetsWrongAreRefusedAndTheBufferFreed) {
  const std::string text(17, 'x');
  const struct {
    uint32_t iv_len;
    uint32_t cipher_len;
    TEE_Result result;
  } cases[] = {{1, 16, TEE_ERROR_BAD_PARAMETERS},  {15, 16, TEE_ERROR_BAD_PARAMETERS},
               {17, 16, TEE_ERROR_BAD_PARAMETERS}, {16, 0, TEE_ERROR_BAD_FORMAT},
               {16, 1, TEE_ERROR_BAD_FORMAT},      {16, 17, TEE_ERROR_BAD_FORMAT}};
  for (const auto &c : cases) {
    secret_bytes out;
    EXPECT_EQ(aes_cbc_decrypt(u8(text), 16, u8(text), c.iv_len, u8(text), c.cipher_len, &out.data,
                              &out.len),
              c.result);
    EXPECT_EQ(aes_cbc_decrypt_with_update_block(u8(text), 16, u8(text), c.iv_len,
                                                allocate_bytes(c.cipher_len), c.cipher_len,
                                                &out.data, &out.len),
              c.result);
  }
}

TEST_F(Symmetric, ADigestOfPartsIsTheDigestOfAll) {
  const data_part parts[] = {{"ab", 2}, {"", 0}, {"c", 1}};
  uint8_t digest[32];
  uint32_t len = sizeof digest;
  ASSERT_EQ(compute_string_array_digest_with_update(TEE_ALG_SHA256, parts, 3, digest, &len),
            TEE_SUCCESS);
  // FIPS 180-2, B.1
  EXPECT_EQ(std::string(reinterpret_cast<char *>(digest), len),
            hex("ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad"));
}

}  // namespace
}  // namespace otrp_test
