// SPDX-License-Identifier: BSD-2-Clause
/// Keys and operations for tests that call the Internal Core API, and published RSA keys.
#ifndef CRYPTO_SUPPORT_H
#define CRYPTO_SUPPORT_H

#include <gtest/gtest.h>
#include <tee_internal_api.h>
#include <tee_test.h>

#include <algorithm>
#include <memory>
#include <string>
#include <type_traits>
#include <utility>
#include <vector>

#include "../support/published_vectors.h"
#include "common/encoding.h"

using Bytes = std::vector<uint8_t>;

inline Bytes as_bytes(const std::string &text) {
  return {text.begin(), text.end()};
}

inline Bytes from_hex(const std::string &hex) {
  return as_bytes(tools::hex_decode(hex).value());
}

inline Bytes from_base64url(const std::string &text) {
  return as_bytes(tools::base64url_decode(text).value());
}

inline uint32_t size_of(const Bytes &bytes) {
  return static_cast<uint32_t>(bytes.size());
}

struct HandleCloser {
  void operator()(TEE_ObjectHandle object) const { TEE_FreeTransientObject(object); }
  void operator()(TEE_OperationHandle operation) const { TEE_FreeOperation(operation); }
};
using Key = std::unique_ptr<std::remove_pointer_t<TEE_ObjectHandle>, HandleCloser>;
using Operation = std::unique_ptr<std::remove_pointer_t<TEE_OperationHandle>, HandleCloser>;

using AttributeList = std::vector<std::pair<uint32_t, Bytes>>;

inline TEE_Result populate(TEE_ObjectHandle object, const AttributeList &attributes) {
  std::vector<TEE_Attribute> refs(attributes.size());
  for (size_t i = 0; i < refs.size(); ++i) {
    const auto &[id, value] = attributes[i];
    TEE_InitRefAttribute(&refs[i], id, value.data(), size_of(value));
  }
  return TEE_PopulateTransientObject(object, refs.data(), static_cast<uint32_t>(refs.size()));
}

/// NULL when there is no such key.
inline Key blank_key(uint32_t type, uint32_t max_size) {
  TEE_ObjectHandle object = TEE_HANDLE_NULL;
  TEE_AllocateTransientObject(type, max_size, &object);
  return Key(object);
}

inline Key make_key(uint32_t type, uint32_t max_size, const AttributeList &attributes) {
  Key key = blank_key(type, max_size);
  EXPECT_EQ(populate(key.get(), attributes), TEE_SUCCESS);
  return key;
}

inline Key secret_key(uint32_t type, const Bytes &secret) {
  return make_key(type, 8 * size_of(secret), {{TEE_ATTR_SECRET_VALUE, secret}});
}

inline Operation make_operation(uint32_t algorithm, uint32_t mode, uint32_t max_key_size = 0,
                                const Key &key = nullptr) {
  TEE_OperationHandle operation = TEE_HANDLE_NULL;
  TEE_AllocateOperation(&operation, algorithm, mode, max_key_size);
  if (key != nullptr) TEE_SetOperationKey(operation, key.get());
  return Operation(operation);
}

/// The published key pair, without CRT components.
inline AttributeList rfc7515_private() {
  return {{TEE_ATTR_RSA_MODULUS, from_base64url(rfc7515_a2::kModulus)},
          {TEE_ATTR_RSA_PUBLIC_EXPONENT, {1, 0, 1}},
          {TEE_ATTR_RSA_PRIVATE_EXPONENT, from_base64url(rfc7515_a2::kPrivateExponent)}};
}

inline AttributeList rfc7515_public() {
  AttributeList key = rfc7515_private();
  key.pop_back();
  return key;
}

class Crypto : public testing::Test {
 protected:
  tee::test::Device device_;
  tee::test::InsideTa inside_{device_};
};

#endif
