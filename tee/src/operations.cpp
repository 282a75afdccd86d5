// SPDX-License-Identifier: BSD-2-Clause
#include <openssl/core_names.h>
#include <openssl/params.h>

#include <algorithm>
#include <iterator>
#include <new>

#include "error.h"
#include "object.h"
#include "operation.h"
#include "running.h"

namespace tee {

namespace {

constexpr uint32_t mode_bit(uint32_t mode) {
  return 1u << mode;
}

constexpr uint32_t kBothDirections = mode_bit(TEE_MODE_ENCRYPT) | mode_bit(TEE_MODE_DECRYPT);

struct Algorithm {
  uint32_t id;
  uint32_t modes;
  uint32_t key_type;  // 0: works without a key
};

const Algorithm kAlgorithms[] = {
    {TEE_ALG_SHA256, mode_bit(TEE_MODE_DIGEST), 0},
    {TEE_ALG_HMAC_SHA256, mode_bit(TEE_MODE_MAC), TEE_TYPE_HMAC_SHA256},
    {TEE_ALG_AES_CBC_NOPAD, kBothDirections, TEE_TYPE_AES},
    {TEE_ALG_AES_GCM, kBothDirections, TEE_TYPE_AES},
    {TEE_ALG_RSAES_PKCS1_V1_5, kBothDirections, TEE_TYPE_RSA_KEYPAIR},
    {TEE_ALG_RSASSA_PKCS1_V1_5_SHA256, mode_bit(TEE_MODE_SIGN) | mode_bit(TEE_MODE_VERIFY),
     TEE_TYPE_RSA_KEYPAIR},
};

const Algorithm *find_algorithm(uint32_t id) {
  const auto *found = std::find_if(std::begin(kAlgorithms), std::end(kAlgorithms),
                                   [&](const Algorithm &known) { return known.id == id; });
  return found != std::end(kAlgorithms) ? found : nullptr;
}

bool supported(const Algorithm *algorithm, uint32_t mode, uint32_t max_key_size) {
  return algorithm != nullptr && mode <= TEE_MODE_DIGEST &&
         (algorithm->modes & mode_bit(mode)) != 0 &&
         (algorithm->key_type == 0 ? max_key_size == 0
                                   : key_size_supported(algorithm->key_type, max_key_size));
}

template <class T>
T *allocated(T *context) {
  if (context == nullptr) throw std::bad_alloc();
  return context;
}

// Gives the operation its context.
void prepare(__TEE_OperationHandle &operation) {
  switch (class_of(operation.algorithm)) {
    case OperationClass::kDigest:
      operation.digest.reset(allocated(EVP_MD_CTX_new()));
      if (EVP_DigestInit_ex2(operation.digest.get(), algorithms().sha256, nullptr) != 1) {
        throw std::bad_alloc();
      }
      break;
    case OperationClass::kMac:
      operation.mac.reset(allocated(EVP_MAC_CTX_dup(algorithms().hmac_sha256)));
      break;
    case OperationClass::kCipher:
    case OperationClass::kAuthenticated:
      operation.cipher.reset(allocated(EVP_CIPHER_CTX_new()));
      break;
    case OperationClass::kAsymmetricCipher:
    case OperationClass::kSignature:
      break;  // OpenSSL's context begins with the key
  }
}

// A key pair also does what its public half does.
bool accepts(const __TEE_OperationHandle &operation, uint32_t type) {
  const bool public_use = operation.mode == TEE_MODE_ENCRYPT || operation.mode == TEE_MODE_VERIFY;
  const uint32_t wanted = find_algorithm(operation.algorithm)->key_type;
  return type == wanted ||
         (wanted == TEE_TYPE_RSA_KEYPAIR && public_use && type == TEE_TYPE_RSA_PUBLIC_KEY);
}

const EVP_CIPHER *cipher_for(uint32_t algorithm, uint32_t key_size) {
  const size_t index = key_size / 64 - 2;
  return algorithm == TEE_ALG_AES_GCM ? algorithms().gcm[index] : algorithms().cbc[index];
}

bool set_cipher_key(__TEE_OperationHandle &operation, Attributes::Value key, uint32_t key_size) {
  EVP_CIPHER_CTX *context = operation.cipher.get();
  return EVP_CipherInit_ex2(context, cipher_for(operation.algorithm, key_size), key.data(), nullptr,
                            operation.mode == TEE_MODE_ENCRYPT, nullptr) == 1 &&
         EVP_CIPHER_CTX_set_padding(context, 0) == 1;
}

// With its padding in one go, which OpenSSL would otherwise look up. Of a digest it knows nothing:
// it would fetch the algorithm for each operation, only to put a constant before the hash.
bool start_rsa(EVP_PKEY_CTX *context, uint32_t mode) {
  char padding[] = OSSL_PKEY_RSA_PAD_MODE_PKCSV15;
  const OSSL_PARAM params[] = {
      OSSL_PARAM_construct_utf8_string(OSSL_PKEY_PARAM_PAD_MODE, padding, 0),
      OSSL_PARAM_construct_end(),
  };
  switch (mode) {
    case TEE_MODE_ENCRYPT:
      return EVP_PKEY_encrypt_init_ex(context, params) == 1;
    case TEE_MODE_DECRYPT:
      return EVP_PKEY_decrypt_init_ex(context, params) == 1;
    case TEE_MODE_SIGN:
      return EVP_PKEY_sign_init_ex(context, params) == 1;
    default:
      return EVP_PKEY_verify_init_ex(context, params) == 1;
  }
}

bool set_rsa_key(__TEE_OperationHandle &operation, EVP_PKEY *key) {
  operation.rsa.reset(EVP_PKEY_CTX_new_from_pkey(nullptr, key, nullptr));
  return operation.rsa != nullptr && start_rsa(operation.rsa.get(), operation.mode);
}

bool set_key(__TEE_OperationHandle &operation, const __TEE_ObjectHandle &key) {
  if (key.rsa != nullptr) return set_rsa_key(operation, key.rsa.get());
  const Attributes::Value secret = key.attributes.at(TEE_ATTR_SECRET_VALUE);
  if (operation.mac != nullptr) {
    return EVP_MAC_init(operation.mac.get(), secret.data(), secret.size(), nullptr) == 1;
  }
  return set_cipher_key(operation, secret, key.size);
}

void check_key(const __TEE_OperationHandle &operation, const __TEE_ObjectHandle &key,
               const char *call) {
  if ((key.handle_flags & TEE_HANDLE_FLAG_INITIALIZED) == 0) panic(call, "key is not initialized");
  if (!accepts(operation, key.type)) panic(call, "key of a type that the operation cannot use");
  if (key.size > operation.max_key_size) panic(call, "key too big for the operation");
}

}  // namespace

__TEE_OperationHandle &checked_operation(TEE_OperationHandle handle, const char *call) {
  if (!open_handles(current_instance()).operations.contains(handle)) {
    panic(call, "not an open operation handle");
  }
  return *handle;
}

__TEE_OperationHandle &checked_operation(TEE_OperationHandle handle, OperationClass wanted,
                                         const char *call) {
  checked_operation(handle, call);
  if (class_of(handle->algorithm) != wanted) panic(call, "operation of another class");
  return *handle;
}

__TEE_OperationHandle &checked_active(TEE_OperationHandle handle, OperationClass wanted,
                                      const char *call) {
  __TEE_OperationHandle &operation = checked_operation(handle, wanted, call);
  if (!operation.active) panic(call, "operation has not been started");
  return operation;
}

__TEE_OperationHandle &checked_keyed(TEE_OperationHandle handle, OperationClass wanted,
                                     const char *call) {
  __TEE_OperationHandle &operation = checked_operation(handle, wanted, call);
  if (!operation.has_key) panic(call, "operation has no key");
  return operation;
}

void check_mode(const __TEE_OperationHandle &operation, uint32_t mode, const char *call) {
  if (operation.mode != mode) panic(call, "operation of another mode");
}

}  // namespace tee

using namespace tee;

TEE_Result TEE_AllocateOperation(TEE_OperationHandle *operation, uint32_t algorithm, uint32_t mode,
                                 uint32_t maxKeySize) {
  *operation = TEE_HANDLE_NULL;
  if (TEE_Result code; fault_due(Fault::kCrypto, __func__, TEE_ERROR_OUT_OF_MEMORY, &code)) {
    return code;
  }
  if (!supported(find_algorithm(algorithm), mode, maxKeySize)) return TEE_ERROR_NOT_SUPPORTED;

  return result_of([&] {
    auto fresh = std::make_unique<__TEE_OperationHandle>();
    fresh->algorithm = algorithm;
    fresh->mode = mode;
    fresh->max_key_size = maxKeySize;
    prepare(*fresh);
    open_handles(current_instance()).operations.insert(fresh.get());
    *operation = fresh.release();
    return TEE_SUCCESS;
  });
}

void TEE_FreeOperation(TEE_OperationHandle operation) {
  if (operation == TEE_HANDLE_NULL) return;
  if (!open_handles(current_instance()).operations.erase(operation)) {
    panic(__func__, "not an open operation handle");
  }
  delete operation;
}

TEE_Result TEE_SetOperationKey(TEE_OperationHandle operation, TEE_ObjectHandle key) {
  __TEE_OperationHandle &known = checked_operation(operation, __func__);
  if (known.digest != nullptr) panic(__func__, "a digest has no key");
  if (known.active) panic(__func__, "operation is running");
  if (key != TEE_HANDLE_NULL) check_key(known, checked_object(key, __func__), __func__);
  if (TEE_Result code; fault_due(Fault::kCrypto, __func__, TEE_ERROR_GENERIC, &code)) return code;

  return result_of([&] {
    const QuietErrors quiet;
    if (known.has_key) {
      known.has_key = false;
      known.rsa.reset();
      prepare(known);
    }
    if (key == TEE_HANDLE_NULL) return TEE_SUCCESS;
    known.has_key = set_key(known, *key);
    return known.has_key ? TEE_SUCCESS : TEE_ERROR_GENERIC;
  });
}
