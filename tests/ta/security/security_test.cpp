// SPDX-License-Identifier: BSD-2-Clause
// Signatures and encrypted contents against vectors of the standards, and what the agent refuses.
#include "crypto/corvel_client.h"
#include "crypto/rsa.h"
#include "crypto/symmetric.h"
#include "otrp_result.h"
#include "security/jwe.h"
#include "security/jws.h"
#include "security/tsm_trust.h"
#include "support/agent_device.h"
#include "support/inside_agent.h"
#include "support/published_vectors.h"
#include "tsm/protocol/crypto.h"

namespace otrp_test {
namespace {

class Security : public InsideAgent {};

std::string unbase64url(const std::string &text) {
  return tools::base64url_decode(text).value();
}

// The agent makes its keys from boxes.
key_object key_pair(const char *modulus, const char *private_exponent) {
  const std::string n = unbase64url(modulus);
  const std::string e("\1\0\1", 3);
  const std::string d = unbase64url(private_exponent);
  const box_ptr box(tlv_box_create());
  EXPECT_EQ(tlv_box_put_int(box.get(), kRsaKeySize, 2048), 0);
  EXPECT_EQ(tlv_box_put_bytes(box.get(), kRsaModulus, u8(n), len_of(n)), 0);
  EXPECT_EQ(tlv_box_put_bytes(box.get(), kRsaPublicExponent, u8(e), len_of(e)), 0);
  EXPECT_EQ(tlv_box_put_bytes(box.get(), kRsaPrivateExponent, u8(d), len_of(d)), 0);
  key_object key(deserialize_rsa_key_from_tlv(box.get()));
  EXPECT_TRUE(key);
  return key;
}

TEST_F(Security, SignaturesAnswerRfc7515) {
  namespace known = rfc7515_a2;
  const key_object key = key_pair(known::kModulus, known::kPrivateExponent);
  const jsmn_string payload = {known::kPayload, sizeof known::kPayload - 1};
  const jsmn_string protect = {known::kProtect, sizeof known::kProtect - 1};
  jsmn_string signature = {known::kSignature, sizeof known::kSignature - 1};
  const auto verify = [&key](const jsmn_string &payload_text, const jsmn_string &protect_text,
                             const jsmn_string &signature_text, secret_bytes *decoded) {
    decoded->reset();
    return verify_signature(key.get(), &payload_text, &protect_text, &signature_text, decoded);
  };
  secret_bytes decoded;
  ASSERT_TRUE(verify(payload, protect, signature, &decoded));
  EXPECT_EQ(str(decoded), unbase64url(known::kPayload));
  EXPECT_EQ(decoded.data[decoded.len], 0);
  EXPECT_FALSE(verify(protect, payload, signature, &decoded));
  signature.len -= 2;
  EXPECT_FALSE(verify(payload, protect, signature, &decoded));
  signature.len = 0;
  EXPECT_FALSE(verify(payload, protect, signature, &decoded));
  decoded.reset();

  secret_bytes own;
  ASSERT_EQ(sign_with_spaik_key(&payload, &protect, &own.data, &own.len, key.get()), TEE_SUCCESS);
  EXPECT_EQ(tools::base64url_encode(str(own)), known::kSignature);
}

TEST_F(Security, EncryptedContentAnswersRfc7516) {
  namespace known = rfc7516_a2;
  const key_object key = key_pair(known::kModulus, known::kPrivateExponent);
  const std::string wrapped = unbase64url(known::kEncryptedKey);
  secret_bytes cek;
  ASSERT_EQ(rsa_decrypt(key.get(), u8(wrapped), len_of(wrapped), &cek.data, &cek.len), TEE_SUCCESS);
  EXPECT_EQ(tools::hex_encode(str(cek)), known::kCek);

  const std::string iv = unbase64url(known::kIv);
  const uint8_t *aes_key = get_aes_key_from_cek(cek.data);
  secret_bytes cipher;
  ASSERT_EQ(aes_cbc_encrypt(aes_key, 16, u8(iv), 16, u8(known::kPlaintext),
                            sizeof known::kPlaintext - 1, &cipher.data, &cipher.len),
            TEE_SUCCESS);
  EXPECT_EQ(str(cipher), unbase64url(known::kCiphertext));
  secret_bytes plain;
  ASSERT_EQ(
      aes_cbc_decrypt(aes_key, 16, u8(iv), 16, cipher.data, cipher.len, &plain.data, &plain.len),
      TEE_SUCCESS);
  EXPECT_EQ(str(plain), known::kPlaintext);

  secret_bytes tag;
  const uint32_t aad_len = sizeof known::kProtect - 1;
  ASSERT_EQ(compute_jwe_auth_tag(cek.data, cek.len, u8(known::kProtect), aad_len, cipher.data,
                                 cipher.len, u8(iv), 16, &tag.data, &tag.len),
            TEE_SUCCESS);
  EXPECT_EQ(str(tag), unbase64url(known::kTag));
  const auto verify = [&](const std::string &claim) {
    return verify_jwe_auth_tag(cek.data, cek.len, u8(known::kProtect), aad_len, cipher.data,
                               cipher.len, u8(iv), 16, u8(claim), len_of(claim));
  };
  // A claim counts for as many bytes as it has.
  for (const size_t len : {1u, 16u}) {
    std::string claim = str(tag).substr(0, len);
    EXPECT_EQ(verify(claim), TEE_SUCCESS) << len;
    claim.back() = static_cast<char>(claim.back() ^ 0x80);
    EXPECT_EQ(verify(claim), TEE_ERROR_MAC_INVALID) << len;
  }
  EXPECT_EQ(verify(str(tag) + std::string(17, 'x')), TEE_ERROR_MAC_INVALID);
}

TEST_F(Security, ContentsOpenUnchangedOrNotAtAll) {
  const key_object key = key_pair(rfc7516_a2::kModulus, rfc7516_a2::kPrivateExponent);
  const json_ptr secret(json_parse_string(R"({"a":"\/","n":[1,2.5]})"));
  const std::pair<const char *, const char *> cases[] = {
      {"protect", "eyJhbGciOiJub25lIn0"},
      {"iv", "AAAAAAAAAAAAAAAA"},
      {"iv", "AAAA"},
      {"ciphertext", "AAAA"},
      {"ciphertext", ""},
      {"encrypted_key", "AAAA"},
      {"tag", "AAAAAAAAAAAAAAAAAAAAAA"},
  };
  for (const char *header : {JWE_HEADER_A128CBC_HS256, JWE_HEADER_A128GCM}) {
    const json_ptr jwe(encrypt_json(key.get(), secret.get(), header));
    ASSERT_TRUE(jwe);
    const json_ptr opened(decrypt_json(key.get(), jwe.get()));
    const json_text text(json_serialize_to_string(opened.get()));
    EXPECT_STREQ(text.get(), R"({"a":"\/","n":[1,2.500000]})");
    for (const auto &[member, value] : cases) {
      SCOPED_TRACE(member);
      const json_ptr changed(json_value_deep_copy(jwe.get()));
      JSON_Object *members = json_value_get_object(changed.get());
      if (member == std::string("encrypted_key")) {
        members = json_array_get_object(json_object_get_array(members, "recipients"), 0);
      }
      ASSERT_EQ(json_object_set_string(members, member, value), JSONSuccess);
      EXPECT_EQ(decrypt_json(key.get(), changed.get()), nullptr);
    }
  }
  EXPECT_EQ(encrypt_json(key.get(), secret.get(), "{}"), nullptr);
}

TEST_F(Security, ResponsesNameTheEndorsementKeyInModeTwoAlone) {
  const FindsImages images;  // of the key service
  std::string id(32, 0);
  uint32_t id_len = 32;
  ASSERT_EQ(corvel_get_device_id(id.data(), &id_len), TEE_SUCCESS);
  const std::string ek_id = tools::hex_encode(tsm::sha256(id + "SP_EK_ID" + '\0'));
  const std::string plain = R"({"header":{"deviceId":"test_device_id")";
  for (const auto &[mode, expected] :
       {std::pair(1u, plain + "}}"), std::pair(2u, plain + R"(,"spekid":")" + ek_id + "\"}}")}) {
    const json_ptr envelope(json_value_init_object());
    ASSERT_TRUE(add_signature_header(json_value_get_object(envelope.get()), mode));
    const json_text text(json_serialize_to_string(envelope.get()));
    EXPECT_EQ(text.get(), expected);
  }
}

TEST_F(Security, EncodedPublicKeysMustHoldWhatTheyClaim) {
  const std::string encoded("\2\0\0\0nn\1\0\0\0e", 11);
  secret_bytes n;
  secret_bytes e;
  const auto read = [&](const std::string &bytes) {
    return read_pubkey_buf_to_n_and_e(u8(bytes), len_of(bytes), &n.data, &n.len, &e.data, &e.len);
  };
  for (size_t len = 0; len < encoded.size(); ++len) {
    EXPECT_EQ(read(encoded.substr(0, len)), OTRP_NO_MEMORY) << len;
  }
  EXPECT_EQ(read(std::string("\xFF\xFF\xFF\xFFn", 5)), OTRP_NO_MEMORY);
  ASSERT_EQ(read(encoded), TEE_SUCCESS);
  EXPECT_EQ(str(n) + "|" + str(e), "nn|e");
}

}  // namespace
}  // namespace otrp_test
