// SPDX-License-Identifier: BSD-2-Clause
#include "rsa_works.h"

#include <openssl/core_names.h>
#include <openssl/evp.h>
#include <openssl/rsa.h>

#include <list>
#include <memory>

#include "inside.h"
#include "support/manager.h"

namespace bench {
namespace {

using Number = std::shared_ptr<BIGNUM>;
using KeyContext = std::shared_ptr<EVP_PKEY_CTX>;

// RFC 8017, section 9.2: what is signed is a DigestInfo. OpenSSL makes it when it is told the
// digest, and then looks that up for each operation.
const std::string kSha256Info = tsm::hex_decode("3031300d060960864801650304020105000420").value();

Number number_of_key(const char *name) {
  BIGNUM *value = nullptr;
  require(EVP_PKEY_get_bn_param(otrp_test::key_named("floor").get(), name, &value));
  return {value, BN_clear_free};
}

/// The numbers of a key, in the byte order that OpenSSL imports.
class KeyNumbers {
 public:
  explicit KeyNumbers(Form form) {
    const struct {
      const char *name;
      Form first;  // the form that begins to have the number
    } numbers[] = {{OSSL_PKEY_PARAM_RSA_N, Form::kPublic},
                   {OSSL_PKEY_PARAM_RSA_E, Form::kPublic},
                   {OSSL_PKEY_PARAM_RSA_D, Form::kPair},
                   {OSSL_PKEY_PARAM_RSA_FACTOR1, Form::kPair},
                   {OSSL_PKEY_PARAM_RSA_FACTOR2, Form::kPair},
                   {OSSL_PKEY_PARAM_RSA_EXPONENT1, Form::kPair},
                   {OSSL_PKEY_PARAM_RSA_EXPONENT2, Form::kPair},
                   {OSSL_PKEY_PARAM_RSA_COEFFICIENT1, Form::kPair}};
    for (const auto &number : numbers) {
      if (number.first <= form) add(number.name);
    }
    params_.push_back(OSSL_PARAM_construct_end());
  }
  KeyNumbers(const KeyNumbers &) = delete;
  KeyNumbers &operator=(const KeyNumbers &) = delete;

  std::shared_ptr<EVP_PKEY> make_key() const {
    EVP_PKEY *key = nullptr;
    const int selection = params_.size() > 3 ? EVP_PKEY_KEYPAIR : EVP_PKEY_PUBLIC_KEY;
    require(EVP_PKEY_fromdata_init(import_.get()));
    require(EVP_PKEY_fromdata(import_.get(), &key, selection,
                              const_cast<OSSL_PARAM *>(params_.data())));
    return {key, EVP_PKEY_free};
  }

 private:
  void add(const char *name) {
    const Number value = number_of_key(name);
    std::string &bytes = bytes_.emplace_back(static_cast<size_t>(BN_num_bytes(value.get())), 0);
    auto *at = reinterpret_cast<uint8_t *>(bytes.data());
    require(BN_bn2lebinpad(value.get(), at, static_cast<int>(bytes.size())));
    params_.push_back(OSSL_PARAM_construct_BN(name, at, bytes.size()));
  }

  const KeyContext import_{EVP_PKEY_CTX_new_from_name(nullptr, "RSA", nullptr), EVP_PKEY_CTX_free};
  std::list<std::string> bytes_;
  std::vector<OSSL_PARAM> params_;
};

// The rest of the numbers for a pair whose primes have been found.
Work completion() {
  const Number p = number_of_key(OSSL_PKEY_PARAM_RSA_FACTOR1);
  const Number q = number_of_key(OSSL_PKEY_PARAM_RSA_FACTOR2);
  const Number d = number_of_key(OSSL_PKEY_PARAM_RSA_D);
  BN_set_flags(p.get(), BN_FLG_CONSTTIME);
  return [=] {
    const std::unique_ptr<BN_CTX, decltype(&BN_CTX_free)> scratch(BN_CTX_secure_new(), BN_CTX_free);
    BN_CTX_start(scratch.get());
    BIGNUM *result = BN_CTX_get(scratch.get());
    require(BN_mod_inverse(result, q.get(), p.get(), scratch.get()) != nullptr);
    require(BN_mod(result, d.get(), p.get(), scratch.get()));
    require(BN_mod(result, d.get(), q.get(), scratch.get()));
    BN_CTX_end(scratch.get());
  };
}

Work rsa(Form form, Keys keys, int (*start)(EVP_PKEY_CTX *, const OSSL_PARAM *),
         std::function<void(EVP_PKEY_CTX *)> run) {
  const auto numbers = std::make_shared<KeyNumbers>(form);
  const auto make_context = [=](const std::shared_ptr<EVP_PKEY> &key) {
    KeyContext context(EVP_PKEY_CTX_new(key.get(), nullptr), EVP_PKEY_CTX_free);
    char padding[] = OSSL_PKEY_RSA_PAD_MODE_PKCSV15;
    const OSSL_PARAM params[] = {
        OSSL_PARAM_construct_utf8_string(OSSL_PKEY_PARAM_PAD_MODE, padding, 0),
        OSSL_PARAM_construct_end()};
    require(start(context.get(), params));
    return context;
  };
  const Work make = [=] { run(make_context(numbers->make_key()).get()); };
  if (keys == Keys::kNew && form != Form::kPublic) {
    return form == Form::kPairWithoutPrimes ? in_order({completion(), make}) : make;
  }
  const auto key = numbers->make_key();
  if (keys != Keys::kPrepared) return [=] { run(make_context(key).get()); };
  return [context = make_context(key), run] { run(context.get()); };
}

}  // namespace

Work rsa_encrypt(Keys keys) {
  return rsa(Form::kPublic, keys, EVP_PKEY_encrypt_init_ex, [](EVP_PKEY_CTX *context) {
    size_t len = kRsaLen;
    require(EVP_PKEY_encrypt(context, scratch().out.data(), &len, scratch().in.data(), kCekLen));
  });
}

Work rsa_decrypt(Form form, Keys keys) {
  const std::string sealed =
      tsm::rsa1_5_encrypt(otrp_test::key_named("floor"), std::string(kCekLen, 'k'));
  return rsa(form, keys, EVP_PKEY_decrypt_init_ex, [=](EVP_PKEY_CTX *context) {
    size_t len = kRsaLen;
    require(EVP_PKEY_decrypt(context, scratch().out.data(), &len, bytes_of(sealed), sealed.size()));
  });
}

Work rsa_sign(Form form, Keys keys) {
  return rsa(form, keys, EVP_PKEY_sign_init_ex, [](EVP_PKEY_CTX *context) {
    size_t len = kRsaLen;
    require(EVP_PKEY_sign(context, scratch().out.data(), &len, scratch().in.data(),
                          kSha256Info.size() + kDigestLen));
  });
}

Work rsa_verify(Keys keys) {
  const std::string signature = tsm::rs256_sign(otrp_test::key_named("floor"), "text");
  const std::string info = kSha256Info + tsm::sha256("text");
  return rsa(Form::kPublic, keys, EVP_PKEY_verify_init_ex, [=](EVP_PKEY_CTX *context) {
    require(EVP_PKEY_verify(context, bytes_of(signature), signature.size(), bytes_of(info),
                            info.size()));
  });
}
}  // namespace bench
