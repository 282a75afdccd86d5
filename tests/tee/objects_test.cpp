// SPDX-License-Identifier: BSD-2-Clause
#include "crypto_support.h"

namespace {

using Objects = Crypto;

TEST_F(Objects, UnsupportedTypesAndSizes) {
  const std::pair<uint32_t, uint32_t> kUnsupported[] = {
      {TEE_TYPE_AES, 160},         {TEE_TYPE_HMAC_SHA256, 184},
      {TEE_TYPE_HMAC_SHA256, 196}, {TEE_TYPE_AES, 320},
      {TEE_TYPE_AES, 0},           {TEE_TYPE_HMAC_SHA256, 1032},
      {TEE_TYPE_RSA_KEYPAIR, 504}, {TEE_TYPE_RSA_KEYPAIR, 4104},
      {TEE_TYPE_DATA, 0},
  };
  for (const auto &[type, size] : kUnsupported) EXPECT_EQ(blank_key(type, size), nullptr) << size;
}

TEST_F(Objects, ValuesThatMakeNoKeyAreRefusedAndLeaveTheObjectBlank) {
  const AttributeList sound = rfc7515_private();
  struct {
    const char *name;
    uint32_t id;
    Bytes value;
  } const kCases[] = {
      {"TinyModulus", TEE_ATTR_RSA_MODULUS, Bytes(63, 0xff)},
      {"ZeroModulus", TEE_ATTR_RSA_MODULUS, Bytes(256)},
      {"ExponentOne", TEE_ATTR_RSA_PUBLIC_EXPONENT, {1}},
      {"EvenExponent", TEE_ATTR_RSA_PUBLIC_EXPONENT, {1, 0, 0}},
      {"HugeExponent", TEE_ATTR_RSA_PUBLIC_EXPONENT, Bytes(256, 0xff)},
  };
  for (const auto &c : kCases) {
    SCOPED_TRACE(c.name);
    AttributeList damaged = sound;
    std::ranges::find(damaged, c.id, &AttributeList::value_type::first)->second = c.value;
    const Key key = blank_key(TEE_TYPE_RSA_KEYPAIR, 2048);
    EXPECT_EQ(populate(key.get(), damaged), TEE_ERROR_BAD_PARAMETERS);
    EXPECT_EQ(populate(key.get(), sound), TEE_SUCCESS);  // of a key that has a value it panics
  }
  for (const auto &[type, len] : {std::pair(TEE_TYPE_AES, 17), {TEE_TYPE_HMAC_SHA256, 23}}) {
    const Key key = blank_key(type, 256);
    EXPECT_EQ(populate(key.get(), {{TEE_ATTR_SECRET_VALUE, Bytes(static_cast<size_t>(len))}}),
              TEE_ERROR_BAD_PARAMETERS);
  }
}

TEST_F(Objects, MisusePanics) {
  const Key pair = make_key(TEE_TYPE_RSA_KEYPAIR, 2048, rfc7515_private());
  const Key blank = blank_key(TEE_TYPE_RSA_KEYPAIR, 2048);
  const Key public_half = blank_key(TEE_TYPE_RSA_PUBLIC_KEY, 2048);
  const Key aes = blank_key(TEE_TYPE_AES, 128);
  const TEE_ObjectHandle stale = blank_key(TEE_TYPE_AES, 128).get();
  AttributeList some_crt = rfc7515_private(), twice = rfc7515_private();
  some_crt.emplace_back(TEE_ATTR_RSA_PRIME1, Bytes(128, 0xff));
  twice.push_back(twice.front());
  uint32_t len = 0;

  EXPECT_EQ(TEE_GetObjectBufferAttribute(pair.get(), TEE_ATTR_RSA_PRIME1, nullptr, &len),
            TEE_ERROR_ITEM_NOT_FOUND);
  EXPECT_DEATH(TEE_FreeTransientObject(stale), "not an open object");
  EXPECT_DEATH(populate(pair.get(), rfc7515_private()), "initialized already");
  EXPECT_DEATH(populate(aes.get(), {{TEE_ATTR_SECRET_VALUE, Bytes(32)}}), "too big");
  EXPECT_DEATH(populate(aes.get(), {}), "missing");
  EXPECT_DEATH(populate(blank.get(), rfc7515_public()), "missing");
  EXPECT_DEATH(populate(blank.get(), some_crt), "missing");
  EXPECT_DEATH(populate(blank.get(), twice), "twice");
  EXPECT_DEATH(populate(public_half.get(), rfc7515_private()), "another object type");
  EXPECT_DEATH(TEE_GenerateKey(blank.get(), 4096, nullptr, 0), "too big");
  EXPECT_DEATH(TEE_GenerateKey(blank.get(), 2047, nullptr, 0), "no such key size");
  EXPECT_DEATH(TEE_GenerateKey(public_half.get(), 2048, nullptr, 0), "public key");
  EXPECT_DEATH(TEE_GetObjectBufferAttribute(blank.get(), TEE_ATTR_RSA_MODULUS, nullptr, &len),
               "not initialized");
}

}  // namespace
