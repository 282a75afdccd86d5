// SPDX-License-Identifier: BSD-2-Clause
// AES: CBC without padding, and GCM.
#include <openssl/crypto.h>

#include <algorithm>
#include <vector>

#include "operation.h"
#include "running.h"

namespace tee {

namespace {

constexpr uint32_t kBlockLen = 16;
constexpr uint32_t kMaxStep = 1u << 30;      // OpenSSL counts in int; a multiple of the block
constexpr uint32_t kMaxNonceLen = 1024 / 8;  // OpenSSL's limit

// Runs `len` bytes through the cipher and returns how many came out. AAD has no destination.
uint32_t feed(EVP_CIPHER_CTX *cipher, const void *src, uint32_t len, void *dest, const char *call) {
  const auto *in = static_cast<const uint8_t *>(src);
  auto *out = static_cast<uint8_t *>(dest);
  uint32_t produced = 0;
  for (uint32_t left = len; left != 0;) {
    const uint32_t step = std::min(left, kMaxStep);
    int n = 0;
    if (EVP_CipherUpdate(cipher, out != nullptr ? out + produced : nullptr, &n, in,
                         static_cast<int>(step)) != 1) {
      panic(call, "OpenSSL failed");
    }
    produced += static_cast<uint32_t>(n);
    in += step;
    left -= step;
  }
  return produced;
}

// With bytes pending, the output runs ahead of the input: in place it would overwrite what is
// still to be read.
uint32_t feed_pieces(__TEE_OperationHandle &operation, const void *src, uint32_t len, void *dest,
                     const char *call) {
  EVP_CIPHER_CTX *cipher = operation.cipher.get();
  const bool runs_ahead = operation.pending != 0 && src == dest;
  operation.pending = (operation.pending + len) % kBlockLen;
  if (!runs_ahead) return feed(cipher, src, len, dest, call);

  const auto *bytes = static_cast<const uint8_t *>(src);
  std::vector<uint8_t> copy(bytes, bytes + len);
  const uint32_t produced = feed(cipher, copy.data(), len, dest, call);
  OPENSSL_cleanse(copy.data(), copy.size());
  return produced;
}

// Whole blocks with nothing pending pass straight through, without OpenSSL's own buffering: a
// caller may come with one block at a time.
inline uint32_t feed_blocks(__TEE_OperationHandle &operation, const void *src, uint32_t len,
                            void *dest, const char *call) {
  const bool whole = operation.pending == 0 && len % kBlockLen == 0;
  if (!whole || len == 0 || len > kMaxStep) return feed_pieces(operation, src, len, dest, call);
  const int produced = EVP_Cipher(operation.cipher.get(), static_cast<uint8_t *>(dest),
                                  static_cast<const uint8_t *>(src), len);
  if (produced != static_cast<int>(len)) panic(call, "OpenSSL failed");
  return len;
}

// To OpenSSL, input without a destination is AAD.
uint32_t feed_payload(EVP_CIPHER_CTX *cipher, const void *src, uint32_t len, void *dest,
                      const char *call) {
  if (dest == nullptr && len != 0) panic(call, "payload without a destination");
  return feed(cipher, src, len, dest, call);
}

bool is_tag_size(uint32_t bits) {
  return bits >= 96 && bits <= 128 && bits % 8 == 0;
}

bool start_gcm(EVP_CIPHER_CTX *cipher, const void *nonce, uint32_t nonce_len) {
  const QuietErrors quiet;
  return EVP_CIPHER_CTX_ctrl(cipher, EVP_CTRL_AEAD_SET_IVLEN, static_cast<int>(nonce_len),
                             nullptr) == 1 &&
         EVP_CipherInit_ex2(cipher, nullptr, nullptr, static_cast<const uint8_t *>(nonce), -1,
                            nullptr) == 1;
}

bool finish_gcm(EVP_CIPHER_CTX *cipher) {
  uint8_t nothing[kBlockLen];
  int n = 0;
  return EVP_CipherFinal_ex(cipher, nothing, &n) == 1;
}

}  // namespace

}  // namespace tee

using namespace tee;

void TEE_CipherInit(TEE_OperationHandle operation, const void *IV, TEE_LengthType IVLen) {
  __TEE_OperationHandle &known = checked_keyed(operation, OperationClass::kCipher, __func__);
  if (IVLen != kBlockLen) panic(__func__, "IV is not one block");
  if (EVP_CipherInit_ex2(known.cipher.get(), nullptr, nullptr, static_cast<const uint8_t *>(IV), -1,
                         nullptr) != 1) {
    panic(__func__, "OpenSSL failed");
  }
  known.pending = 0;
  known.active = true;
}

TEE_Result TEE_CipherUpdate(TEE_OperationHandle operation, const void *srcData,
                            TEE_LengthType srcLen, void *destData, TEE_LengthType *destLen) {
  __TEE_OperationHandle &known = checked_active(operation, OperationClass::kCipher, __func__);
  if (TEE_Result code; fault_due(Fault::kCrypto, __func__, TEE_ERROR_GENERIC, &code)) return code;
  const uint64_t total = uint64_t{known.pending} + srcLen;
  if (!fits(total - total % kBlockLen, destLen)) return TEE_ERROR_SHORT_BUFFER;

  *destLen = feed_blocks(known, srcData, srcLen, destData, __func__);
  return TEE_SUCCESS;
}

TEE_Result TEE_CipherDoFinal(TEE_OperationHandle operation, const void *srcData,
                             TEE_LengthType srcLen, void *destData, TEE_LengthType *destLen) {
  __TEE_OperationHandle &known = checked_active(operation, OperationClass::kCipher, __func__);
  const uint64_t total = uint64_t{known.pending} + srcLen;
  if (total % kBlockLen != 0) panic(__func__, "input is not whole blocks");
  if (TEE_Result code; fault_due(Fault::kCrypto, __func__, TEE_ERROR_GENERIC, &code)) return code;
  if (!fits(total, destLen)) return TEE_ERROR_SHORT_BUFFER;

  *destLen = feed_blocks(known, srcData, srcLen, destData, __func__);
  known.active = false;
  return TEE_SUCCESS;
}

TEE_Result TEE_AEInit(TEE_OperationHandle operation, const void *nonce, TEE_LengthType nonceLen,
                      uint32_t tagLen, uint32_t, uint32_t) {
  __TEE_OperationHandle &known = checked_keyed(operation, OperationClass::kAuthenticated, __func__);
  if (known.active) panic(__func__, "operation is running");
  if (nonceLen == 0) panic(__func__, "nonce is empty");
  if (TEE_Result code; fault_due(Fault::kCrypto, __func__, TEE_ERROR_NOT_SUPPORTED, &code)) {
    return code;
  }
  if (!is_tag_size(tagLen) || nonceLen > kMaxNonceLen) return TEE_ERROR_NOT_SUPPORTED;
  if (!start_gcm(known.cipher.get(), nonce, nonceLen)) panic(__func__, "OpenSSL failed");
  known.tag_len = tagLen / 8;
  known.active = true;
  return TEE_SUCCESS;
}

void TEE_AEUpdateAAD(TEE_OperationHandle operation, const void *AADdata,
                     TEE_LengthType AADdataLen) {
  const __TEE_OperationHandle &known =
      checked_active(operation, OperationClass::kAuthenticated, __func__);
  feed(known.cipher.get(), AADdata, AADdataLen, nullptr, __func__);
}

TEE_Result TEE_AEUpdate(TEE_OperationHandle operation, const void *srcData, TEE_LengthType srcLen,
                        void *destData, TEE_LengthType *destLen) {
  const __TEE_OperationHandle &known =
      checked_active(operation, OperationClass::kAuthenticated, __func__);
  if (TEE_Result code; fault_due(Fault::kCrypto, __func__, TEE_ERROR_GENERIC, &code)) return code;
  if (!fits(srcLen, destLen)) return TEE_ERROR_SHORT_BUFFER;

  *destLen = feed_payload(known.cipher.get(), srcData, srcLen, destData, __func__);
  return TEE_SUCCESS;
}

TEE_Result TEE_AEEncryptFinal(TEE_OperationHandle operation, const void *srcData,
                              TEE_LengthType srcLen, void *destData, TEE_LengthType *destLen,
                              void *tag, TEE_LengthType *tagLen) {
  __TEE_OperationHandle &known =
      checked_active(operation, OperationClass::kAuthenticated, __func__);
  check_mode(known, TEE_MODE_ENCRYPT, __func__);
  if (TEE_Result code; fault_due(Fault::kCrypto, __func__, TEE_ERROR_GENERIC, &code)) return code;
  const bool data_fits = fits(srcLen, destLen);
  if (!fits(known.tag_len, tagLen) || !data_fits) return TEE_ERROR_SHORT_BUFFER;

  EVP_CIPHER_CTX *cipher = known.cipher.get();
  *destLen = feed_payload(cipher, srcData, srcLen, destData, __func__);
  *tagLen = known.tag_len;
  if (!finish_gcm(cipher) || EVP_CIPHER_CTX_ctrl(cipher, EVP_CTRL_AEAD_GET_TAG,
                                                 static_cast<int>(known.tag_len), tag) != 1) {
    panic(__func__, "OpenSSL failed");
  }
  known.active = false;
  return TEE_SUCCESS;
}

TEE_Result TEE_AEDecryptFinal(TEE_OperationHandle operation, const void *srcData,
                              TEE_LengthType srcLen, void *destData, TEE_LengthType *destLen,
                              void *tag, TEE_LengthType tagLen) {
  __TEE_OperationHandle &known =
      checked_active(operation, OperationClass::kAuthenticated, __func__);
  check_mode(known, TEE_MODE_DECRYPT, __func__);
  if (TEE_Result code; fault_due(Fault::kCrypto, __func__, TEE_ERROR_GENERIC, &code)) return code;
  if (!fits(srcLen, destLen)) return TEE_ERROR_SHORT_BUFFER;

  known.active = false;
  if (tagLen != known.tag_len) return TEE_ERROR_MAC_INVALID;
  const QuietErrors quiet;
  EVP_CIPHER_CTX *cipher = known.cipher.get();
  *destLen = feed_payload(cipher, srcData, srcLen, destData, __func__);
  const bool genuine =
      EVP_CIPHER_CTX_ctrl(cipher, EVP_CTRL_AEAD_SET_TAG, static_cast<int>(tagLen), tag) == 1 &&
      finish_gcm(cipher);
  return genuine ? TEE_SUCCESS : TEE_ERROR_MAC_INVALID;
}
