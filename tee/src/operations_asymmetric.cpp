// SPDX-License-Identifier: BSD-2-Clause
// RSA with PKCS #1 v1.5 padding (RFC 8017, sections 7.2 and 8.2).
#include <openssl/crypto.h>
#include <openssl/rsa.h>
#include <openssl/sha.h>

#include <algorithm>
#include <array>
#include <iterator>

#include "operation.h"
#include "rsa_key.h"
#include "running.h"

namespace tee {

namespace {

// The operation's context, with key and padding set, and the length of the modulus.
struct RsaOperation {
  EVP_PKEY_CTX *context;
  uint32_t modulus_len;
};

RsaOperation checked_rsa(TEE_OperationHandle handle, OperationClass wanted, uint32_t mode,
                         const char *call) {
  const __TEE_OperationHandle &operation = checked_keyed(handle, wanted, call);
  check_mode(operation, mode, call);
  EVP_PKEY *key = EVP_PKEY_CTX_get0_pkey(operation.rsa.get());
  return {operation.rsa.get(), static_cast<uint32_t>(EVP_PKEY_get_size(key))};
}

const uint8_t *bytes(const void *data) {
  return static_cast<const uint8_t *>(data);
}

// RFC 8017, section 9.2: what is signed is a DigestInfo, whose last bytes are the hash.
constexpr uint8_t kSha256Info[] = {0x30, 0x31, 0x30, 0x0d, 0x06, 0x09, 0x60, 0x86, 0x48, 0x01,
                                   0x65, 0x03, 0x04, 0x02, 0x01, 0x05, 0x00, 0x04, 0x20};
using DigestInfo = std::array<uint8_t, sizeof kSha256Info + SHA256_DIGEST_LENGTH>;

DigestInfo info_of(const void *digest) {
  DigestInfo info;
  std::copy_n(bytes(digest), SHA256_DIGEST_LENGTH,
              std::copy(std::begin(kSha256Info), std::end(kSha256Info), info.begin()));
  return info;
}

}  // namespace

}  // namespace tee

using namespace tee;

TEE_Result TEE_AsymmetricEncrypt(TEE_OperationHandle operation, const TEE_Attribute *, uint32_t,
                                 const void *srcData, TEE_LengthType srcLen, void *destData,
                                 TEE_LengthType *destLen) {
  const RsaOperation rsa =
      checked_rsa(operation, OperationClass::kAsymmetricCipher, TEE_MODE_ENCRYPT, __func__);
  if (TEE_Result code; fault_due(Fault::kCrypto, __func__, TEE_ERROR_GENERIC, &code)) return code;
  if (srcLen > rsa.modulus_len - RSA_PKCS1_PADDING_SIZE) return TEE_ERROR_BAD_PARAMETERS;
  if (!fits(rsa.modulus_len, destLen)) return TEE_ERROR_SHORT_BUFFER;

  const QuietErrors quiet;
  size_t len = *destLen;
  if (EVP_PKEY_encrypt(rsa.context, static_cast<uint8_t *>(destData), &len, bytes(srcData),
                       srcLen) != 1) {
    return TEE_ERROR_GENERIC;
  }
  *destLen = static_cast<TEE_LengthType>(len);
  return TEE_SUCCESS;
}

// OpenSSL before 3.2 reports bad padding, later versions answer it with made-up plaintext. A
// caller has to treat both alike, or it becomes an oracle.
TEE_Result TEE_AsymmetricDecrypt(TEE_OperationHandle operation, const TEE_Attribute *, uint32_t,
                                 const void *srcData, TEE_LengthType srcLen, void *destData,
                                 TEE_LengthType *destLen) {
  const RsaOperation rsa =
      checked_rsa(operation, OperationClass::kAsymmetricCipher, TEE_MODE_DECRYPT, __func__);
  if (TEE_Result code; fault_due(Fault::kCrypto, __func__, TEE_ERROR_GENERIC, &code)) return code;
  if (srcLen != rsa.modulus_len) return TEE_ERROR_BAD_PARAMETERS;

  // OpenSSL wants room for a whole modulus, whatever the plaintext needs.
  const QuietErrors quiet;
  std::array<uint8_t, kMaxRsaSize / 8> plaintext;
  size_t len = plaintext.size();
  TEE_Result result = TEE_ERROR_BAD_PARAMETERS;
  if (EVP_PKEY_decrypt(rsa.context, plaintext.data(), &len, bytes(srcData), srcLen) == 1) {
    result = fits(len, destLen) ? TEE_SUCCESS : TEE_ERROR_SHORT_BUFFER;
  }
  if (result == TEE_SUCCESS) {
    std::copy_n(plaintext.begin(), len, static_cast<uint8_t *>(destData));
    *destLen = static_cast<TEE_LengthType>(len);
  }
  OPENSSL_cleanse(plaintext.data(), plaintext.size());
  return result;
}

TEE_Result TEE_AsymmetricSignDigest(TEE_OperationHandle operation, const TEE_Attribute *, uint32_t,
                                    const void *digest, TEE_LengthType digestLen, void *signature,
                                    TEE_LengthType *signatureLen) {
  const RsaOperation rsa =
      checked_rsa(operation, OperationClass::kSignature, TEE_MODE_SIGN, __func__);
  if (digestLen != SHA256_DIGEST_LENGTH) panic(__func__, "digest of a wrong length");
  if (TEE_Result code; fault_due(Fault::kCrypto, __func__, TEE_ERROR_GENERIC, &code)) return code;
  if (!fits(rsa.modulus_len, signatureLen)) return TEE_ERROR_SHORT_BUFFER;

  const QuietErrors quiet;
  size_t len = *signatureLen;
  const DigestInfo info = info_of(digest);
  if (EVP_PKEY_sign(rsa.context, static_cast<uint8_t *>(signature), &len, info.data(),
                    info.size()) != 1) {
    return TEE_ERROR_GENERIC;
  }
  *signatureLen = static_cast<TEE_LengthType>(len);
  return TEE_SUCCESS;
}

TEE_Result TEE_AsymmetricVerifyDigest(TEE_OperationHandle operation, const TEE_Attribute *,
                                      uint32_t, const void *digest, TEE_LengthType digestLen,
                                      const void *signature, TEE_LengthType signatureLen) {
  const RsaOperation rsa =
      checked_rsa(operation, OperationClass::kSignature, TEE_MODE_VERIFY, __func__);
  if (digestLen != SHA256_DIGEST_LENGTH) panic(__func__, "digest of a wrong length");
  if (TEE_Result code; fault_due(Fault::kCrypto, __func__, TEE_ERROR_GENERIC, &code)) return code;
  if (signatureLen != rsa.modulus_len) return TEE_ERROR_SIGNATURE_INVALID;

  const QuietErrors quiet;
  const DigestInfo info = info_of(digest);
  const bool genuine =
      EVP_PKEY_verify(rsa.context, bytes(signature), signatureLen, info.data(), info.size()) == 1;
  return genuine ? TEE_SUCCESS : TEE_ERROR_SIGNATURE_INVALID;
}
