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

TEST_F(Crypto, DigestKnownAnswersFromOneOperation) {
  // FIPS 180, examples
  const std::pair<Bytes, const char *> kCases[] = {
      {{}, "e3b0c44298fc1c149afbf4c8996fb92427ae41e4649b934ca495991b7852b855"},
      {as_bytes("abcdbcdecdefdefgefghfghighijhijkijkljklmklmnlmnomnopnopq"),
       "248d6a61d20638b8e5c026930c3e6039a33ce45964ff2167f6ecedd419db06c1"},
  };
  const Operation digest = make_operation(TEE_ALG_SHA256, TEE_MODE_DIGEST);
  for (const auto &[data, hash] : kCases) {
    const Bytes rest(data.begin() + size_of(data) / 2, data.end());
    TEE_DigestUpdate(digest.get(), data.data(), size_of(data) - size_of(rest));
    const auto finish = [&digest, &rest](uint8_t *out, uint32_t *len) {
      return TEE_DigestDoFinal(digest.get(), rest.data(), size_of(rest), out, len);
    };
    EXPECT_EQ(output_of(32, finish), from_hex(hash));
  }
}

// RFC 4231, test case 1
TEST_F(Crypto, MacKnownAnswerAndTheKeySurvivesIt) {
  const Operation mac = make_operation(TEE_ALG_HMAC_SHA256, TEE_MODE_MAC, 256,
                                       secret_key(TEE_TYPE_HMAC_SHA256, Bytes(20, 0x0b)));
  const auto finish = [&mac](uint8_t *out, uint32_t *len) {
    return TEE_MACComputeFinal(mac.get(), "There", 5, out, len);
  };
  for (int round = 0; round < 2; ++round) {
    TEE_MACInit(mac.get(), nullptr, 0);
    TEE_MACUpdate(mac.get(), "Hi ", 3);
    EXPECT_EQ(output_of(32, finish),
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

TEST_F(Crypto, CbcKnownAnswerInStepsOfAnySizeInPlace) {
  const Key key = secret_key(TEE_TYPE_AES, kCbcKey);
  const Operation encrypt = make_operation(TEE_ALG_AES_CBC_NOPAD, TEE_MODE_ENCRYPT, 256, key);
  const Operation decrypt = make_operation(TEE_ALG_AES_CBC_NOPAD, TEE_MODE_DECRYPT, 128, key);
  for (const uint32_t step : {1u, 5u, 16u, 23u, 48u, 64u}) {
    SCOPED_TRACE(step);
    EXPECT_EQ(cbc_in_place(encrypt, kCbcPlaintext, step), kCbcCiphertext);
    EXPECT_EQ(cbc_in_place(decrypt, kCbcCiphertext, step), kCbcPlaintext);
  }
}

struct GcmCase {
  Bytes nonce, aad, ciphertext, tag;
};

// McGrew and Viega, The Galois/Counter Mode of Operation, test case 4
const Bytes kGcmKey = from_hex("feffe9928665731c6d6a8f9467308308");
const Bytes kGcmPlaintext = from_hex(
    "d9313225f88406e5a55909c5aff5269a86a7a9531534f7da2e4c303d8a318a72"
    "1c3c0c95956809532fcf0e2449a6b525b16aedf5aa0de657ba637b39");
const GcmCase kGcm = {from_hex("cafebabefacedbaddecaf888"),
                      from_hex("feedfacedeadbeeffeedfacedeadbeefabaddad2"),
                      from_hex("42831ec2217774244b7221b784d0d49ce3aa212f2c02a4e035c17e2329aca12e"
                               "21d514b25466931c7d8f6a5aac84aa051ba30b396a0aac973d58e091"),
                      from_hex("5bc94fbc3221a5db94fae95ae7121a47")};

// Takes the first half of `data`, in place.
Operation begin_gcm(const GcmCase &c, uint32_t mode, Bytes *data) {
  Operation gcm = make_operation(TEE_ALG_AES_GCM, mode, 128, secret_key(TEE_TYPE_AES, kGcmKey));
  uint32_t len = size_of(*data) / 2;
  EXPECT_EQ(TEE_AEInit(gcm.get(), c.nonce.data(), size_of(c.nonce), 128, 0, 0), TEE_SUCCESS);
  TEE_AEUpdateAAD(gcm.get(), c.aad.data(), size_of(c.aad));
  EXPECT_EQ(TEE_AEUpdate(gcm.get(), data->data(), len, data->data(), &len), TEE_SUCCESS);
  return gcm;
}

TEE_Result decrypt_gcm(const GcmCase &c, Bytes *data) {
  *data = c.ciphertext;
  const Operation gcm = begin_gcm(c, TEE_MODE_DECRYPT, data);
  uint8_t *rest = data->data() + size_of(*data) / 2;
  uint32_t len = size_of(*data) - size_of(*data) / 2;
  Bytes tag = c.tag;
  return TEE_AEDecryptFinal(gcm.get(), rest, len, rest, &len, tag.data(), size_of(tag));
}

TEST_F(Crypto, GcmKnownAnswerInPlace) {
  Bytes data = kGcmPlaintext;
  const Operation gcm = begin_gcm(kGcm, TEE_MODE_ENCRYPT, &data);
  uint8_t *rest = data.data() + size_of(data) / 2;
  const Bytes tag = output_of(16, [&](uint8_t *out, uint32_t *tag_len) {
    uint32_t len = size_of(data) - size_of(data) / 2;
    return TEE_AEEncryptFinal(gcm.get(), rest, len, rest, &len, out, tag_len);
  });
  EXPECT_EQ(tag, kGcm.tag);
  EXPECT_EQ(data, kGcm.ciphertext);
  EXPECT_EQ(decrypt_gcm(kGcm, &data), TEE_SUCCESS);
  EXPECT_EQ(data, kGcmPlaintext);
}

TEST_F(Crypto, GcmRefusesWhatIsNotGenuine) {
  const std::pair<const char *, void (*)(GcmCase &)> kForgeries[] = {
      {"Tag", [](GcmCase &c) { c.tag[15] ^= 1; }},
      {"TagTruncated", [](GcmCase &c) { c.tag.pop_back(); }},
      {"TagMissing", [](GcmCase &c) { c.tag.clear(); }},
      {"TagTooLong", [](GcmCase &c) { c.tag.push_back(0); }},
      {"Aad", [](GcmCase &c) { c.aad[0] ^= 1; }},
      {"Ciphertext", [](GcmCase &c) { c.ciphertext.back() ^= 0x80; }},
      {"Nonce", [](GcmCase &c) { c.nonce[0] ^= 1; }},
  };
  for (const auto &[name, forge] : kForgeries) {
    GcmCase forged = kGcm;
    Bytes data;
    forge(forged);
    EXPECT_EQ(decrypt_gcm(forged, &data), TEE_ERROR_MAC_INVALID) << name;
  }
}

// ---- RSA

// RFC 7515, appendix A.2
const Bytes kSignedDigest =
    from_hex("c88a34847b4ffb12a9326e540f144b3dcc4d5515f18701e7d6e0ee7866c9c705");

TEST_F(Crypto, RsaSignatureKnownAnswerWithoutCrtAndWhatIsNotGenuine) {
  const uint32_t algorithm = TEE_ALG_RSASSA_PKCS1_V1_5_SHA256;
  const Operation sign = make_operation(algorithm, TEE_MODE_SIGN, 2048,
                                        make_key(TEE_TYPE_RSA_KEYPAIR, 2048, rfc7515_private()));
  const Bytes signature = output_of(256, [&](uint8_t *out, uint32_t *len) {
    return TEE_AsymmetricSignDigest(sign.get(), nullptr, 0, kSignedDigest.data(), 32, out, len);
  });
  EXPECT_EQ(signature, from_base64url(rfc7515_a2::kSignature));

  const Operation verify = make_operation(
      algorithm, TEE_MODE_VERIFY, 2048, make_key(TEE_TYPE_RSA_PUBLIC_KEY, 2048, rfc7515_public()));
  const auto verified = [&verify](const Bytes &candidate) {
    return TEE_AsymmetricVerifyDigest(verify.get(), nullptr, 0, kSignedDigest.data(), 32,
                                      candidate.data(), size_of(candidate));
  };
  EXPECT_EQ(verified(signature), TEE_SUCCESS);
  Bytes flipped = signature, longer = signature, shorter = signature;
  flipped[100] ^= 1;
  longer.push_back(0);
  shorter.pop_back();
  for (const Bytes &forged : {flipped, longer, shorter, Bytes(256, 0xff), Bytes()}) {
    EXPECT_EQ(verified(forged), TEE_ERROR_SIGNATURE_INVALID);
  }
}

// ---- What an operation takes

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
}

TEST_F(Crypto, OperationsOutliveTheirKeyObjectsAndTakeNewKeys) {
  Key key = secret_key(TEE_TYPE_AES, Bytes(16, 9));
  const Operation cipher = make_operation(TEE_ALG_AES_CBC_NOPAD, TEE_MODE_ENCRYPT, 128, key);
  key = secret_key(TEE_TYPE_AES, kCbcKey);
  EXPECT_EQ(TEE_SetOperationKey(cipher.get(), key.get()), TEE_SUCCESS);
  key.reset();
  EXPECT_EQ(cbc_in_place(cipher, kCbcPlaintext, 16), kCbcCiphertext);
}

}  // namespace
