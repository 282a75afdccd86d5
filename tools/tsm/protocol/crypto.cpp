// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/protocol/crypto.h"

#include <openssl/bn.h>
#include <openssl/core_names.h>
#include <openssl/crypto.h>
#include <openssl/err.h>
#include <openssl/param_build.h>
#include <openssl/pem.h>
#include <openssl/rand.h>
#include <openssl/rsa.h>

#include <array>
#include <climits>
#include <cstdint>
#include <deque>
#include <map>
#include <mutex>
#include <stdexcept>

namespace tsm {
namespace {

constexpr size_t kAesKeyLen = 16;
constexpr size_t kTagLen = 16;
constexpr size_t kGcmIvLen = 12;
constexpr size_t kCbcIvLen = 16;
constexpr size_t kMaxModulusLen = 2048;  // 16384 bits, the most that OpenSSL verifies with

template <auto Free>
struct FreedBy {
  template <class T>
  void operator()(T *object) const {
    Free(object);
  }
};
using BioPtr = std::unique_ptr<BIO, FreedBy<BIO_free_all>>;
using BigNumber = std::unique_ptr<BIGNUM, FreedBy<BN_clear_free>>;
using CipherContext = std::unique_ptr<EVP_CIPHER_CTX, FreedBy<EVP_CIPHER_CTX_free>>;
using DigestContext = std::unique_ptr<EVP_MD_CTX, FreedBy<EVP_MD_CTX_free>>;
using Key = std::unique_ptr<EVP_PKEY, FreedBy<EVP_PKEY_free>>;
using KeyContext = std::unique_ptr<EVP_PKEY_CTX, FreedBy<EVP_PKEY_CTX_free>>;
using MacContext = std::unique_ptr<EVP_MAC_CTX, FreedBy<EVP_MAC_CTX_free>>;
using ParamBuilder = std::unique_ptr<OSSL_PARAM_BLD, FreedBy<OSSL_PARAM_BLD_free>>;
using Params = std::unique_ptr<OSSL_PARAM, FreedBy<OSSL_PARAM_free>>;

const uint8_t *in(std::string_view bytes) {
  return reinterpret_cast<const uint8_t *>(bytes.data());
}
uint8_t *out(Bytes &bytes) {
  return reinterpret_cast<uint8_t *>(bytes.data());
}

void require(bool ok, const char *what) {
  if (ok) return;
  const unsigned long reason = ERR_peek_last_error();
  ERR_clear_error();
  const char *text = reason == 0 ? nullptr : ERR_reason_error_string(reason);
  throw std::runtime_error(std::string(what) + (text == nullptr ? "" : ": ") +
                           (text == nullptr ? "" : text));
}

/// What failed because of data from outside leaves no trace in the thread's error queue.
std::nullopt_t nothing() {
  ERR_clear_error();
  return std::nullopt;
}

int int_len(std::string_view bytes) {
  require(bytes.size() <= INT_MAX, "too many bytes");
  return static_cast<int>(bytes.size());
}

BigNumber number_of(std::string_view bytes) {
  BigNumber number(BN_bin2bn(in(bytes), int_len(bytes), nullptr));
  require(number != nullptr, "cannot hold a number");
  return number;
}

Bytes number_param(EVP_PKEY *key, const char *name) {
  BIGNUM *raw = nullptr;
  require(EVP_PKEY_get_bn_param(key, name, &raw) == 1, "cannot read an RSA number");
  const BigNumber number(raw);
  Bytes bytes(static_cast<size_t>(BN_num_bytes(raw)), '\0');
  BN_bn2bin(raw, out(bytes));
  return bytes;
}

std::optional<size_t> take_length(std::string_view *rest) {
  if (rest->size() < 4) return std::nullopt;
  size_t value = 0;
  for (int i = 3; i >= 0; --i)
    value = value << 8 | static_cast<uint8_t>((*rest)[static_cast<size_t>(i)]);
  rest->remove_prefix(4);
  return value;
}

std::optional<std::string_view> take_block(std::string_view *rest) {
  const std::optional<size_t> len = take_length(rest);
  if (!len || *len == 0 || *len > rest->size()) return std::nullopt;
  const std::string_view block = rest->substr(0, *len);
  rest->remove_prefix(*len);
  return block;
}

struct PublicNumbers {
  std::string_view n;
  std::string_view e;
};

std::optional<PublicNumbers> take_apart(std::string_view encoded) {
  const std::optional<std::string_view> n = take_block(&encoded);
  const std::optional<std::string_view> e = n ? take_block(&encoded) : std::nullopt;
  return e && encoded.empty() ? std::optional(PublicNumbers{*n, *e}) : std::nullopt;
}

bool have_usual_lengths(const PublicNumbers &numbers) {
  return !numbers.n.empty() && !numbers.e.empty() && numbers.n.size() <= kMaxModulusLen &&
         numbers.e.size() <= numbers.n.size();
}

// Algorithms are found once, and what is begun with them is copied: looking for them takes longer
// than most of what they do here.

const EVP_MD *sha256_algorithm() {
  static const std::unique_ptr<EVP_MD, FreedBy<EVP_MD_free>> found(
      EVP_MD_fetch(nullptr, "SHA256", nullptr));
  require(found != nullptr, "no SHA-256");
  return found.get();
}

const EVP_CIPHER *aes_cbc_algorithm() {
  static const std::unique_ptr<EVP_CIPHER, FreedBy<EVP_CIPHER_free>> found(
      EVP_CIPHER_fetch(nullptr, "AES-128-CBC", nullptr));
  require(found != nullptr, "no AES-CBC");
  return found.get();
}

MacContext begin_hmac_anew() {
  const std::unique_ptr<EVP_MAC, FreedBy<EVP_MAC_free>> hmac(
      EVP_MAC_fetch(nullptr, OSSL_MAC_NAME_HMAC, nullptr));
  MacContext context(hmac == nullptr ? nullptr : EVP_MAC_CTX_new(hmac.get()));
  char digest[] = "SHA256";
  const OSSL_PARAM params[] = {OSSL_PARAM_construct_utf8_string(OSSL_MAC_PARAM_DIGEST, digest, 0),
                               OSSL_PARAM_construct_end()};
  require(context != nullptr && EVP_MAC_CTX_set_params(context.get(), params) == 1, "no HMAC");
  return context;
}

MacContext begin_hmac() {
  static const MacContext begun = begin_hmac_anew();
  return MacContext(EVP_MAC_CTX_dup(begun.get()));
}

KeyContext begin_rsa_anew(EVP_PKEY *key, RsaKey::Operation operation) {
  constexpr int (*kStarts[])(EVP_PKEY_CTX *) = {EVP_PKEY_sign_init, EVP_PKEY_verify_init,
                                                EVP_PKEY_encrypt_init, EVP_PKEY_decrypt_init};
  KeyContext context(EVP_PKEY_CTX_new(key, nullptr));
  bool ok = context != nullptr && kStarts[static_cast<size_t>(operation)](context.get()) == 1 &&
            EVP_PKEY_CTX_set_rsa_padding(context.get(), RSA_PKCS1_PADDING) == 1;
  if (operation == RsaKey::Operation::kSign || operation == RsaKey::Operation::kVerify) {
    ok = ok && EVP_PKEY_CTX_set_signature_md(context.get(), sha256_algorithm()) == 1;
  }
  require(ok, "cannot start an RSA operation");
  return context;
}

/// The keys that were made last, by their encoded forms. For any number of threads.
class KeyShelf {
 public:
  std::optional<RsaKey> find(std::string_view encoded) {
    const std::lock_guard guard(lock_);
    const auto found = keys_.find(encoded);
    return found == keys_.end() ? std::nullopt : std::optional(found->second);
  }

  void put(std::string_view encoded, const RsaKey &key) {
    const std::lock_guard guard(lock_);
    const auto [at, is_new] = keys_.emplace(encoded, key);
    if (is_new) by_age_.push_back(at);
    if (by_age_.size() <= kNumKeys) return;
    keys_.erase(by_age_.front());
    by_age_.pop_front();
  }

 private:
  static constexpr size_t kNumKeys = 512;  // of some 5 KB each
  using Keys = std::map<Bytes, RsaKey, std::less<>>;

  std::mutex lock_;  // of all below
  Keys keys_;
  std::deque<Keys::iterator> by_age_;  // the oldest first
};

/// A failed decryption or verification is an answer; a failed encryption is not.
enum class Direction { kDecrypt = 0, kEncrypt = 1 };

CipherContext start_cipher(const EVP_CIPHER *cipher, std::string_view key, std::string_view iv,
                           Direction direction) {
  require(key.size() == static_cast<size_t>(EVP_CIPHER_get_key_length(cipher)) &&
              iv.size() == static_cast<size_t>(EVP_CIPHER_get_iv_length(cipher)),
          "wrong length of a content key or IV");
  CipherContext context(EVP_CIPHER_CTX_new());
  require(context != nullptr && EVP_CipherInit_ex2(context.get(), cipher, in(key), in(iv),
                                                   static_cast<int>(direction), nullptr) == 1,
          "cannot start a cipher");
  return context;
}

std::optional<Bytes> run_cipher(EVP_CIPHER_CTX *context, std::string_view input) {
  Bytes result(input.size() + EVP_MAX_BLOCK_LENGTH, '\0');
  int updated = 0;
  int finished = 0;
  if (EVP_CipherUpdate(context, out(result), &updated, in(input), int_len(input)) != 1 ||
      EVP_CipherFinal_ex(context, out(result) + updated, &finished) != 1) {
    return nothing();
  }
  result.resize(static_cast<size_t>(updated + finished));
  return result;
}

void add_aad(EVP_CIPHER_CTX *context, std::string_view aad) {
  int len = 0;
  require(EVP_CipherUpdate(context, nullptr, &len, in(aad), int_len(aad)) == 1, "AES-GCM failed");
}

Sealed gcm_seal(std::string_view cek, std::string_view iv, std::string_view aad,
                std::string_view plaintext) {
  const CipherContext context = start_cipher(EVP_aes_128_gcm(), cek, iv, Direction::kEncrypt);
  add_aad(context.get(), aad);
  std::optional<Bytes> ciphertext = run_cipher(context.get(), plaintext);
  Bytes tag(kTagLen, '\0');
  require(ciphertext &&
              EVP_CIPHER_CTX_ctrl(context.get(), EVP_CTRL_AEAD_GET_TAG, kTagLen, tag.data()) == 1,
          "AES-GCM failed");
  return {std::move(*ciphertext), std::move(tag)};
}

std::optional<Bytes> gcm_open(std::string_view cek, std::string_view iv, std::string_view aad,
                              const Sealed &sealed) {
  const CipherContext context = start_cipher(EVP_aes_128_gcm(), cek, iv, Direction::kDecrypt);
  Bytes tag = sealed.tag;
  require(EVP_CIPHER_CTX_ctrl(context.get(), EVP_CTRL_AEAD_SET_TAG, kTagLen, tag.data()) == 1,
          "AES-GCM failed");
  add_aad(context.get(), aad);
  return run_cipher(context.get(), sealed.ciphertext);
}

/// RFC 7518 section 5.2.2.1: the MAC key is the first half of the CEK, and AL counts bits.
Bytes cbc_tag(std::string_view cek, std::string_view iv, std::string_view aad,
              std::string_view ciphertext) {
  const uint64_t num_bits = static_cast<uint64_t>(aad.size()) * 8;
  Bytes al;
  for (int shift = 56; shift >= 0; shift -= 8) al += static_cast<char>(num_bits >> shift & 0xFF);

  const MacContext context = begin_hmac();
  Bytes mac(EVP_MAX_MD_SIZE, '\0');
  size_t mac_len = 0;
  bool ok = context != nullptr && EVP_MAC_init(context.get(), in(cek), kAesKeyLen, nullptr) == 1;
  for (const std::string_view part : {aad, iv, ciphertext, std::string_view(al)}) {
    ok = ok && EVP_MAC_update(context.get(), in(part), part.size()) == 1;
  }
  require(ok && EVP_MAC_final(context.get(), out(mac), &mac_len, mac.size()) == 1, "HMAC failed");
  mac.resize(kTagLen);
  return mac;
}

Bytes sha256_of(std::initializer_list<std::string_view> parts) {
  const DigestContext context(EVP_MD_CTX_new());
  Bytes digest(EVP_MAX_MD_SIZE, '\0');
  unsigned len = 0;
  bool ok =
      context != nullptr && EVP_DigestInit_ex2(context.get(), sha256_algorithm(), nullptr) == 1;
  for (const std::string_view part : parts) {
    ok = ok && EVP_DigestUpdate(context.get(), part.data(), part.size()) == 1;
  }
  require(ok && EVP_DigestFinal_ex(context.get(), out(digest), &len) == 1, "SHA-256 failed");
  digest.resize(len);
  return digest;
}

}  // namespace

struct RsaKey::Shared {
  explicit Shared(EVP_PKEY *owned) : key(owned) {}

  struct Begun {
    std::once_flag once;
    KeyContext context;
  };

  const Key key;
  std::array<Begun, 4> begun;  // by Operation, when it is first needed
};

RsaKey::RsaKey(EVP_PKEY *key) : shared_(std::make_shared<Shared>(key)) {}

EVP_PKEY *RsaKey::get() const {
  return shared_->key.get();
}

EVP_PKEY_CTX *RsaKey::begin(Operation operation) const {
  Shared::Begun &begun = shared_->begun[static_cast<size_t>(operation)];
  std::call_once(begun.once, [&] { begun.context = begin_rsa_anew(get(), operation); });
  EVP_PKEY_CTX *context = EVP_PKEY_CTX_dup(begun.context.get());
  require(context != nullptr, "cannot start an RSA operation");
  return context;
}

RsaKey RsaKey::generate(int num_bits) {
  EVP_PKEY *key = EVP_RSA_gen(static_cast<unsigned>(num_bits));
  require(key != nullptr, "cannot generate an RSA key");
  return RsaKey(key);
}

std::optional<RsaKey> RsaKey::from_pem(std::string_view pem) {
  const auto read = [pem](auto reader) -> EVP_PKEY * {
    const BioPtr bio(BIO_new_mem_buf(pem.data(), int_len(pem)));
    // An encrypted key would make the reader ask the terminal for a pass phrase.
    const auto no_pass_phrase = [](char *, int, int, void *) { return -1; };
    return bio == nullptr ? nullptr : reader(bio.get(), nullptr, no_pass_phrase, nullptr);
  };
  EVP_PKEY *raw = read(PEM_read_bio_PrivateKey);
  if (raw == nullptr) raw = read(PEM_read_bio_PUBKEY);
  if (raw == nullptr) return nothing();
  const RsaKey key(raw);
  if (EVP_PKEY_get_base_id(raw) != EVP_PKEY_RSA) return nothing();
  ERR_clear_error();
  return key;
}

bool RsaKey::is_encoded(std::string_view encoded) {
  const std::optional<PublicNumbers> numbers = take_apart(encoded);
  return numbers && have_usual_lengths(*numbers);
}

std::optional<RsaKey> RsaKey::from_encoded(std::string_view encoded) {
  static KeyShelf &shelf = *new KeyShelf;  // for ever: OpenSSL may be gone before what is static
  std::optional<RsaKey> key = shelf.find(encoded);
  if (key) return key;
  const std::optional<PublicNumbers> numbers = take_apart(encoded);
  if (numbers) key = from_numbers(numbers->n, numbers->e);
  if (key) shelf.put(encoded, *key);
  return key;
}

std::optional<RsaKey> RsaKey::from_numbers(std::string_view n, std::string_view e,
                                           std::string_view d) {
  if (!have_usual_lengths({n, e})) return nothing();
  const BigNumber modulus = number_of(n);
  const BigNumber exponent = number_of(e);
  const BigNumber private_exponent = number_of(d);
  const ParamBuilder builder(OSSL_PARAM_BLD_new());
  require(builder != nullptr, "no memory");
  bool ok = OSSL_PARAM_BLD_push_BN(builder.get(), OSSL_PKEY_PARAM_RSA_N, modulus.get()) == 1 &&
            OSSL_PARAM_BLD_push_BN(builder.get(), OSSL_PKEY_PARAM_RSA_E, exponent.get()) == 1;
  if (!d.empty()) {
    ok = ok &&
         OSSL_PARAM_BLD_push_BN(builder.get(), OSSL_PKEY_PARAM_RSA_D, private_exponent.get()) == 1;
  }
  const Params params(ok ? OSSL_PARAM_BLD_to_param(builder.get()) : nullptr);
  // Finding RSA among the algorithms takes as long as all the rest.
  thread_local const KeyContext context(EVP_PKEY_CTX_new_from_name(nullptr, "RSA", nullptr));
  EVP_PKEY *key = nullptr;
  if (params == nullptr || context == nullptr || EVP_PKEY_fromdata_init(context.get()) != 1 ||
      EVP_PKEY_fromdata(context.get(), &key, d.empty() ? EVP_PKEY_PUBLIC_KEY : EVP_PKEY_KEYPAIR,
                        params.get()) != 1) {
    return nothing();
  }
  return RsaKey(key);
}

Bytes RsaKey::encoded() const {
  const Bytes n = number_param(get(), OSSL_PKEY_PARAM_RSA_N);
  const Bytes e = number_param(get(), OSSL_PKEY_PARAM_RSA_E);
  return little_endian(n.size(), 4) + n + little_endian(e.size(), 4) + e;
}

std::string RsaKey::private_pem() const {
  const BioPtr bio(BIO_new(BIO_s_mem()));
  require(bio != nullptr && PEM_write_bio_PrivateKey(bio.get(), get(), nullptr, nullptr, 0, nullptr,
                                                     nullptr) == 1,
          "cannot write a private key");
  char *text = nullptr;
  const long len = BIO_get_mem_data(bio.get(), &text);
  return std::string(text, static_cast<size_t>(len));
}

bool RsaKey::has_private_half() const {
  BIGNUM *raw = nullptr;
  const bool found = EVP_PKEY_get_bn_param(get(), OSSL_PKEY_PARAM_RSA_D, &raw) == 1;
  const BigNumber exponent(raw);
  if (!found) ERR_clear_error();
  return found;
}

size_t RsaKey::modulus_len() const {
  return static_cast<size_t>(EVP_PKEY_get_size(get()));
}

size_t RsaKey::modulus_bits() const {
  return static_cast<size_t>(EVP_PKEY_get_bits(get()));
}

bool RsaKey::has_sound_exponent() const {
  const BigNumber exponent = number_of(number_param(get(), OSSL_PKEY_PARAM_RSA_E));
  return BN_is_odd(exponent.get()) == 1 && BN_is_one(exponent.get()) == 0;
}

std::string RsaKey::fingerprint() const {
  return hex_encode(sha256(encoded())).substr(0, 16);
}

Bytes random_bytes(size_t len) {
  Bytes bytes(len, '\0');
  require(RAND_bytes(out(bytes), int_len(bytes)) == 1, "no random numbers");
  return bytes;
}

Bytes sha256(std::string_view data) {
  return sha256_of({data});
}

bool same_secret(std::string_view a, std::string_view b) {
  const Bytes digest = sha256(a);
  return CRYPTO_memcmp(digest.data(), sha256(b).data(), digest.size()) == 0;
}

Bytes rs256_sign(const RsaKey &key, std::string_view data) {
  return rs256_sign(key, {data});
}

Bytes rs256_sign(const RsaKey &key, std::initializer_list<std::string_view> parts) {
  const Bytes digest = sha256_of(parts);
  const KeyContext context(key.begin(RsaKey::Operation::kSign));
  Bytes signature(key.modulus_len(), '\0');
  size_t len = signature.size();
  require(EVP_PKEY_sign(context.get(), out(signature), &len, in(digest), digest.size()) == 1,
          "cannot sign");
  signature.resize(len);
  return signature;
}

bool rs256_verify(const RsaKey &key, std::string_view data, std::string_view signature) {
  const Bytes digest = sha256(data);
  const KeyContext context(key.begin(RsaKey::Operation::kVerify));
  const bool verified = EVP_PKEY_verify(context.get(), in(signature), signature.size(), in(digest),
                                        digest.size()) == 1;
  if (!verified) ERR_clear_error();
  return verified;
}

Bytes rsa1_5_encrypt(const RsaKey &key, std::string_view data) {
  const KeyContext context(key.begin(RsaKey::Operation::kEncrypt));
  Bytes encrypted(key.modulus_len(), '\0');
  size_t len = encrypted.size();
  require(EVP_PKEY_encrypt(context.get(), out(encrypted), &len, in(data), data.size()) == 1,
          "cannot encrypt with an RSA key");
  encrypted.resize(len);
  return encrypted;
}

std::optional<Bytes> rsa1_5_decrypt(const RsaKey &key, std::string_view data) {
  const KeyContext context(key.begin(RsaKey::Operation::kDecrypt));
  Bytes decrypted(key.modulus_len(), '\0');
  size_t len = decrypted.size();
  if (EVP_PKEY_decrypt(context.get(), out(decrypted), &len, in(data), data.size()) != 1) {
    return nothing();
  }
  decrypted.resize(len);
  return decrypted;
}

Bytes aes_cbc_encrypt(std::string_view key, std::string_view iv, std::string_view plaintext) {
  const CipherContext context = start_cipher(aes_cbc_algorithm(), key, iv, Direction::kEncrypt);
  std::optional<Bytes> ciphertext = run_cipher(context.get(), plaintext);
  require(ciphertext.has_value(), "AES-CBC failed");
  return std::move(*ciphertext);
}

std::optional<Bytes> aes_cbc_decrypt(std::string_view key, std::string_view iv,
                                     std::string_view ciphertext) {
  if (key.size() != kAesKeyLen || iv.size() != kCbcIvLen) return std::nullopt;
  const CipherContext context = start_cipher(aes_cbc_algorithm(), key, iv, Direction::kDecrypt);
  return run_cipher(context.get(), ciphertext);
}

size_t cek_len(ContentCipher cipher) {
  return cipher == ContentCipher::kA128Gcm ? kAesKeyLen : 2 * kAesKeyLen;
}

size_t iv_len(ContentCipher cipher) {
  return cipher == ContentCipher::kA128Gcm ? kGcmIvLen : kCbcIvLen;
}

Sealed seal_content(ContentCipher cipher, std::string_view cek, std::string_view iv,
                    std::string_view aad, std::string_view plaintext) {
  require(cek.size() == cek_len(cipher), "wrong length of a content key");
  if (cipher == ContentCipher::kA128Gcm) return gcm_seal(cek, iv, aad, plaintext);
  Bytes ciphertext = aes_cbc_encrypt(cek.substr(kAesKeyLen), iv, plaintext);
  Bytes tag = cbc_tag(cek, iv, aad, ciphertext);
  return {std::move(ciphertext), std::move(tag)};
}

std::optional<Bytes> open_content(ContentCipher cipher, std::string_view cek, std::string_view iv,
                                  std::string_view aad, const Sealed &sealed) {
  if (cek.size() != cek_len(cipher) || iv.size() != iv_len(cipher) ||
      sealed.tag.size() != kTagLen) {
    return std::nullopt;
  }
  if (cipher == ContentCipher::kA128Gcm) return gcm_open(cek, iv, aad, sealed);
  const Bytes tag = cbc_tag(cek, iv, aad, sealed.ciphertext);
  if (CRYPTO_memcmp(tag.data(), sealed.tag.data(), kTagLen) != 0) return std::nullopt;
  return aes_cbc_decrypt(cek.substr(kAesKeyLen), iv, sealed.ciphertext);
}

}  // namespace tsm
