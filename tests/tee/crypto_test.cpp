// SPDX-License-Identifier: BSD-2-Clause
#include <gtest/gtest.h>

#include "crypto_support.h"

namespace {

using tee::test::Device;
using tee::test::Fault;
using tee::test::InsideTa;

class Crypto : public ::testing::Test {
 protected:
  Device device_;
  InsideTa inside_{device_};
};

Bytes repeated(uint8_t byte, size_t count) {
  return Bytes(count, byte);
}

Bytes text(const std::string &s) {
  return Bytes(s.begin(), s.end());
}

// FIPS 180, examples
TEST_F(Crypto, Sha256KnownAnswersFromOneOperation) {
  const std::pair<Bytes, const char *> kCases[] = {
      {{}, "e3b0c44298fc1c149afbf4c8996fb92427ae41e4649b934ca495991b7852b855"},
      {text("abc"), "ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad"},
      {text("abcdbcdecdefdefgefghfghighijhijkijkljklmklmnlmnomnopnopq"),
       "248d6a61d20638b8e5c026930c3e6039a33ce45964ff2167f6ecedd419db06c1"},
  };
  const Operation digest = make_operation(TEE_ALG_SHA256, TEE_MODE_DIGEST);
  for (const auto &[data, hash] : kCases) {
    const uint32_t half = size_of(data) / 2;
    Bytes out(32);
    uint32_t len = 31;
    const auto finish = [&, &rest = data] {
      return TEE_DigestDoFinal(digest.get(), rest.data() + half, size_of(rest) - half, out.data(),
                               &len);
    };
    TEE_DigestUpdate(digest.get(), data.data(), half);
    EXPECT_EQ(finish(), TEE_ERROR_SHORT_BUFFER);
    EXPECT_EQ(len, 32u);
    EXPECT_EQ(finish(), TEE_SUCCESS);
    EXPECT_EQ(out, from_hex(hash));
  }
}

// RFC 4231, test cases 1 and 4
TEST_F(Crypto, HmacKnownAnswers) {
  struct {
    Bytes key, data;
    const char *mac;
  } const kCases[] = {
      {repeated(0x0b, 20), text("Hi There"),
       "b0344c61d8db38535ca8afceaf0bf12b881dc200c9833da726e9376c2e32cff7"},
      {from_hex("0102030405060708090a0b0c0d0e0f10111213141516171819"), repeated(0xcd, 50),
       "82558a389a443c0ea4cc819899f2083a85f0faa3e578f8077a2e3ff46729665b"},
  };
  for (const auto &c : kCases) {
    const Key key = secret_key(TEE_TYPE_HMAC_SHA256, c.key);
    const Operation mac = make_operation(TEE_ALG_HMAC_SHA256, TEE_MODE_MAC, 256, key);
    for (int round = 0; round < 2; ++round) {  // the key survives the end
      Bytes out(32);
      uint32_t len = 31;
      TEE_MACInit(mac.get(), nullptr, 0);
      TEE_MACUpdate(mac.get(), c.data.data(), 3);
      const auto finish = [&] {
        return TEE_MACComputeFinal(mac.get(), c.data.data() + 3, size_of(c.data) - 3, out.data(),
                                   &len);
      };
      EXPECT_EQ(finish(), TEE_ERROR_SHORT_BUFFER);
      EXPECT_EQ(finish(), TEE_SUCCESS);
      EXPECT_EQ(out, from_hex(c.mac));
    }
  }
}

struct CbcCase {
  const char *name, *key, *ciphertext;
};

const Bytes kCbcIv = from_hex("000102030405060708090a0b0c0d0e0f");
const Bytes kCbcPlaintext = from_hex(
    "6bc1bee22e409f96e93d7e117393172aae2d8a571e03ac9c9eb76fac45af8e51"
    "30c81c46a35ce411e5fbc1191a0a52eff69f2445df4f9b17ad2b417be66c3710");

// NIST SP 800-38A, F.2.1 and F.2.5
const CbcCase kCbcCases[] = {
    {"Aes128", "2b7e151628aed2a6abf7158809cf4f3c",
     "7649abac8119b246cee98e9b12e9197d5086cb9b507219ee95db113a917678b2"
     "73bed6b8e3c1743b7116e69e222295163ff1caa1681fac09120eca307586e1a7"},
    {"Aes256", "603deb1015ca71be2b73aef0857d77811f352c073b6108d72d9810a30914dff4",
     "f58c4c04d6e5f1ba779eabfb5f7bfbd69cfc4e967edb808d679f777bc6702c7d"
     "39f23369a9d9bacfa530e26304231461b2eb05e2c39be9fcda6c19078c6a9d1b"},
};

// Runs `data` in place through the cipher, `step` bytes a call.
Bytes cbc_in_place(const Operation &cipher, Bytes data, uint32_t step) {
  TEE_CipherInit(cipher.get(), kCbcIv.data(), size_of(kCbcIv));
  Bytes out;
  for (uint32_t at = 0; at < data.size(); at += step) {
    const uint32_t n = std::min(step, size_of(data) - at);
    Bytes chunk(data.begin() + at, data.begin() + at + n);
    chunk.resize(n + 16);
    uint32_t len = size_of(chunk);
    EXPECT_EQ(TEE_CipherUpdate(cipher.get(), chunk.data(), n, chunk.data(), &len), TEE_SUCCESS);
    EXPECT_TRUE(len == n || step % 16 != 0);
    out.insert(out.end(), chunk.begin(), chunk.begin() + len);
  }
  uint32_t none = 0;
  EXPECT_EQ(TEE_CipherDoFinal(cipher.get(), nullptr, 0, nullptr, &none), TEE_SUCCESS);
  return out;
}

TEST_F(Crypto, CbcKnownAnswersInStepsOfAnySizeInPlace) {
  for (const CbcCase &c : kCbcCases) {
    const Key key = secret_key(TEE_TYPE_AES, from_hex(c.key));
    const Bytes ciphertext = from_hex(c.ciphertext);
    const Operation encrypt = make_operation(TEE_ALG_AES_CBC_NOPAD, TEE_MODE_ENCRYPT, 256, key);
    const Operation decrypt = make_operation(TEE_ALG_AES_CBC_NOPAD, TEE_MODE_DECRYPT, 256, key);
    for (const uint32_t step : {1u, 5u, 16u, 23u, 48u, 64u}) {
      SCOPED_TRACE(std::string(c.name) + ", step " + std::to_string(step));
      EXPECT_EQ(cbc_in_place(encrypt, kCbcPlaintext, step), ciphertext);
      EXPECT_EQ(cbc_in_place(decrypt, ciphertext, step), kCbcPlaintext);
    }
  }
}

TEST_F(Crypto, ShortBufferTellsTheSizeAndLeavesTheCipherAsItWas) {
  const Key key = secret_key(TEE_TYPE_AES, from_hex(kCbcCases[0].key));
  const Operation cipher = make_operation(TEE_ALG_AES_CBC_NOPAD, TEE_MODE_ENCRYPT, 128, key);
  TEE_CipherInit(cipher.get(), kCbcIv.data(), size_of(kCbcIv));
  Bytes out(64);
  uint32_t len = 0;
  const uint8_t *in = kCbcPlaintext.data();
  EXPECT_EQ(TEE_CipherUpdate(cipher.get(), in, 10, nullptr, &len), TEE_SUCCESS);
  EXPECT_EQ(len, 0u);
  EXPECT_EQ(TEE_CipherUpdate(cipher.get(), in + 10, 38, out.data(), &len), TEE_ERROR_SHORT_BUFFER);
  EXPECT_EQ(len, 48u);
  EXPECT_EQ(TEE_CipherUpdate(cipher.get(), in + 10, 38, out.data(), &len), TEE_SUCCESS);
  len = 15;
  EXPECT_EQ(TEE_CipherDoFinal(cipher.get(), in + 48, 16, out.data() + 48, &len),
            TEE_ERROR_SHORT_BUFFER);
  EXPECT_EQ(len, 16u);
  EXPECT_EQ(TEE_CipherDoFinal(cipher.get(), in + 48, 16, out.data() + 48, &len), TEE_SUCCESS);
  EXPECT_EQ(out, from_hex(kCbcCases[0].ciphertext));
}

struct GcmCase {
  const char *name, *key, *nonce, *aad, *plaintext, *ciphertext, *tag;
};

#define GCM_KEY "feffe9928665731c6d6a8f9467308308"
#define GCM_AAD "feedfacedeadbeeffeedfacedeadbeefabaddad2"
#define GCM_TEXT                                                     \
  "d9313225f88406e5a55909c5aff5269a86a7a9531534f7da2e4c303d8a318a72" \
  "1c3c0c95956809532fcf0e2449a6b525b16aedf5aa0de657ba637b39"
#define GCM_CIPHERTEXT                                               \
  "42831ec2217774244b7221b784d0d49ce3aa212f2c02a4e035c17e2329aca12e" \
  "21d514b25466931c7d8f6a5aac84aa051ba30b396a0aac973d58e091"

// McGrew and Viega, The Galois/Counter Mode of Operation, test cases 1 to 5
const GcmCase kGcmCases[] = {
    {"Nothing", "00000000000000000000000000000000", "000000000000000000000000", "", "", "",
     "58e2fccefa7e3061367f1d57a4e7455a"},
    {"OneBlock", "00000000000000000000000000000000", "000000000000000000000000", "",
     "00000000000000000000000000000000", "0388dace60b6a392f328c2b971b2fe78",
     "ab6e47d42cec13bdf53a67b21257bddf"},
    {"NoAad", GCM_KEY, "cafebabefacedbaddecaf888", "", GCM_TEXT "1aafd255",
     GCM_CIPHERTEXT "473f5985", "4d5c2af327cd64a62cf35abd2ba6fab4"},
    {"AadAndPartialBlock", GCM_KEY, "cafebabefacedbaddecaf888", GCM_AAD, GCM_TEXT, GCM_CIPHERTEXT,
     "5bc94fbc3221a5db94fae95ae7121a47"},
    {"ShortNonce", GCM_KEY, "cafebabefacedbad", GCM_AAD, GCM_TEXT,
     "61353b4c2806934a777ff51fa22a4755699b2a714fcdc6f83766e5f97b6c7423"
     "73806900e49f24b22b097544d4896b424989b5e1ebac0f07c23f4598",
     "3612d2e79e3b0785561be14aaca2fccb"},
};

struct Gcm {
  Operation operation;
  bool encrypts;
  Bytes nonce, aad, data, tag;

  Gcm(const GcmCase &c, uint32_t mode)
      : operation(
            make_operation(TEE_ALG_AES_GCM, mode, 128, secret_key(TEE_TYPE_AES, from_hex(c.key)))),
        encrypts(mode == TEE_MODE_ENCRYPT),
        nonce(from_hex(c.nonce)),
        aad(from_hex(c.aad)),
        data(from_hex(encrypts ? c.plaintext : c.ciphertext)),
        tag(from_hex(c.tag)) {}

  // In place; half of the data goes in with the update, the rest with the final call.
  TEE_Result run(uint32_t tag_bits = 128) {
    TEE_Result result = TEE_AEInit(operation.get(), nonce.data(), size_of(nonce), tag_bits, 0, 0);
    if (result != TEE_SUCCESS) return result;
    uint32_t len = size_of(data) / 2, rest_len = size_of(data) - len, tag_len = size_of(tag);
    uint8_t *rest = data.data() + len;
    TEE_AEUpdateAAD(operation.get(), aad.data(), size_of(aad));
    EXPECT_EQ(TEE_AEUpdate(operation.get(), data.data(), len, data.data(), &len), TEE_SUCCESS);
    if (!encrypts) {
      return TEE_AEDecryptFinal(operation.get(), rest, rest_len, rest, &rest_len, tag.data(),
                                tag_len);
    }
    result =
        TEE_AEEncryptFinal(operation.get(), rest, rest_len, rest, &rest_len, tag.data(), &tag_len);
    tag.resize(tag_len);
    return result;
  }
};

TEST_F(Crypto, GcmKnownAnswersInPlace) {
  for (const GcmCase &c : kGcmCases) {
    SCOPED_TRACE(c.name);
    Gcm encrypt(c, TEE_MODE_ENCRYPT), decrypt(c, TEE_MODE_DECRYPT);
    encrypt.tag.assign(16, 0);
    EXPECT_EQ(encrypt.run(), TEE_SUCCESS);
    EXPECT_EQ(encrypt.data, from_hex(c.ciphertext));
    EXPECT_EQ(encrypt.tag, from_hex(c.tag));
    EXPECT_EQ(decrypt.run(), TEE_SUCCESS);
    EXPECT_EQ(decrypt.data, from_hex(c.plaintext));
  }
}

TEST_F(Crypto, GcmRefusesWhatIsNotGenuine) {
  const std::pair<const char *, void (*)(Gcm &)> kForgeries[] = {
      {"Tag", [](Gcm &gcm) { gcm.tag[15] ^= 1; }},
      {"TagTruncated", [](Gcm &gcm) { gcm.tag.pop_back(); }},
      {"TagMissing", [](Gcm &gcm) { gcm.tag.clear(); }},
      {"TagTooLong", [](Gcm &gcm) { gcm.tag.push_back(0); }},
      {"Aad", [](Gcm &gcm) { gcm.aad[0] ^= 1; }},
      {"Ciphertext", [](Gcm &gcm) { gcm.data.back() ^= 0x80; }},
      {"Nonce", [](Gcm &gcm) { gcm.nonce[0] ^= 1; }},
  };
  for (const auto &[name, forge] : kForgeries) {
    Gcm gcm(kGcmCases[3], TEE_MODE_DECRYPT);
    forge(gcm);
    EXPECT_EQ(gcm.run(), TEE_ERROR_MAC_INVALID) << name;
  }
}

TEST_F(Crypto, GcmTagSizes) {
  const Bytes full = from_hex(kGcmCases[3].tag);
  for (const uint32_t bits : {88u, 96u, 100u, 120u, 128u, 136u}) {
    Gcm gcm(kGcmCases[3], TEE_MODE_ENCRYPT);
    if (bits < 96 || bits > 128 || bits % 8 != 0) {
      EXPECT_EQ(gcm.run(bits), TEE_ERROR_NOT_SUPPORTED);
      continue;
    }
    EXPECT_EQ(gcm.run(bits), TEE_SUCCESS);
    EXPECT_EQ(gcm.tag, Bytes(full.begin(), full.begin() + bits / 8));
    gcm.tag.pop_back();
    EXPECT_EQ(gcm.run(bits), TEE_ERROR_SHORT_BUFFER);
    EXPECT_EQ(gcm.tag.size(), bits / 8);
  }
}

// RFC 7515, appendix A.2
const Bytes kSignedDigest =
    from_hex("c88a34847b4ffb12a9326e540f144b3dcc4d5515f18701e7d6e0ee7866c9c705");
const Bytes kSignature = from_base64url(rfc7515_a2::kSignature);

TEE_Result verify(const Operation &operation, const Bytes &signature) {
  return TEE_AsymmetricVerifyDigest(operation.get(), nullptr, 0, kSignedDigest.data(), 32,
                                    signature.data(), size_of(signature));
}

TEST_F(Crypto, RsaSignatureKnownAnswerWithoutCrt) {
  const Key key = make_key(TEE_TYPE_RSA_KEYPAIR, 2048, rfc7515_private());
  const Operation sign = make_operation(TEE_ALG_RSASSA_PKCS1_V1_5_SHA256, TEE_MODE_SIGN, 2048, key);
  Bytes signature(256);
  uint32_t len = 255;
  const auto run = [&] {
    return TEE_AsymmetricSignDigest(sign.get(), nullptr, 0, kSignedDigest.data(), 32,
                                    signature.data(), &len);
  };
  EXPECT_EQ(run(), TEE_ERROR_SHORT_BUFFER);
  EXPECT_EQ(len, 256u);
  EXPECT_EQ(run(), TEE_SUCCESS);
  EXPECT_EQ(signature, kSignature);
}

TEST_F(Crypto, RsaVerificationRefusesWhatIsNotGenuine) {
  const Key key = make_key(TEE_TYPE_RSA_PUBLIC_KEY, 2048, rfc7515_public());
  const Operation operation =
      make_operation(TEE_ALG_RSASSA_PKCS1_V1_5_SHA256, TEE_MODE_VERIFY, 2048, key);
  EXPECT_EQ(verify(operation, kSignature), TEE_SUCCESS);
  Bytes flipped = kSignature, longer = kSignature, shorter = kSignature;
  flipped[100] ^= 1;
  longer.push_back(0);
  shorter.pop_back();
  for (const Bytes &forged : {flipped, longer, shorter, repeated(0xff, 256), Bytes()}) {
    EXPECT_EQ(verify(operation, forged), TEE_ERROR_SIGNATURE_INVALID);
  }
}

// RFC 7516, appendix A.2
TEST_F(Crypto, RsaDecryptionKnownAnswer) {
  const Key key = make_key(TEE_TYPE_RSA_KEYPAIR, 2048,
                           published_key(rfc7516_a2::kModulus, rfc7516_a2::kPrivateExponent));
  Bytes wrapped = from_base64url(rfc7516_a2::kEncryptedKey);
  const Operation decrypt = make_operation(TEE_ALG_RSAES_PKCS1_V1_5, TEE_MODE_DECRYPT, 2048, key);
  Bytes cek(32);
  uint32_t len = 31;
  const auto run = [&] {
    return TEE_AsymmetricDecrypt(decrypt.get(), nullptr, 0, wrapped.data(), size_of(wrapped),
                                 cek.data(), &len);
  };
  EXPECT_EQ(run(), TEE_ERROR_SHORT_BUFFER);
  EXPECT_EQ(len, 32u);
  EXPECT_EQ(run(), TEE_SUCCESS);
  const Bytes expected = from_hex(rfc7516_a2::kCek);
  EXPECT_EQ(cek, expected);

  // Bad padding is refused or answered with other bytes, as OpenSSL's version has it.
  wrapped[10] ^= 1;
  len = 32;
  EXPECT_TRUE(run() != TEE_SUCCESS || cek != expected);
  wrapped.pop_back();
  EXPECT_EQ(run(), TEE_ERROR_BAD_PARAMETERS);
}

TEST_F(Crypto, RsaEncryptsAsMuchAsThePaddingLeaves) {
  const Key pair = make_key(TEE_TYPE_RSA_KEYPAIR, 2048, rfc7515_private());
  const Operation encrypt = make_operation(TEE_ALG_RSAES_PKCS1_V1_5, TEE_MODE_ENCRYPT, 2048, pair);
  const Operation decrypt = make_operation(TEE_ALG_RSAES_PKCS1_V1_5, TEE_MODE_DECRYPT, 2048, pair);
  Bytes sealed(256), opened(256);
  uint32_t sealed_len = 255;
  const auto seal = [&](const Bytes &data) {
    return TEE_AsymmetricEncrypt(encrypt.get(), nullptr, 0, data.data(), size_of(data),
                                 sealed.data(), &sealed_len);
  };
  EXPECT_EQ(seal({}), TEE_ERROR_SHORT_BUFFER);
  EXPECT_EQ(sealed_len, 256u);
  EXPECT_EQ(seal(repeated(0, 246)), TEE_ERROR_BAD_PARAMETERS);
  for (const uint32_t size : {0u, 1u, 245u}) {
    uint32_t opened_len = 256;
    EXPECT_EQ(seal(repeated(0x5a, size)), TEE_SUCCESS);
    EXPECT_EQ(TEE_AsymmetricDecrypt(decrypt.get(), nullptr, 0, sealed.data(), 256, opened.data(),
                                    &opened_len),
              TEE_SUCCESS);
    EXPECT_EQ(Bytes(opened.begin(), opened.begin() + opened_len), repeated(0x5a, size));
  }
}

TEST_F(Crypto, UnsupportedOperations) {
  EXPECT_EQ(make_operation(0x10000010, TEE_MODE_ENCRYPT, 128), nullptr);
  EXPECT_EQ(make_operation(TEE_ALG_SHA256, TEE_MODE_MAC), nullptr);
  EXPECT_EQ(make_operation(TEE_ALG_AES_GCM, 64, 128), nullptr);
  EXPECT_EQ(make_operation(TEE_ALG_AES_GCM, TEE_MODE_ENCRYPT, 136), nullptr);
  EXPECT_EQ(make_operation(TEE_ALG_RSAES_PKCS1_V1_5, TEE_MODE_ENCRYPT, 8192), nullptr);
}

TEST_F(Crypto, MisusePanics) {
  const Key aes = secret_key(TEE_TYPE_AES, repeated(1, 16));
  const Key rsa = make_key(TEE_TYPE_RSA_PUBLIC_KEY, 2048, rfc7515_public());
  const Operation digest = make_operation(TEE_ALG_SHA256, TEE_MODE_DIGEST);
  const Operation keyless = make_operation(TEE_ALG_AES_CBC_NOPAD, TEE_MODE_ENCRYPT, 128);
  const Operation cbc = make_operation(TEE_ALG_AES_CBC_NOPAD, TEE_MODE_ENCRYPT, 128, aes);
  const Operation decrypt = make_operation(TEE_ALG_RSAES_PKCS1_V1_5, TEE_MODE_DECRYPT, 2048);
  const Operation encrypt = make_operation(TEE_ALG_RSAES_PKCS1_V1_5, TEE_MODE_ENCRYPT, 2048, rsa);
  const Operation small = make_operation(TEE_ALG_RSAES_PKCS1_V1_5, TEE_MODE_ENCRYPT, 1024);
  Bytes out(256);
  uint32_t len = 256;

  EXPECT_DEATH(TEE_DigestUpdate(cbc.get(), "", 0), "another class");
  EXPECT_DEATH(TEE_CipherInit(keyless.get(), kCbcIv.data(), 16), "no key");
  EXPECT_DEATH(TEE_CipherInit(cbc.get(), kCbcIv.data(), 15), "IV");
  EXPECT_DEATH(TEE_CipherUpdate(cbc.get(), "", 0, out.data(), &len), "not been started");
  EXPECT_DEATH(TEE_SetOperationKey(decrypt.get(), rsa.get()), "type");
  EXPECT_DEATH(TEE_SetOperationKey(keyless.get(), rsa.get()), "type");
  EXPECT_DEATH(TEE_SetOperationKey(small.get(), rsa.get()), "too big");
  EXPECT_DEATH(TEE_SetOperationKey(digest.get(), aes.get()), "no key");
  EXPECT_DEATH(TEE_SetOperationKey(keyless.get(), blank_key(TEE_TYPE_AES, 128).get()),
               "not initialized");
  EXPECT_DEATH(TEE_AsymmetricDecrypt(encrypt.get(), nullptr, 0, out.data(), 256, out.data(), &len),
               "another mode");

  TEE_CipherInit(cbc.get(), kCbcIv.data(), 16);
  EXPECT_DEATH(TEE_SetOperationKey(cbc.get(), aes.get()), "running");
  EXPECT_DEATH(TEE_CipherDoFinal(cbc.get(), "x", 1, out.data(), &len), "whole blocks");

  const TEE_OperationHandle stale = make_operation(TEE_ALG_SHA256, TEE_MODE_DIGEST).get();
  EXPECT_DEATH(TEE_FreeOperation(stale), "not an open operation");
}

TEST_F(Crypto, OperationsOutliveTheirKeyObjectsAndTakeNewKeys) {
  Key key = secret_key(TEE_TYPE_AES, repeated(9, 16));
  const Operation cipher = make_operation(TEE_ALG_AES_CBC_NOPAD, TEE_MODE_ENCRYPT, 256, key);
  key = secret_key(TEE_TYPE_AES, from_hex(kCbcCases[1].key));
  EXPECT_EQ(TEE_SetOperationKey(cipher.get(), key.get()), TEE_SUCCESS);
  key.reset();
  EXPECT_EQ(cbc_in_place(cipher, kCbcPlaintext, 16), from_hex(kCbcCases[1].ciphertext));
  EXPECT_EQ(TEE_SetOperationKey(cipher.get(), TEE_HANDLE_NULL), TEE_SUCCESS);
  EXPECT_DEATH(TEE_CipherInit(cipher.get(), kCbcIv.data(), 16), "no key");
}

// Encrypts one block; a call that fails is made once more.
TEST_F(Crypto, EveryCallCanBeMadeToFailOnceWithoutEffect) {
  unsigned num_points = 0;
  for (bool fired = true; fired; ++num_points) {
    device_.fail({}, Fault::kCrypto, num_points + 1, false, TEE_ERROR_BUSY);
    const auto twice = [](auto &&call) {
      const TEE_Result result = call();
      EXPECT_EQ(result == TEE_ERROR_BUSY ? call() : result, TEE_SUCCESS);
    };
    TEE_ObjectHandle key = TEE_HANDLE_NULL;
    TEE_OperationHandle cipher = TEE_HANDLE_NULL;
    Bytes block(kCbcPlaintext.begin(), kCbcPlaintext.begin() + 16);
    uint32_t len = 16, none = 0;
    twice([&] { return TEE_AllocateTransientObject(TEE_TYPE_AES, 128, &key); });
    twice([&] { return populate(key, {{TEE_ATTR_SECRET_VALUE, from_hex(kCbcCases[0].key)}}); });
    twice([&] {
      return TEE_AllocateOperation(&cipher, TEE_ALG_AES_CBC_NOPAD, TEE_MODE_ENCRYPT, 128);
    });
    twice([&] { return TEE_SetOperationKey(cipher, key); });
    TEE_CipherInit(cipher, kCbcIv.data(), 16);
    twice([&] { return TEE_CipherUpdate(cipher, block.data(), 16, block.data(), &len); });
    twice([&] { return TEE_CipherDoFinal(cipher, nullptr, 0, nullptr, &none); });
    fired = device_.fault_report().fired;
    EXPECT_EQ(block, from_hex("7649abac8119b246cee98e9b12e9197d"));
    TEE_FreeOperation(cipher);
    TEE_FreeTransientObject(key);
    EXPECT_EQ(inside_.stats().open_objects + inside_.stats().open_operations, 0u);
  }
  EXPECT_EQ(num_points, 7u);  // six calls, and the run that none of them spoiled
}

}  // namespace
