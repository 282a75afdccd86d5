// SPDX-License-Identifier: BSD-2-Clause
// What the wrappers add to the ciphers of the TEE: padding, and the refusal of wrong lengths.
#include "crypto/symmetric.h"

#include <vector>

#include "support/inside_agent.h"

namespace otrp_test {
namespace {

class Symmetric : public InsideAgent {};

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

TEST_F(Symmetric, ShortHmacKeysGiveThePublishedMacs) {
  const struct {
    std::string key;
    std::string text;
    std::string tag;
  } cases[] = {
      // RFC 4231, test cases 1 and 2
      {std::string(20, '\x0b'), "Hi There",
       "\xb0\x34\x4c\x61\xd8\xdb\x38\x53\x5c\xa8\xaf\xce\xaf\x0b\xf1\x2b"},
      {"Jefe", "what do ya want for nothing?",
       "\x5b\xdc\xc1\x46\xbf\x60\x75\x4e\x6a\x04\x24\x26\x08\x95\x75\xc7"},
  };
  for (const auto &c : cases) {
    secret_bytes mac;
    ASSERT_EQ(Compute_HmacSha256(u8(c.text), len_of(c.text), u8(c.key), len_of(c.key), &mac.data,
                                 &mac.len),
              TEE_SUCCESS);
    EXPECT_EQ(str(mac), c.tag);
  }
}

}  // namespace
}  // namespace otrp_test
