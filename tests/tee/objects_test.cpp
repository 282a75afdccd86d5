// SPDX-License-Identifier: BSD-2-Clause
#include <gtest/gtest.h>

#include "crypto_support.h"

namespace {

using tee::test::Device;
using tee::test::InsideTa;

class Objects : public ::testing::Test {
 protected:
  Device device_;
  InsideTa inside_{device_};
};

const uint32_t kRsaIds[] = {TEE_ATTR_RSA_MODULUS,          TEE_ATTR_RSA_PUBLIC_EXPONENT,
                            TEE_ATTR_RSA_PRIVATE_EXPONENT, TEE_ATTR_RSA_PRIME1,
                            TEE_ATTR_RSA_PRIME2,           TEE_ATTR_RSA_EXPONENT1,
                            TEE_ATTR_RSA_EXPONENT2,        TEE_ATTR_RSA_COEFFICIENT};

Bytes attribute(const Key &key, uint32_t id) {
  Bytes value(512);
  uint32_t len = size_of(value);
  EXPECT_EQ(TEE_GetObjectBufferAttribute(key.get(), id, value.data(), &len), TEE_SUCCESS);
  value.resize(len);
  return value;
}

TEE_ObjectInfo info(const Key &key) {
  TEE_ObjectInfo found;
  EXPECT_EQ(TEE_GetObjectInfo1(key.get(), &found), TEE_SUCCESS);
  return found;
}

TEST_F(Objects, SupportedTypesAndSizes) {
  const std::pair<uint32_t, uint32_t> kSupported[] = {
      {TEE_TYPE_AES, 128},          {TEE_TYPE_AES, 256},         {TEE_TYPE_HMAC_SHA256, 128},
      {TEE_TYPE_HMAC_SHA256, 1024}, {TEE_TYPE_RSA_KEYPAIR, 512}, {TEE_TYPE_RSA_PUBLIC_KEY, 4096},
  };
  const std::pair<uint32_t, uint32_t> kUnsupported[] = {
      {TEE_TYPE_AES, 160},         {TEE_TYPE_HMAC_SHA256, 120},  {TEE_TYPE_HMAC_SHA256, 129},
      {TEE_TYPE_RSA_KEYPAIR, 504}, {TEE_TYPE_RSA_KEYPAIR, 4104}, {TEE_TYPE_DATA, 128},
  };
  for (const auto &[type, size] : kSupported) EXPECT_NE(blank_key(type, size), nullptr) << size;
  for (const auto &[type, size] : kUnsupported) EXPECT_EQ(blank_key(type, size), nullptr) << size;
}

TEST_F(Objects, InfoTellsSizesAndWhetherAKeyIsSet) {
  const Key key = blank_key(TEE_TYPE_RSA_PUBLIC_KEY, 4096);
  EXPECT_EQ(info(key).objectSize, 0u);
  EXPECT_EQ(info(key).handleFlags, 0u);
  ASSERT_EQ(populate(key.get(), rfc7515_public()), TEE_SUCCESS);
  EXPECT_EQ(info(key).objectType, TEE_TYPE_RSA_PUBLIC_KEY);
  EXPECT_EQ(info(key).objectSize, 2048u);
  EXPECT_EQ(info(key).maxObjectSize, 4096u);
  EXPECT_EQ(info(key).handleFlags, TEE_HANDLE_FLAG_INITIALIZED);
}

TEST_F(Objects, PopulatedAttributesReadBackAsTheyCame) {
  const Key pair = make_key(TEE_TYPE_RSA_KEYPAIR, 2048, rfc7515_private());
  for (const auto &[id, value] : rfc7515_private()) EXPECT_EQ(attribute(pair, id), value);
  Bytes value(255);
  uint32_t len = size_of(value);
  EXPECT_EQ(TEE_GetObjectBufferAttribute(pair.get(), TEE_ATTR_RSA_PRIME1, value.data(), &len),
            TEE_ERROR_ITEM_NOT_FOUND);
  EXPECT_EQ(TEE_GetObjectBufferAttribute(pair.get(), TEE_ATTR_RSA_MODULUS, value.data(), &len),
            TEE_ERROR_SHORT_BUFFER);
  EXPECT_EQ(len, 256u);
}

AttributeList attributes_of(const Key &pair) {
  AttributeList list;
  for (const uint32_t id : kRsaIds) list.emplace_back(id, attribute(pair, id));
  return list;
}

TEST_F(Objects, GeneratedPairsCanBeRebuiltFromTheirAttributes) {
  for (const uint32_t size : {512u, 1024u}) {
    const Key made = blank_key(TEE_TYPE_RSA_KEYPAIR, 2048);
    ASSERT_EQ(TEE_GenerateKey(made.get(), size, nullptr, 0), TEE_SUCCESS);
    EXPECT_EQ(info(made).objectSize, size);
    EXPECT_EQ(attribute(made, TEE_ATTR_RSA_PUBLIC_EXPONENT), Bytes({1, 0, 1}));
    for (const auto &[id, value] : attributes_of(made)) EXPECT_NE(value.front(), 0);

    const Key rebuilt = make_key(TEE_TYPE_RSA_KEYPAIR, size, attributes_of(made));
    const uint32_t algorithm = TEE_ALG_RSASSA_PKCS1_V1_5_SHA256;
    const Operation sign = make_operation(algorithm, TEE_MODE_SIGN, size, rebuilt);
    const Operation verify = make_operation(algorithm, TEE_MODE_VERIFY, size, made);
    const Bytes digest(32, 7);
    Bytes signature(size / 8);
    uint32_t len = size_of(signature);
    EXPECT_EQ(
        TEE_AsymmetricSignDigest(sign.get(), nullptr, 0, digest.data(), 32, signature.data(), &len),
        TEE_SUCCESS);
    EXPECT_EQ(TEE_AsymmetricVerifyDigest(verify.get(), nullptr, 0, digest.data(), 32,
                                         signature.data(), len),
              TEE_SUCCESS);
  }
}

TEST_F(Objects, GeneratedSecretsHaveTheirSize) {
  const Key key = blank_key(TEE_TYPE_AES, 256);
  ASSERT_EQ(TEE_GenerateKey(key.get(), 192, nullptr, 0), TEE_SUCCESS);
  EXPECT_EQ(attribute(key, TEE_ATTR_SECRET_VALUE).size(), 24u);
  EXPECT_EQ(info(key).objectSize, 192u);
}

TEST_F(Objects, ValuesThatMakeNoKeyAreRefusedAndLeaveTheObjectBlank) {
  Bytes even = rfc7515_public()[0].second;
  even.back() ^= 1;
  struct {
    const char *name;
    uint32_t id;
    Bytes value;
  } const kCases[] = {
      {"EmptyModulus", TEE_ATTR_RSA_MODULUS, {}},
      {"TinyModulus", TEE_ATTR_RSA_MODULUS, Bytes(63, 0xff)},
      {"EvenModulus", TEE_ATTR_RSA_MODULUS, even},
      {"ZeroModulus", TEE_ATTR_RSA_MODULUS, Bytes(256)},
      {"ExponentOne", TEE_ATTR_RSA_PUBLIC_EXPONENT, {1}},
      {"EvenExponent", TEE_ATTR_RSA_PUBLIC_EXPONENT, {1, 0, 0}},
      {"HugeExponent", TEE_ATTR_RSA_PUBLIC_EXPONENT, Bytes(256, 0xff)},
      {"EmptyPrivateExponent", TEE_ATTR_RSA_PRIVATE_EXPONENT, {}},
      {"ForeignPrime", TEE_ATTR_RSA_PRIME2, Bytes(64, 0xff)},
  };
  const Key made = blank_key(TEE_TYPE_RSA_KEYPAIR, 1024);
  ASSERT_EQ(TEE_GenerateKey(made.get(), 1024, nullptr, 0), TEE_SUCCESS);
  for (const auto &c : kCases) {
    SCOPED_TRACE(c.name);
    AttributeList list = attributes_of(made);
    for (auto &[id, value] : list) {
      if (id == c.id) value = c.value;
    }
    const Key key = blank_key(TEE_TYPE_RSA_KEYPAIR, 2048);
    EXPECT_EQ(populate(key.get(), list), TEE_ERROR_BAD_PARAMETERS);
    EXPECT_EQ(info(key).handleFlags, 0u);
    EXPECT_EQ(populate(key.get(), attributes_of(made)), TEE_SUCCESS);
  }
  const Key aes = blank_key(TEE_TYPE_AES, 256);
  EXPECT_EQ(populate(aes.get(), {{TEE_ATTR_SECRET_VALUE, Bytes(17)}}), TEE_ERROR_BAD_PARAMETERS);
}

TEST_F(Objects, MisusePanics) {
  const Key pair = make_key(TEE_TYPE_RSA_KEYPAIR, 2048, rfc7515_private());
  const Key blank = blank_key(TEE_TYPE_RSA_KEYPAIR, 1024);
  const Key aes = blank_key(TEE_TYPE_AES, 128);
  AttributeList some_crt = rfc7515_private();
  some_crt.emplace_back(TEE_ATTR_RSA_PRIME1, Bytes(128, 0xff));
  AttributeList twice = rfc7515_private();
  twice.push_back(twice.front());
  uint32_t len = 0;

  EXPECT_DEATH(populate(pair.get(), rfc7515_private()), "initialized already");
  EXPECT_DEATH(populate(blank.get(), rfc7515_private()), "too big");
  EXPECT_DEATH(populate(aes.get(), {{TEE_ATTR_SECRET_VALUE, Bytes(32)}}), "too big");
  EXPECT_DEATH(populate(aes.get(), {}), "missing");
  EXPECT_DEATH(make_key(TEE_TYPE_RSA_KEYPAIR, 2048, rfc7515_public()), "missing");
  EXPECT_DEATH(make_key(TEE_TYPE_RSA_KEYPAIR, 2048, some_crt), "missing");
  EXPECT_DEATH(make_key(TEE_TYPE_RSA_KEYPAIR, 2048, twice), "twice");
  EXPECT_DEATH(make_key(TEE_TYPE_RSA_PUBLIC_KEY, 2048, rfc7515_private()), "another object type");
  EXPECT_DEATH(TEE_GenerateKey(blank.get(), 2048, nullptr, 0), "too big");
  EXPECT_DEATH(TEE_GetObjectBufferAttribute(blank.get(), TEE_ATTR_RSA_MODULUS, nullptr, &len),
               "not initialized");

  const TEE_ObjectHandle stale = blank_key(TEE_TYPE_AES, 128).get();
  EXPECT_DEATH(TEE_FreeTransientObject(stale), "not an open object");
}

}  // namespace
