// SPDX-License-Identifier: BSD-2-Clause
#include "../../tee/src/rsa_key.h"

#include <gtest/gtest.h>
#include <tee_internal_api.h>

namespace {

TEST(RsaKey, APairIsCompletedOrWorksAsItIs) {
  struct Prime {
    int power;      // of two
    BN_ULONG less;  // than that
  };
  const struct {
    const char *name;
    std::vector<Prime> primes;
    BN_ULONG e;
    bool found_modulo_phi, found_modulo_lambda;
    BN_ULONG error = 0;  // of the private exponent
  } kCases[] = {
      {"512 bits", {{257, 93}, {255, 735}}, 3, true, true},
      {"1024 bits", {{513, 445}, {511, 187}}, 17, true, true},
      {"2048 bits", {{1025, 2673}, {1023, 361}}, 65537, true, true},
      {"4096 bits", {{2049, 1449}, {2047, 85}}, 65537, true, true},
      {"LongExponent", {{1025, 3925}, {1023, 777}}, 0xffffffffffffffc5, true, true},
      {"UnequalPrimes", {{1700, 395}, {348, 359}}, 65537, true, true},
      {"TimesLambda222", {{513, 1621}, {511, 18109}}, 65537, true, true},
      {"TimesLambda7506", {{513, 1483}, {511, 26641}}, 65537, true, false},
      {"ThreePrimes", {{257, 93}, {255, 735}, {127, 1}}, 65537, false, false},
      {"WrongExponent", {{513, 445}, {511, 187}}, 17, false, false, 2},
  };
  for (const auto &c : kCases) {
    SCOPED_TRACE(c.name);
    const std::unique_ptr<BN_CTX, tee::FreedBy<BN_CTX_free>> scratch(BN_CTX_new());
    const auto number = [&](auto compute, auto... inputs) {
      BIGNUM *result = BN_CTX_get(scratch.get());
      compute(result, inputs...);
      return result;
    };
    BN_CTX_start(scratch.get());
    const BIGNUM *e = number(BN_set_word, c.e);
    const BIGNUM *n = BN_value_one(), *phi = n, *lambda = n;
    for (const Prime &prime : c.primes) {
      BIGNUM *p = number(BN_set_bit, prime.power);
      BN_sub_word(p, prime.less);
      n = number(BN_mul, n, p, scratch.get());
      BN_sub_word(p, 1);
      phi = number(BN_mul, phi, p, scratch.get());
      const BIGNUM *common = number(BN_gcd, lambda, p, scratch.get());
      BN_div(p, nullptr, p, common, scratch.get());
      lambda = number(BN_mul, lambda, p, scratch.get());
    }
    for (const BIGNUM *order : {phi, lambda}) {
      BIGNUM *d = number(BN_mod_inverse, e, order, scratch.get());
      BN_add_word(d, c.error);
      tee::Attributes attributes(3 * size_t{tee::kMaxRsaSize / 8});
      attributes.add(TEE_ATTR_RSA_MODULUS, *n);
      attributes.add(TEE_ATTR_RSA_PUBLIC_EXPONENT, *e);
      attributes.add(TEE_ATTR_RSA_PRIVATE_EXPONENT, *d);
      const tee::SharedKey key = tee::import_rsa_key(attributes);
      const tee::KeyContext context(EVP_PKEY_CTX_new_from_pkey(nullptr, key.get(), nullptr));
      EXPECT_EQ(EVP_PKEY_check(context.get()) == 1,
                order == phi ? c.found_modulo_phi : c.found_modulo_lambda);

      uint8_t text[20] = {}, signature[512];
      size_t len = sizeof signature;
      EVP_PKEY_sign_init(context.get());
      EXPECT_EQ(EVP_PKEY_sign(context.get(), signature, &len, text, sizeof text), 1);
      EVP_PKEY_verify_init(context.get());
      EXPECT_EQ(EVP_PKEY_verify(context.get(), signature, len, text, sizeof text) == 1,
                c.error == 0);
    }
    BN_CTX_end(scratch.get());
  }
}

// More of them than are kept, and each of them again.
TEST(RsaKey, APublicKeyIsTheOneOfItsNumbers) {
  for (uint8_t i = 0; i < 40; ++i) {
    std::vector<uint8_t> n(64, 0xff), e(1, i % 2 == 0 ? 3 : 5);
    n[1] = i % 20 & 0xfe;
    tee::Attributes attributes(n.size() + e.size());
    attributes.add(TEE_ATTR_RSA_MODULUS, n);
    attributes.add(TEE_ATTR_RSA_PUBLIC_EXPONENT, e);
    const tee::SharedKey key = tee::import_rsa_key(attributes);
    for (auto [name, number] : {std::pair{"n", n}, std::pair{"e", e}}) {
      BIGNUM *value = nullptr;
      ASSERT_EQ(EVP_PKEY_get_bn_param(key.get(), name, &value), 1);
      const tee::Number owned(value);
      std::vector<uint8_t> bytes(static_cast<size_t>(BN_num_bytes(value)));
      BN_bn2bin(value, bytes.data());
      EXPECT_EQ(bytes, number) << int{i};
    }
  }
}

}  // namespace
