// SPDX-License-Identifier: BSD-2-Clause
#include "crypto_support.h"

namespace {

// What `call` gives into a buffer of `size` bytes. One byte less is refused, with the size, and
// leaves the operation as it was.
template <class Call>
Bytes output_of(uint32_t size, Call call) {
  Bytes out(size);
  uint32_t len = size - 1;
  EXPECT_EQ(call(out.data(), &len), TEE_ERROR_SHORT_BUFFER);
  EXPECT_EQ(len, size);
  EXPECT_EQ(call(out.data(), &len), TEE_SUCCESS);
  EXPECT_EQ(len, size);
  return out;
}

TEST_F(Crypto, DigestAndMacKnownAnswersAgainAndAgain) {
  const Operation digest = make_operation(TEE_ALG_SHA256, TEE_MODE_DIGEST);
  const auto finish_digest = [&digest](uint8_t *out, uint32_t *len) {
    return TEE_DigestDoFinal(digest.get(), "c", 1, out, len);
  };
  Bytes secret(20, 0x0b);
  secret.resize(24);  // the shortest key here; HMAC itself fills up with zeros
  const Operation mac = make_operation(TEE_ALG_HMAC_SHA256, TEE_MODE_MAC, 256,
                                       secret_key(TEE_TYPE_HMAC_SHA256, secret));
  const auto finish_mac = [&mac](uint8_t *out, uint32_t *len) {
    return TEE_MACComputeFinal(mac.get(), "There", 5, out, len);
  };
  for (int round = 0; round < 2; ++round) {
    TEE_DigestUpdate(digest.get(), "ab", 2);
    EXPECT_EQ(output_of(32, finish_digest),  // FIPS 180-2, B.1
              from_hex("ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad"));
    TEE_MACInit(mac.get(), nullptr, 0);
    TEE_MACUpdate(mac.get(), "Hi ", 3);
    EXPECT_EQ(output_of(32, finish_mac),  // RFC 4231, test case 1
              from_hex("b0344c61d8db38535ca8afceaf0bf12b881dc200c9833da726e9376c2e32cff7"));
  }
}

// ---- Ciphers

// NIST SP 800-38A, F.2.1
const Bytes kCbcKey = from_hex("2b7e151628aed2a6abf7158809cf4f3c");
const Bytes kCbcIv = from_hex("000102030405060708090a0b0c0d0e0f");
const Bytes kCbcPlaintext = from_hex(
    "6bc1bee22e409f96e93d7e117393172aae2d8a571e03ac9c9eb76fac45af8e51"
    "30c81c46a35ce411e5fbc1191a0a52eff69f2445df4f9b17ad2b417be66c3710");
const Bytes kCbcCiphertext = from_hex(
    "7649abac8119b246cee98e9b12e9197d5086cb9b507219ee95db113a917678b2"
    "73bed6b8e3c1743b7116e69e222295163ff1caa1681fac09120eca307586e1a7");

// Runs `data` in place through the cipher, `step` bytes a call, each with the room that it asks
// for.
Bytes cbc_in_place(const Operation &cipher, const Bytes &data, uint32_t step) {
  TEE_CipherInit(cipher.get(), kCbcIv.data(), size_of(kCbcIv));
  Bytes out;
  for (uint32_t at = 0; at < data.size(); at += step) {
    const uint32_t n = std::min(step, size_of(data) - at);
    Bytes chunk(data.begin() + at, data.begin() + at + n);
    chunk.resize(n + 16);
    uint32_t len = 0;
    if (TEE_CipherUpdate(cipher.get(), chunk.data(), n, nullptr, &len) == TEE_ERROR_SHORT_BUFFER) {
      EXPECT_EQ(TEE_CipherUpdate(cipher.get(), chunk.data(), n, chunk.data(), &len), TEE_SUCCESS);
    }
    out.insert(out.end(), chunk.begin(), chunk.begin() + len);
  }
  uint32_t none = 0;
  EXPECT_EQ(TEE_CipherDoFinal(cipher.get(), nullptr, 0, nullptr, &none), TEE_SUCCESS);
  return out;
}

TEST_F(Crypto, CbcKnownAnswerInStepsOfAnySizeAfterTheKeyObjectIsGone) {
  Key key = secret_key(TEE_TYPE_AES, Bytes(16, 9));
  const Operation encrypt = make_operation(TEE_ALG_AES_CBC_NOPAD, TEE_MODE_ENCRYPT, 256, key);
  key = secret_key(TEE_TYPE_AES, kCbcKey);
  const Operation decrypt = make_operation(TEE_ALG_AES_CBC_NOPAD, TEE_MODE_DECRYPT, 128, key);
  EXPECT_EQ(TEE_SetOperationKey(encrypt.get(), key.get()), TEE_SUCCESS);
  key.reset();
  for (const uint32_t step : {1u, 5u, 16u, 23u, 48u, 64u}) {
    SCOPED_TRACE(step);
    EXPECT_EQ(cbc_in_place(encrypt, kCbcPlaintext, step), kCbcCiphertext);
    EXPECT_EQ(cbc_in_place(decrypt, kCbcCiphertext, step), kCbcPlaintext);
  }
}

// McGrew and Viega, The Galois/Counter Mode of Operation, test case 4
const Bytes kGcmPlaintext = from_hex(
    "d9313225f88406e5a55909c5aff5269a86a7a9531534f7da2e4c303d8a318a72"
    "1c3c0c95956809532fcf0e2449a6b525b16aedf5aa0de657ba637b39");
const Bytes kGcmCiphertext = from_hex(
    "42831ec2217774244b7221b784d0d49ce3aa212f2c02a4e035c17e2329aca12e"
    "21d514b25466931c7d8f6a5aac84aa051ba30b396a0aac973d58e091");

// Takes the first half of `data`, in place.
Operation begin_gcm(uint32_t mode, Bytes *data) {
  const Key key = secret_key(TEE_TYPE_AES, from_hex("feffe9928665731c6d6a8f9467308308"));
  const Bytes nonce = from_hex("cafebabefacedbaddecaf888");
  const Bytes aad = from_hex("feedfacedeadbeeffeedfacedeadbeefabaddad2");
  Operation gcm = make_operation(TEE_ALG_AES_GCM, mode, 128, key);
  uint32_t len = size_of(*data) / 2;
  EXPECT_EQ(TEE_AEInit(gcm.get(), nonce.data(), size_of(nonce), 128, 0, 0), TEE_SUCCESS);
  TEE_AEUpdateAAD(gcm.get(), aad.data(), size_of(aad));
  EXPECT_EQ(TEE_AEUpdate(gcm.get(), data->data(), len, data->data(), &len), TEE_SUCCESS);
  return gcm;
}

TEST_F(Crypto, GcmKnownAnswerInPlaceUnderItsWholeTagOnly) {
  const uint32_t half = size_of(kGcmPlaintext) / 2;
  Bytes data = kGcmPlaintext;
  const Operation encrypt = begin_gcm(TEE_MODE_ENCRYPT, &data);
  uint32_t len = half;
  const Bytes tag = output_of(16, [&](uint8_t *out, uint32_t *tag_len) {
    return TEE_AEEncryptFinal(encrypt.get(), &data[half], half, &data[half], &len, out, tag_len);
  });
  EXPECT_EQ(tag, from_hex("5bc94fbc3221a5db94fae95ae7121a47"));
  EXPECT_EQ(data, kGcmCiphertext);

  for (const uint32_t tag_len : {0u, 15u, 17u, 16u}) {
    data = kGcmCiphertext;
    const Operation decrypt = begin_gcm(TEE_MODE_DECRYPT, &data);
    Bytes claimed = tag;
    claimed.resize(tag_len);
    EXPECT_EQ(TEE_AEDecryptFinal(decrypt.get(), &data[half], half, &data[half], &len,
                                 claimed.data(), tag_len),
              tag_len == 16 ? TEE_SUCCESS : TEE_ERROR_MAC_INVALID);
  }
  EXPECT_EQ(data, kGcmPlaintext);
}

// ---- What an operation takes

TEST_F(Crypto, AnOperationTakesItsModesAndSizesAlone) {
  const struct {
    uint32_t algorithm, mode, max_key_size;
  } kUnsupported[] = {
      {TEE_ALG_SHA256, TEE_MODE_DIGEST, 256},
      {TEE_ALG_SHA256, TEE_MODE_MAC, 0},
      {TEE_ALG_HMAC_SHA256, TEE_MODE_MAC, 184},
      {TEE_ALG_HMAC_SHA256, TEE_MODE_MAC, 1032},
      {TEE_ALG_HMAC_SHA256, TEE_MODE_SIGN, 256},
      {TEE_ALG_AES_CBC_NOPAD, TEE_MODE_ENCRYPT, 0},
      {TEE_ALG_AES_GCM, TEE_MODE_MAC, 128},
      {TEE_ALG_RSAES_PKCS1_V1_5, TEE_MODE_SIGN, 2048},
      {TEE_ALG_RSASSA_PKCS1_V1_5_SHA256, TEE_MODE_SIGN, 4104},
      {0x50000003, TEE_MODE_DIGEST, 0},
      {TEE_ALG_SHA256, 32, 0},
  };
  for (const auto &c : kUnsupported) {
    SCOPED_TRACE(testing::Message() << std::hex << c.algorithm << " " << c.max_key_size);
    TEE_OperationHandle operation;
    EXPECT_EQ(TEE_AllocateOperation(&operation, c.algorithm, c.mode, c.max_key_size),
              TEE_ERROR_NOT_SUPPORTED);
    EXPECT_EQ(operation, nullptr);
  }
}

TEST_F(Crypto, MisuseOfAnOperationPanics) {
  const Key aes = secret_key(TEE_TYPE_AES, Bytes(16));
  const Key rsa = make_key(TEE_TYPE_RSA_PUBLIC_KEY, 2048, rfc7515_public());
  const Operation keyless = make_operation(TEE_ALG_AES_CBC_NOPAD, TEE_MODE_ENCRYPT, 128);
  const Operation cbc = make_operation(TEE_ALG_AES_CBC_NOPAD, TEE_MODE_ENCRYPT, 128, aes);
  const Operation decrypt = make_operation(TEE_ALG_RSAES_PKCS1_V1_5, TEE_MODE_DECRYPT, 2048);
  const Operation encrypt = make_operation(TEE_ALG_RSAES_PKCS1_V1_5, TEE_MODE_ENCRYPT, 2048, rsa);
  const Operation small = make_operation(TEE_ALG_RSAES_PKCS1_V1_5, TEE_MODE_ENCRYPT, 1024);
  const TEE_OperationHandle stale = make_operation(TEE_ALG_SHA256, TEE_MODE_DIGEST).get();
  Bytes out(256);
  uint32_t len = 256;

  EXPECT_DEATH(TEE_FreeOperation(stale), "not an open operation");
  EXPECT_DEATH(TEE_DigestUpdate(cbc.get(), "", 0), "another class");
  EXPECT_DEATH(TEE_CipherInit(keyless.get(), kCbcIv.data(), 16), "no key");
  EXPECT_DEATH(TEE_CipherInit(cbc.get(), kCbcIv.data(), 15), "IV");
  EXPECT_DEATH(TEE_CipherUpdate(cbc.get(), "", 0, out.data(), &len), "not been started");
  EXPECT_DEATH(TEE_SetOperationKey(decrypt.get(), rsa.get()), "type");
  EXPECT_DEATH(TEE_SetOperationKey(small.get(), rsa.get()), "too big");
  EXPECT_DEATH(TEE_SetOperationKey(keyless.get(), blank_key(TEE_TYPE_AES, 128).get()),
               "not initialized");
  EXPECT_DEATH(TEE_AsymmetricDecrypt(encrypt.get(), nullptr, 0, out.data(), 256, out.data(), &len),
               "another mode");
  TEE_CipherInit(cbc.get(), kCbcIv.data(), 16);
  EXPECT_DEATH(TEE_SetOperationKey(cbc.get(), aes.get()), "running");
  EXPECT_DEATH(TEE_CipherDoFinal(cbc.get(), "x", 1, out.data(), &len), "whole blocks");
  EXPECT_EQ(TEE_CipherDoFinal(cbc.get(), nullptr, 0, nullptr, &len), TEE_SUCCESS);
  EXPECT_DEATH(TEE_CipherUpdate(cbc.get(), "", 0, out.data(), &len), "not been started");

  const Operation gcm = make_operation(TEE_ALG_AES_GCM, TEE_MODE_ENCRYPT, 128, aes);
  EXPECT_DEATH(TEE_AEInit(gcm.get(), "", 0, 128, 0, 0), "nonce is empty");
  EXPECT_EQ(TEE_AEInit(gcm.get(), out.data(), 12, 64, 0, 0), TEE_ERROR_NOT_SUPPORTED);
  EXPECT_EQ(TEE_AEInit(gcm.get(), out.data(), 129, 128, 0, 0), TEE_ERROR_NOT_SUPPORTED);
  EXPECT_EQ(TEE_AEInit(gcm.get(), out.data(), 1, 96, 0, 0), TEE_SUCCESS);
  EXPECT_DEATH(TEE_AEInit(gcm.get(), out.data(), 12, 128, 0, 0), "running");
  EXPECT_DEATH(TEE_AEDecryptFinal(gcm.get(), "", 0, out.data(), &len, out.data(), 12), "mode");
  len = 1;
  EXPECT_EQ(TEE_AEUpdate(gcm.get(), "x", 1, out.data(), &len), TEE_SUCCESS);
  EXPECT_DEATH(TEE_AEUpdateAAD(gcm.get(), "late", 4), "OpenSSL");

  const Operation verify =
      make_operation(TEE_ALG_RSASSA_PKCS1_V1_5_SHA256, TEE_MODE_VERIFY, 2048, rsa);
  EXPECT_DEATH(
      TEE_AsymmetricVerifyDigest(verify.get(), nullptr, 0, out.data(), 31, out.data(), 256),
      "digest of a wrong length");
  EXPECT_EQ(TEE_AsymmetricVerifyDigest(verify.get(), nullptr, 0, out.data(), 32, out.data(), 255),
            TEE_ERROR_SIGNATURE_INVALID);
  EXPECT_EQ(TEE_AsymmetricEncrypt(encrypt.get(), nullptr, 0, out.data(), 246, out.data(), &len),
            TEE_ERROR_BAD_PARAMETERS);
}

}  // namespace
