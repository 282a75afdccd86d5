// SPDX-License-Identifier: BSD-2-Clause
// Digests and message authentication codes.
#include <openssl/sha.h>

#include "operation.h"
#include "running.h"

using namespace tee;

static void check_worked(int result, const char *call) {
  if (result != 1) panic(call, "OpenSSL failed");
}

void TEE_DigestUpdate(TEE_OperationHandle operation, const void *chunk, TEE_LengthType chunkSize) {
  EVP_MD_CTX *digest = checked_operation(operation, OperationClass::kDigest, __func__).digest.get();
  check_worked(EVP_DigestUpdate(digest, chunk, chunkSize), __func__);
}

TEE_Result TEE_DigestDoFinal(TEE_OperationHandle operation, const void *chunk,
                             TEE_LengthType chunkLen, void *hash, TEE_LengthType *hashLen) {
  EVP_MD_CTX *digest = checked_operation(operation, OperationClass::kDigest, __func__).digest.get();
  if (TEE_Result code; fault_due(Fault::kCrypto, __func__, TEE_ERROR_GENERIC, &code)) return code;
  if (!fits(SHA256_DIGEST_LENGTH, hashLen)) return TEE_ERROR_SHORT_BUFFER;

  check_worked(EVP_DigestUpdate(digest, chunk, chunkLen), __func__);
  check_worked(EVP_DigestFinal_ex(digest, static_cast<uint8_t *>(hash), nullptr), __func__);
  check_worked(EVP_DigestInit_ex2(digest, nullptr, nullptr), __func__);
  *hashLen = SHA256_DIGEST_LENGTH;
  return TEE_SUCCESS;
}

void TEE_MACInit(TEE_OperationHandle operation, const void *, TEE_LengthType) {
  __TEE_OperationHandle &known = checked_keyed(operation, OperationClass::kMac, __func__);
  check_worked(EVP_MAC_init(known.mac.get(), nullptr, 0, nullptr), __func__);
  known.active = true;
}

void TEE_MACUpdate(TEE_OperationHandle operation, const void *chunk, TEE_LengthType chunkSize) {
  EVP_MAC_CTX *mac = checked_active(operation, OperationClass::kMac, __func__).mac.get();
  check_worked(EVP_MAC_update(mac, static_cast<const uint8_t *>(chunk), chunkSize), __func__);
}

TEE_Result TEE_MACComputeFinal(TEE_OperationHandle operation, const void *message,
                               TEE_LengthType messageLen, void *mac, TEE_LengthType *macLen) {
  __TEE_OperationHandle &known = checked_active(operation, OperationClass::kMac, __func__);
  if (TEE_Result code; fault_due(Fault::kCrypto, __func__, TEE_ERROR_GENERIC, &code)) return code;
  if (!fits(SHA256_DIGEST_LENGTH, macLen)) return TEE_ERROR_SHORT_BUFFER;

  size_t len = 0;
  const auto *bytes = static_cast<const uint8_t *>(message);
  check_worked(EVP_MAC_update(known.mac.get(), bytes, messageLen), __func__);
  check_worked(EVP_MAC_final(known.mac.get(), static_cast<uint8_t *>(mac), &len, *macLen),
               __func__);
  known.active = false;
  *macLen = static_cast<TEE_LengthType>(len);
  return TEE_SUCCESS;
}
