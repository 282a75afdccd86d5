// SPDX-License-Identifier: BSD-2-Clause
#include "rsa_key.h"

#include <openssl/core_names.h>
#include <openssl/crypto.h>
#include <openssl/params.h>
#include <openssl/pem.h>
#include <openssl/rsa.h>
#include <tee_internal_api.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <bit>
#include <cstdio>
#include <cstring>
#include <iterator>
#include <map>
#include <mutex>

#include "rsa_completion.h"
#include "running.h"

namespace tee {

namespace {

struct RsaAttribute {
  uint32_t id;
  const char *param;
};

const RsaAttribute kRsaAttributes[] = {
    {TEE_ATTR_RSA_MODULUS, OSSL_PKEY_PARAM_RSA_N},
    {TEE_ATTR_RSA_PUBLIC_EXPONENT, OSSL_PKEY_PARAM_RSA_E},
    {TEE_ATTR_RSA_PRIVATE_EXPONENT, OSSL_PKEY_PARAM_RSA_D},
    {TEE_ATTR_RSA_PRIME1, OSSL_PKEY_PARAM_RSA_FACTOR1},
    {TEE_ATTR_RSA_PRIME2, OSSL_PKEY_PARAM_RSA_FACTOR2},
    {TEE_ATTR_RSA_EXPONENT1, OSSL_PKEY_PARAM_RSA_EXPONENT1},
    {TEE_ATTR_RSA_EXPONENT2, OSSL_PKEY_PARAM_RSA_EXPONENT2},
    {TEE_ATTR_RSA_COEFFICIENT, OSSL_PKEY_PARAM_RSA_COEFFICIENT1},
};

KeyContext rsa_context() {
  return KeyContext(EVP_PKEY_CTX_new_from_name(nullptr, "RSA", nullptr));
}

SharedKey share(EVP_PKEY *key) {
  return SharedKey(key, EVP_PKEY_free);
}

Number to_number(Attributes::Value value) {
  return Number(BN_bin2bn(value.data(), static_cast<int>(value.size()), nullptr));
}

bool is_odd(Attributes::Value number) {
  return (number.back() & 1) != 0;
}

bool is_product(Attributes::Value n, Attributes::Value p, Attributes::Value q) {
  const std::unique_ptr<BN_CTX, FreedBy<BN_CTX_free>> scratch(BN_CTX_secure_new());
  const Number product(BN_new());
  return scratch && product &&
         BN_mul(product.get(), to_number(p).get(), to_number(q).get(), scratch.get()) == 1 &&
         BN_cmp(product.get(), to_number(n).get()) == 0;
}

bool is_exponent(Attributes::Value e, uint32_t modulus_size) {
  const uint32_t max_bits = modulus_size > OPENSSL_RSA_SMALL_MODULUS_BITS
                                ? OPENSSL_RSA_MAX_PUBEXP_BITS
                                : modulus_size - 1;
  return num_bits(e) >= 2 && num_bits(e) <= max_bits && is_odd(e);
}

// Whatever would make OpenSSL refuse to work with the key later. A wrong private exponent or CRT
// component that passes gives wrong results, as it would on any device.
bool is_plausible(const Attributes &attributes) {
  const auto is_zero = [&](const RsaAttribute &known) {
    const auto value = attributes.find(known.id);
    return value && num_bits(*value) == 0;
  };
  if (std::ranges::any_of(kRsaAttributes, is_zero)) return false;

  const Attributes::Value n = attributes.at(TEE_ATTR_RSA_MODULUS);
  const uint32_t size = num_bits(n);
  if (size < kMinRsaSize || size > kMaxRsaSize || !is_odd(n)) return false;
  if (!is_exponent(attributes.at(TEE_ATTR_RSA_PUBLIC_EXPONENT), size)) return false;

  const auto p = attributes.find(TEE_ATTR_RSA_PRIME1);
  return !p || is_product(n, *p, attributes.at(TEE_ATTR_RSA_PRIME2));
}

// Eight bytes at a time: byte by byte the numbers of one pair would take as long as their import.
void copy_reversed(Attributes::Value from, uint8_t *to) {
  size_t left = from.size();
  for (; left >= sizeof(uint64_t); left -= sizeof(uint64_t), to += sizeof(uint64_t)) {
    uint64_t word;
    std::memcpy(&word, &from[left - sizeof word], sizeof word);
    word = __builtin_bswap64(word);
    std::memcpy(to, &word, sizeof word);
  }
  while (left != 0) *to++ = from[--left];
}

// `completion` has the CRT part where it was not given.
SharedKey make_key(const Attributes &given, const Attributes &completion) {
  static_assert(std::endian::native == std::endian::little);
  // OpenSSL takes numbers in the byte order of the machine.
  std::vector<uint8_t> numbers(given.total_len() + completion.total_len());
  uint8_t *at = numbers.data();
  std::array<OSSL_PARAM, std::size(kRsaAttributes) + 1> params;
  auto param = params.begin();
  for (const RsaAttribute &known : kRsaAttributes) {
    auto value = given.find(known.id);
    if (!value) value = completion.find(known.id);
    if (!value) continue;
    copy_reversed(*value, at);
    *param++ = OSSL_PARAM_construct_BN(known.param, at, value->size());
    at += value->size();
  }
  *param = OSSL_PARAM_construct_end();

  // Importing leaves nothing in a context, and making one takes half as long as importing.
  static thread_local const KeyContext context = rsa_context();
  const bool pair = given.contains(TEE_ATTR_RSA_PRIVATE_EXPONENT);
  EVP_PKEY *key = nullptr;
  const bool made =
      context && EVP_PKEY_fromdata_init(context.get()) == 1 &&
      EVP_PKEY_fromdata(context.get(), &key, pair ? EVP_PKEY_KEYPAIR : EVP_PKEY_PUBLIC_KEY,
                        params.data()) == 1;
  OPENSSL_cleanse(numbers.data(), numbers.size());
  return made ? share(key) : nullptr;
}

// The public keys that a thread had last, the latest first. A device gets messages of few senders,
// with their keys in each, and to import a key takes as long as half a verification with it.
class PublicKeys {
 public:
  SharedKey get(const Attributes &attributes) {
    const Attributes::Value n = attributes.at(TEE_ATTR_RSA_MODULUS);
    const Attributes::Value e = attributes.at(TEE_ATTR_RSA_PUBLIC_EXPONENT);
    auto known = std::ranges::find_if(keys_, [&](const PublicKey &public_key) {
      return std::ranges::equal(public_key.n, n) && std::ranges::equal(public_key.e, e);
    });
    if (known == keys_.end()) {
      SharedKey key = make_key(attributes, Attributes());
      if (key == nullptr) return nullptr;
      if (keys_.size() == kMaxCount) keys_.pop_back();
      keys_.push_back({{n.begin(), n.end()}, {e.begin(), e.end()}, std::move(key)});
      known = keys_.end() - 1;
    }
    std::rotate(keys_.begin(), known, known + 1);
    return keys_.front().key;
  }

 private:
  static constexpr size_t kMaxCount = 8;
  struct PublicKey {
    std::vector<uint8_t> n, e;
    SharedKey key;
  };
  std::vector<PublicKey> keys_;
};

}  // namespace

uint32_t num_bits(Attributes::Value number) {
  const auto first = std::ranges::find_if(number, [](uint8_t b) { return b != 0; });
  if (first == number.end()) return 0;
  const auto rest = static_cast<uint32_t>(number.end() - first - 1);
  return 8 * rest + static_cast<uint32_t>(std::bit_width(*first));
}

SharedKey import_rsa_key(const Attributes &attributes) {
  const QuietErrors quiet;
  if (!is_plausible(attributes)) return nullptr;
  if (!attributes.contains(TEE_ATTR_RSA_PRIVATE_EXPONENT)) {
    static thread_local PublicKeys public_keys;
    return public_keys.get(attributes);
  }
  Attributes completion;
  if (!attributes.contains(TEE_ATTR_RSA_PRIME1)) find_crt_part(attributes, &completion);
  return make_key(attributes, completion);
}

namespace {

using File = std::unique_ptr<FILE, FreedBy<fclose>>;

SharedKey read_key(const std::string &path) {
  const File file(fopen(path.c_str(), "re"));
  EVP_PKEY *key = file ? PEM_read_PrivateKey(file.get(), nullptr, nullptr, nullptr) : nullptr;
  return key != nullptr ? share(key) : nullptr;
}

// Other processes see a whole key or none. What cannot be kept is generated again.
void write_key(const std::string &path, const SharedKey &key) {
  const std::string part = path + "." + std::to_string(getpid());
  File file(fopen(part.c_str(), "wxe"));
  if (!file) return;
  const bool is_whole =
      PEM_write_PrivateKey(file.get(), key.get(), nullptr, nullptr, 0, nullptr, nullptr) == 1 &&
      fflush(file.get()) == 0;
  file.reset();
  if (!is_whole || rename(part.c_str(), path.c_str()) != 0) unlink(part.c_str());
}

// See reuse_generated_keys().
struct KeyPool {
  std::mutex lock;
  size_t limit = 0;    // of keys for each size
  std::string folder;  // of their files; empty: none
  std::map<uint32_t, std::vector<SharedKey>> keys;
  size_t next = 0;

  SharedKey take(uint32_t size) {
    const std::lock_guard guard(lock);
    std::vector<SharedKey> &known = keys[size];
    if (limit != 0 && known.size() == limit) return known[next++ % limit];
    SharedKey key = limit == 0 || folder.empty() ? nullptr : read_key(next_file(size));
    if (key != nullptr) known.push_back(key);
    return key;
  }

  void keep(uint32_t size, const SharedKey &key) {
    const std::lock_guard guard(lock);
    if (keys[size].size() == limit) return;
    if (!folder.empty()) write_key(next_file(size), key);
    keys[size].push_back(key);
  }

 private:
  std::string next_file(uint32_t size) {
    return folder + "/" + std::to_string(size) + "-" + std::to_string(keys[size].size()) + ".pem";
  }
};
KeyPool key_pool;

SharedKey make_rsa_key(uint32_t size, const std::vector<uint8_t> &public_exponent) {
  const QuietErrors quiet;
  const KeyContext context = rsa_context();
  if (!context || EVP_PKEY_keygen_init(context.get()) != 1 ||
      EVP_PKEY_CTX_set_rsa_keygen_bits(context.get(), static_cast<int>(size)) != 1) {
    return nullptr;
  }
  if (!public_exponent.empty()) {
    if (!is_exponent(public_exponent, size)) return nullptr;
    const Number e = to_number(public_exponent);
    if (!e || EVP_PKEY_CTX_set1_rsa_keygen_pubexp(context.get(), e.get()) != 1) return nullptr;
  }
  EVP_PKEY *key = nullptr;
  return EVP_PKEY_generate(context.get(), &key) == 1 ? share(key) : nullptr;
}

}  // namespace

void reuse_generated_keys(size_t limit, const std::string &folder) {
  const std::lock_guard guard(key_pool.lock);
  key_pool.limit = limit;
  key_pool.folder = folder;
  key_pool.keys.clear();
}

SharedKey generate_rsa_key(uint32_t size, const std::vector<uint8_t> &public_exponent) {
  if (!public_exponent.empty()) return make_rsa_key(size, public_exponent);
  SharedKey key = key_pool.take(size);
  if (key != nullptr) return key;
  key = make_rsa_key(size, {});
  if (key != nullptr) key_pool.keep(size, key);
  return key;
}

void export_rsa_key(const EVP_PKEY &key, Attributes *attributes) {
  std::array<Number, std::size(kRsaAttributes)> values;
  size_t total_len = 0;
  for (size_t i = 0; i < values.size(); ++i) {
    BIGNUM *value = nullptr;
    if (EVP_PKEY_get_bn_param(&key, kRsaAttributes[i].param, &value) != 1) {
      panic("OpenSSL", "a generated key lacks a component");
    }
    values[i].reset(value);
    total_len += static_cast<size_t>(BN_num_bytes(value));
  }
  attributes->reset(total_len);
  for (size_t i = 0; i < values.size(); ++i) attributes->add(kRsaAttributes[i].id, *values[i]);
}

}  // namespace tee
