// SPDX-License-Identifier: BSD-2-Clause
#include <openssl/crypto.h>
#include <openssl/rand.h>

#include <algorithm>
#include <iterator>
#include <span>

#include "error.h"
#include "object.h"
#include "running.h"

namespace tee {

namespace {

struct KeyType {
  uint32_t type;
  uint32_t min_size;  // bits
  uint32_t max_size;
  uint32_t step;
};

// Table 5-9, as far as OpenSSL goes.
const KeyType kKeyTypes[] = {
    {TEE_TYPE_AES, 128, 256, 64},
    {TEE_TYPE_HMAC_SHA256, 192, 1024, 8},
    {TEE_TYPE_RSA_PUBLIC_KEY, kMinRsaSize, kMaxRsaSize, 8},
    {TEE_TYPE_RSA_KEYPAIR, kMinRsaSize, kMaxRsaSize, 8},
};

const uint32_t kPublicAttributes[] = {TEE_ATTR_RSA_MODULUS, TEE_ATTR_RSA_PUBLIC_EXPONENT};
const uint32_t kCrtAttributes[] = {TEE_ATTR_RSA_PRIME1, TEE_ATTR_RSA_PRIME2, TEE_ATTR_RSA_EXPONENT1,
                                   TEE_ATTR_RSA_EXPONENT2, TEE_ATTR_RSA_COEFFICIENT};

template <size_t N>
bool is_one_of(uint32_t id, const uint32_t (&ids)[N]) {
  return std::find(std::begin(ids), std::end(ids), id) != std::end(ids);
}

template <size_t N>
size_t count_of(const Attributes &attributes, const uint32_t (&ids)[N]) {
  return static_cast<size_t>(std::count_if(std::begin(ids), std::end(ids),
                                           [&](uint32_t id) { return attributes.contains(id); }));
}

bool is_rsa(uint32_t type) {
  return type == TEE_TYPE_RSA_PUBLIC_KEY || type == TEE_TYPE_RSA_KEYPAIR;
}

bool belongs_to(uint32_t id, uint32_t type) {
  if (!is_rsa(type)) return id == TEE_ATTR_SECRET_VALUE;
  if (is_one_of(id, kPublicAttributes)) return true;
  return type == TEE_TYPE_RSA_KEYPAIR &&
         (id == TEE_ATTR_RSA_PRIVATE_EXPONENT || is_one_of(id, kCrtAttributes));
}

bool is_complete(const Attributes &attributes, uint32_t type) {
  if (!is_rsa(type)) return attributes.contains(TEE_ATTR_SECRET_VALUE);
  const size_t num_crt = count_of(attributes, kCrtAttributes);
  return count_of(attributes, kPublicAttributes) == std::size(kPublicAttributes) &&
         (type == TEE_TYPE_RSA_PUBLIC_KEY || attributes.contains(TEE_ATTR_RSA_PRIVATE_EXPONENT)) &&
         (num_crt == 0 || num_crt == std::size(kCrtAttributes));
}

// What does not fit the object's type is a programmer's error.
Attributes::Value checked_value(const TEE_Attribute &attribute, const __TEE_ObjectHandle &object,
                                const char *call) {
  if (!belongs_to(attribute.attributeID, object.type)) {
    panic(call, "attribute of another object type");
  }
  const auto *bytes = static_cast<const uint8_t *>(attribute.content.ref.buffer);
  const TEE_LengthType len = attribute.content.ref.length;
  if (bytes == nullptr && len != 0) panic(call, "attribute is NULL");
  const Attributes::Value value(bytes, len);
  const uint64_t size = is_rsa(object.type) ? num_bits(value) : uint64_t{8} * len;
  if (size > object.max_size) panic(call, "attribute too big for the object");
  return value;
}

void take_attributes(__TEE_ObjectHandle &object, std::span<const TEE_Attribute> given,
                     const char *call) {
  size_t total_len = 0;
  for (const TEE_Attribute &attribute : given) {
    total_len += checked_value(attribute, object, call).size();
  }
  object.attributes.reset(total_len);
  for (const TEE_Attribute &attribute : given) {
    const auto *bytes = static_cast<const uint8_t *>(attribute.content.ref.buffer);
    if (!object.attributes.add(attribute.attributeID, {bytes, attribute.content.ref.length})) {
      panic(call, "attribute given twice");
    }
  }
  if (!is_complete(object.attributes, object.type)) panic(call, "mandatory attribute missing");
}

// Makes a usable key of the attributes; false when their values cannot be one.
bool set_key(__TEE_ObjectHandle &object) {
  if (is_rsa(object.type)) {
    object.rsa = import_rsa_key(object.attributes);
    if (object.rsa == nullptr) return false;
    object.size = num_bits(object.attributes.at(TEE_ATTR_RSA_MODULUS));
  } else {
    const auto size = 8 * static_cast<uint32_t>(object.attributes.at(TEE_ATTR_SECRET_VALUE).size());
    if (!key_size_supported(object.type, size)) return false;
    object.size = size;
  }
  object.handle_flags |= TEE_HANDLE_FLAG_INITIALIZED;
  return true;
}

__TEE_ObjectHandle &checked_blank_object(TEE_ObjectHandle handle, const char *call) {
  __TEE_ObjectHandle &object = checked_object(handle, call);
  if (object.persistent) panic(call, "object is persistent");
  if ((object.handle_flags & TEE_HANDLE_FLAG_INITIALIZED) != 0) {
    panic(call, "object is initialized already");
  }
  return object;
}

std::vector<uint8_t> public_exponent_of(const TEE_Attribute *params, uint32_t paramCount,
                                        const char *call) {
  if (paramCount == 0) return {};
  if (paramCount > 1 || params->attributeID != TEE_ATTR_RSA_PUBLIC_EXPONENT) {
    panic(call, "parameter that this key type does not have");
  }
  const auto *bytes = static_cast<const uint8_t *>(params->content.ref.buffer);
  return {bytes, bytes + params->content.ref.length};
}

TEE_Result generate_pair(__TEE_ObjectHandle &object, uint32_t size,
                         const std::vector<uint8_t> &public_exponent) {
  SharedKey pair = generate_rsa_key(size, public_exponent);
  if (pair == nullptr) return TEE_ERROR_BAD_PARAMETERS;
  export_rsa_key(*pair, &object.attributes);
  object.rsa = std::move(pair);
  object.size = size;
  object.handle_flags |= TEE_HANDLE_FLAG_INITIALIZED;
  return TEE_SUCCESS;
}

TEE_Result generate_secret(__TEE_ObjectHandle &object, uint32_t size) {
  std::vector<uint8_t> secret(size / 8);
  if (RAND_priv_bytes_ex(nullptr, secret.data(), secret.size(), 0) != 1) return TEE_ERROR_GENERIC;
  object.attributes.reset(secret.size());
  object.attributes.add(TEE_ATTR_SECRET_VALUE, secret);
  OPENSSL_cleanse(secret.data(), secret.size());
  return set_key(object) ? TEE_SUCCESS : TEE_ERROR_GENERIC;
}

}  // namespace

__TEE_ObjectHandle &checked_object(TEE_ObjectHandle handle, const char *call) {
  if (!open_handles(current_instance()).objects.contains(handle)) {
    panic(call, "not an open object handle");
  }
  return *handle;
}

TEE_ObjectHandle open_handle(std::unique_ptr<__TEE_ObjectHandle> object) {
  open_handles(current_instance()).objects.insert(object.get());
  return object.release();
}

void close_handle(TEE_ObjectHandle handle) {
  open_handles(current_instance()).objects.erase(handle);
  delete handle;
}

TEE_Result closed_if_corrupt(TEE_ObjectHandle handle, TEE_Result result) {
  if (result == TEE_ERROR_CORRUPT_OBJECT && handle->persistent) close_handle(handle);
  return result;
}

bool key_size_supported(uint32_t type, uint32_t size) {
  return std::any_of(std::begin(kKeyTypes), std::end(kKeyTypes), [&](const KeyType &key) {
    return key.type == type && size >= key.min_size && size <= key.max_size && size % key.step == 0;
  });
}

}  // namespace tee

using namespace tee;

TEE_Result TEE_GetObjectInfo1(TEE_ObjectHandle object, TEE_ObjectInfo *objectInfo) {
  const __TEE_ObjectHandle &known = checked_object(object, __func__);
  const Fault kind = known.persistent ? Fault::kStorage : Fault::kCrypto;
  if (TEE_Result code; fault_due(kind, __func__, TEE_ERROR_CORRUPT_OBJECT, &code)) {
    return closed_if_corrupt(object, code);
  }

  *objectInfo = {
      .objectType = known.type,
      .objectSize = known.size,
      .maxObjectSize = known.max_size,
      .objectUsage = known.usage,
      .dataSize = known.persistent ? known.persistent->data_size() : 0,
      .dataPosition = known.persistent ? known.persistent->position() : 0,
      .handleFlags = known.handle_flags,
  };
  return TEE_SUCCESS;
}

TEE_Result TEE_GetObjectBufferAttribute(TEE_ObjectHandle object, uint32_t attributeID, void *buffer,
                                        TEE_LengthType *size) {
  const __TEE_ObjectHandle &known = checked_object(object, __func__);
  if ((known.handle_flags & TEE_HANDLE_FLAG_INITIALIZED) == 0) {
    panic(__func__, "object is not initialized");
  }
  if ((attributeID & TEE_ATTR_FLAG_VALUE) != 0) panic(__func__, "not a buffer attribute");
  if (TEE_Result code; fault_due(Fault::kCrypto, __func__, TEE_ERROR_CORRUPT_OBJECT, &code)) {
    return code;
  }

  const auto value = known.attributes.find(attributeID);
  if (!value) return TEE_ERROR_ITEM_NOT_FOUND;
  const bool fits = value->size() <= *size;
  *size = static_cast<TEE_LengthType>(value->size());
  if (!fits) return TEE_ERROR_SHORT_BUFFER;
  std::ranges::copy(*value, static_cast<uint8_t *>(buffer));
  return TEE_SUCCESS;
}

TEE_Result TEE_AllocateTransientObject(TEE_ObjectType objectType, uint32_t maxObjectSize,
                                       TEE_ObjectHandle *object) {
  *object = TEE_HANDLE_NULL;
  if (TEE_Result code; fault_due(Fault::kCrypto, __func__, TEE_ERROR_OUT_OF_MEMORY, &code)) {
    return code;
  }
  if (!key_size_supported(objectType, maxObjectSize)) return TEE_ERROR_NOT_SUPPORTED;

  return result_of([&] {
    auto blank = std::make_unique<__TEE_ObjectHandle>();
    blank->type = objectType;
    blank->max_size = maxObjectSize;
    *object = open_handle(std::move(blank));
    return TEE_SUCCESS;
  });
}

void TEE_FreeTransientObject(TEE_ObjectHandle object) {
  if (object == TEE_HANDLE_NULL) return;
  if (checked_object(object, __func__).persistent) panic(__func__, "object is persistent");
  close_handle(object);
}

void TEE_InitRefAttribute(TEE_Attribute *attr, uint32_t attributeID, const void *buffer,
                          TEE_LengthType length) {
  if ((attributeID & TEE_ATTR_FLAG_VALUE) != 0) panic(__func__, "not a buffer attribute");
  attr->attributeID = attributeID;
  attr->content.ref.buffer = const_cast<void *>(buffer);
  attr->content.ref.length = length;
}

TEE_Result TEE_PopulateTransientObject(TEE_ObjectHandle object, const TEE_Attribute *attrs,
                                       uint32_t attrCount) {
  __TEE_ObjectHandle &blank = checked_blank_object(object, __func__);
  if (TEE_Result code; fault_due(Fault::kCrypto, __func__, TEE_ERROR_BAD_PARAMETERS, &code)) {
    return code;
  }
  const char *const call = __func__;
  const TEE_Result result = result_of([&] {
    take_attributes(blank, {attrs, attrCount}, call);
    return set_key(blank) ? TEE_SUCCESS : TEE_ERROR_BAD_PARAMETERS;
  });
  if (result != TEE_SUCCESS) blank.attributes.reset(0);
  return result;
}

TEE_Result TEE_GenerateKey(TEE_ObjectHandle object, uint32_t keySize, const TEE_Attribute *params,
                           uint32_t paramCount) {
  __TEE_ObjectHandle &blank = checked_blank_object(object, __func__);
  if (keySize > blank.max_size) panic(__func__, "key too big for the object");
  if (!key_size_supported(blank.type, keySize)) panic(__func__, "no such key size");
  if (blank.type == TEE_TYPE_RSA_PUBLIC_KEY) panic(__func__, "a public key is not generated");
  if (TEE_Result code; fault_due(Fault::kCrypto, __func__, TEE_ERROR_GENERIC, &code)) return code;

  const char *const call = __func__;
  return result_of([&] {
    if (blank.type == TEE_TYPE_RSA_KEYPAIR) {
      return generate_pair(blank, keySize, public_exponent_of(params, paramCount, call));
    }
    if (paramCount != 0) panic(call, "parameter that this key type does not have");
    return generate_secret(blank, keySize);
  });
}
