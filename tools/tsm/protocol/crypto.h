// SPDX-License-Identifier: BSD-2-Clause
/// RSA keys and the algorithms of RFC 7518 that the protocol uses, on OpenSSL.
///
/// Failures of the cryptographic library, such as no memory, throw std::runtime_error; what
/// depends on data from outside returns nothing or false instead.
#ifndef TSM_PROTOCOL_CRYPTO_H
#define TSM_PROTOCOL_CRYPTO_H

#include <openssl/evp.h>

#include <initializer_list>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "common/encoding.h"

namespace tsm {

using tools::base64_decode;
using tools::base64_encode;
using tools::base64url_append;
using tools::base64url_decode;
using tools::base64url_encode;
using tools::Bytes;
using tools::hex_decode;
using tools::hex_encode;
using tools::little_endian;

/// An RSA public key or key pair. Copies share the key.
///
/// The encoded form, in which public keys travel, has little-endian lengths and big-endian numbers:
///
///     | modulus length (4) | modulus | exponent length (4) | exponent |
class RsaKey {
 public:
  static RsaKey generate(int num_bits = 2048);
  static std::optional<RsaKey> from_pem(std::string_view pem);  // private or public
  /// Of keys that were made last, the same key: to make one takes as long as to use it.
  static std::optional<RsaKey> from_encoded(std::string_view encoded);
  static bool is_encoded(std::string_view encoded);  // without making the key
  /// Big-endian numbers; an empty `d` makes a public key.
  static std::optional<RsaKey> from_numbers(std::string_view n, std::string_view e,
                                            std::string_view d = {});

  Bytes encoded() const;
  std::string private_pem() const;
  bool has_private_half() const;
  size_t modulus_len() const;  // bytes
  size_t modulus_bits() const;
  bool has_sound_exponent() const;  // odd, and not 1
  /// The first 16 hex digits of the SHA-256 digest of the encoded form: a name for people.
  std::string fingerprint() const;

  EVP_PKEY *get() const;

  /// With the padding of PKCS#1 v1.5; signatures are of SHA-256 digests.
  enum class Operation { kSign, kVerify, kEncrypt, kDecrypt };
  /// Begun, and the caller's to free.
  EVP_PKEY_CTX *begin(Operation operation) const;

 private:
  struct Shared;
  explicit RsaKey(EVP_PKEY *key);

  std::shared_ptr<Shared> shared_;
};

Bytes random_bytes(size_t len);
Bytes sha256(std::string_view data);

/// Takes the same time wherever the two differ, whatever their lengths.
bool same_secret(std::string_view a, std::string_view b);

/// RSASSA-PKCS1-v1_5 with SHA-256.
Bytes rs256_sign(const RsaKey &key, std::string_view data);
/// The same of parts that stand apart, as if they stood behind each other.
Bytes rs256_sign(const RsaKey &key, std::initializer_list<std::string_view> parts);
bool rs256_verify(const RsaKey &key, std::string_view data, std::string_view signature);

/// RSAES-PKCS1-v1_5.
Bytes rsa1_5_encrypt(const RsaKey &key, std::string_view data);
std::optional<Bytes> rsa1_5_decrypt(const RsaKey &key, std::string_view data);

/// AES-128-CBC with PKCS#7 padding; key and IV have 16 bytes.
Bytes aes_cbc_encrypt(std::string_view key, std::string_view iv, std::string_view plaintext);
std::optional<Bytes> aes_cbc_decrypt(std::string_view key, std::string_view iv,
                                     std::string_view ciphertext);

/// Authenticated encryption with a 16-byte tag: A128CBC-HS256 (CEK of 32 bytes, IV of 16) and
/// A128GCM (CEK of 16 bytes, IV of 12).
enum class ContentCipher { kA128CbcHs256, kA128Gcm };

size_t cek_len(ContentCipher cipher);
size_t iv_len(ContentCipher cipher);

struct Sealed {
  Bytes ciphertext;
  Bytes tag;
};
Sealed seal_content(ContentCipher cipher, std::string_view cek, std::string_view iv,
                    std::string_view aad, std::string_view plaintext);
std::optional<Bytes> open_content(ContentCipher cipher, std::string_view cek, std::string_view iv,
                                  std::string_view aad, const Sealed &sealed);

}  // namespace tsm

#endif
