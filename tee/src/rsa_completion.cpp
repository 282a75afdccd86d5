// SPDX-License-Identifier: BSD-2-Clause
#include "rsa_completion.h"

#include <tee_internal_api.h>

#include <algorithm>
#include <cmath>
#include <new>
#include <optional>

#include "evp.h"

namespace tee {

namespace {

// How many times as large as λ(n) φ(n) may be. A try takes less than a thousandth of a private
// operation.
constexpr int kMaxFactor = 256;

// By how many bits k(p + q − 1) is shorter than n, which one of 256 other numbers is as well.
constexpr int kBitsMissing = 8;

constexpr int kWordBits = 8 * sizeof(BN_ULONG);

// Of what is computed here nothing fails but for want of memory.
void require(int done) {
  if (done != 1) throw std::bad_alloc();
}

/// Numbers that live as long as it does, and are overwritten then.
class Scratch {
 public:
  Scratch() : context_(BN_CTX_secure_new()) {
    require(context_ != nullptr);
    BN_CTX_start(context_.get());
  }
  ~Scratch() { BN_CTX_end(context_.get()); }
  Scratch(const Scratch &) = delete;
  Scratch &operator=(const Scratch &) = delete;

  BIGNUM *number() {
    BIGNUM *number = BN_CTX_get(context_.get());
    require(number != nullptr);
    return number;
  }
  BIGNUM *number(Attributes::Value value) {
    BIGNUM *number = BN_bin2bn(value.data(), static_cast<int>(value.size()), this->number());
    require(number != nullptr);
    return number;
  }
  BN_CTX *context() { return context_.get(); }

 private:
  std::unique_ptr<BN_CTX, FreedBy<BN_CTX_free>> context_;
};

/// The larger one first.
struct Primes {
  BIGNUM *p;
  BIGNUM *q;
};

BN_ULONG root_of_word(BN_ULONG word) {
  constexpr BN_ULONG kMaxRoot = UINT32_MAX;
  const auto root = static_cast<BN_ULONG>(std::sqrt(static_cast<double>(word)));
  return std::min(root, kMaxRoot);
}

// By Zimmermann's method, which doubles the leading bits that it knows the root of: what the known
// half of the root leaves of them, divided by twice that half, is the other half, or too much by
// little.
BIGNUM *root_of(const BIGNUM *number, Scratch &scratch) {
  BIGNUM *root = scratch.number(), *square = scratch.number();
  BIGNUM *leading = scratch.number(), *half = scratch.number(), *shifted = scratch.number();
  int size = kWordBits;
  int total = size;
  while (total < BN_num_bits(number)) total *= 2;
  const int shift = (total - BN_num_bits(number)) / 2;
  require(BN_lshift(shifted, number, 2 * shift));

  require(BN_rshift(leading, shifted, total - size));
  require(BN_set_word(root, root_of_word(BN_get_word(leading))));
  for (;;) {
    require(BN_sqr(square, root, scratch.context()));
    while (BN_cmp(square, leading) > 0) {
      require(BN_sub_word(root, 1));
      require(BN_sqr(square, root, scratch.context()));
    }
    if (size == total) break;
    size *= 2;
    require(BN_rshift(leading, shifted, total - size));
    require(BN_lshift(square, square, size / 2));
    require(BN_sub(half, leading, square));
    require(BN_rshift(half, half, size / 4));
    require(BN_lshift1(square, root));
    require(BN_div(half, nullptr, half, square, scratch.context()));
    require(BN_lshift(root, root, size / 4));
    require(BN_add(root, root, half));
  }
  require(BN_rshift(root, root, shift));
  return root;
}

// The square of p − q is that of p + q less 4n.
std::optional<Primes> split(const BIGNUM *n, const BIGNUM *sum, Scratch &scratch) {
  BIGNUM *square = scratch.number(), *product = scratch.number();
  require(BN_sqr(square, sum, scratch.context()));
  require(BN_lshift(product, n, 2));
  require(BN_sub(square, square, product));
  if (BN_is_negative(square) || BN_is_zero(square)) return {};

  const Primes primes = {scratch.number(), scratch.number()};
  const BIGNUM *difference = root_of(square, scratch);
  require(BN_add(primes.p, sum, difference));
  require(BN_rshift1(primes.p, primes.p));
  require(BN_sub(primes.q, sum, primes.p));
  require(BN_mul(product, primes.p, primes.q, scratch.context()));
  if (BN_cmp(product, n) != 0) return {};
  return primes;
}

// e·d − 1 is a multiple of λ(n), so a small multiple of it is one of φ(n): k times as much. φ(n) is
// n − (p + q − 1), and therefore what that multiple has too little to be kn is k(p + q − 1): much
// less than n, as with hardly any other multiple.
std::optional<Primes> find_primes(const BIGNUM *n, const BIGNUM *e, const BIGNUM *d,
                                  Scratch &scratch) {
  BIGNUM *step = scratch.number(), *step_k = scratch.number(), *step_rest = scratch.number();
  BIGNUM *k = scratch.number(), *rest = scratch.number();
  BIGNUM *missing = scratch.number(), *sum = scratch.number(), *odd = scratch.number();
  require(BN_mul(step, e, d, scratch.context()));
  require(BN_sub_word(step, 1));
  require(BN_div(step_k, step_rest, step, n, scratch.context()));
  require(BN_one(k));
  for (int factor = 1; factor <= kMaxFactor; ++factor) {
    require(BN_add(k, k, step_k));
    require(BN_add(rest, rest, step_rest));
    if (BN_cmp(rest, n) >= 0) {
      require(BN_sub(rest, rest, n));
      require(BN_add_word(k, 1));
    }
    require(BN_sub(missing, n, rest));
    if (BN_num_bits(missing) > BN_num_bits(n) - kBitsMissing) continue;
    require(BN_div(sum, odd, missing, k, scratch.context()));
    if (!BN_is_zero(odd)) continue;
    require(BN_add_word(sum, 1));
    if (const auto primes = split(n, sum, scratch)) return primes;
  }
  return {};
}

BIGNUM *exponent_for(const BIGNUM *prime, const BIGNUM *d, Scratch &scratch) {
  BIGNUM *order = scratch.number(), *exponent = scratch.number();
  require(BN_copy(order, prime) != nullptr);
  require(BN_sub_word(order, 1));
  require(BN_mod(exponent, d, order, scratch.context()));
  return exponent;
}

}  // namespace

void find_crt_part(const Attributes &key, Attributes *part) {
  Scratch scratch;
  const BIGNUM *n = scratch.number(key.at(TEE_ATTR_RSA_MODULUS));
  const BIGNUM *e = scratch.number(key.at(TEE_ATTR_RSA_PUBLIC_EXPONENT));
  const BIGNUM *d = scratch.number(key.at(TEE_ATTR_RSA_PRIVATE_EXPONENT));
  const auto primes = find_primes(n, e, d, scratch);
  if (!primes) return;

  // The flag chooses an inversion whose steps do not tell the numbers.
  BN_set_flags(primes->p, BN_FLG_CONSTTIME);
  const BIGNUM *coefficient =
      BN_mod_inverse(scratch.number(), primes->q, primes->p, scratch.context());
  const BIGNUM *exponent1 = exponent_for(primes->p, d, scratch);
  const BIGNUM *exponent2 = exponent_for(primes->q, d, scratch);
  if (coefficient == nullptr || BN_is_zero(exponent1) || BN_is_zero(exponent2)) return;

  // No number is longer than the prime that it is one modulo of.
  const int total_len = 3 * BN_num_bytes(primes->p) + 2 * BN_num_bytes(primes->q);
  part->reset(static_cast<size_t>(total_len));
  part->add(TEE_ATTR_RSA_PRIME1, *primes->p);
  part->add(TEE_ATTR_RSA_PRIME2, *primes->q);
  part->add(TEE_ATTR_RSA_EXPONENT1, *exponent1);
  part->add(TEE_ATTR_RSA_EXPONENT2, *exponent2);
  part->add(TEE_ATTR_RSA_COEFFICIENT, *coefficient);
}

}  // namespace tee
