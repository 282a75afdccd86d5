// SPDX-License-Identifier: BSD-2-Clause
// By the division steps of Bernstein and Yang, "Fast constant-time gcd computation and modular
// inversion" (2019), with a half for the first δ, and a matrix for as many steps as a word holds.
// OpenSSL's own inversion in constant time divides bit by bit and takes many times as long.
#include "inversion.h"

#include <openssl/crypto.h>

#include <cstdint>
#include <new>
#include <vector>

namespace tee {

namespace {

#ifdef __SIZEOF_INT128__
using Limb = int64_t;
using Word = uint64_t;
using Sum = __int128;
#else
using Limb = int32_t;
using Word = uint32_t;
using Sum = int64_t;
#endif

// A sum of three products of limbs fits.
constexpr int kLimbBits = 8 * sizeof(Limb) - 2;
constexpr Limb kLimbMask = (Limb{1} << kLimbBits) - 1;
constexpr int kStepsAtATime = kLimbBits;

constexpr Limb sign_of(Limb number) {
  return number >> (8 * sizeof(Limb) - 1);
}

/// A number in two's complement: the lowest limb first, and the last one signed.
class Limbs {
 public:
  explicit Limbs(size_t len) : limbs_(len) {}
  Limbs(const BIGNUM &number, size_t len) : limbs_(len) {
    std::vector<uint8_t> bytes(len * kLimbBits / 8 + 1);
    if (BN_bn2lebinpad(&number, bytes.data(), static_cast<int>(bytes.size())) < 0) {
      throw std::bad_alloc();
    }
    Sum window = 0;
    int num_bits = 0;
    auto next = bytes.begin();
    for (Limb &limb : limbs_) {
      for (; num_bits < kLimbBits; num_bits += 8) window |= Sum{*next++} << num_bits;
      limb = static_cast<Limb>(window & kLimbMask);
      window >>= kLimbBits;
      num_bits -= kLimbBits;
    }
    OPENSSL_cleanse(bytes.data(), bytes.size());
  }
  ~Limbs() { OPENSSL_cleanse(limbs_.data(), limbs_.size() * sizeof limbs_[0]); }
  Limbs(const Limbs &) = delete;
  Limbs &operator=(const Limbs &) = delete;

  size_t size() const { return limbs_.size(); }
  Limb &operator[](size_t i) { return limbs_[i]; }
  Limb operator[](size_t i) const { return limbs_[i]; }

  /// All ones when it is negative, else 0.
  Limb sign() const { return sign_of(limbs_.back()); }

  /// Adds `other` when `mask` is all ones; nothing when it is 0.
  void add(const Limbs &other, Limb mask) {
    Limb carry = 0;
    for (size_t i = 0; i < size(); ++i) carry = put(i, carry + limbs_[i] + (other[i] & mask));
  }

  void negate(Limb mask) {
    Limb carry = 0;
    for (size_t i = 0; i < size(); ++i) carry = put(i, carry + (limbs_[i] ^ mask) - mask);
  }

  /// Whether it is `number`, which has one limb.
  bool is(Limb number) const {
    Limb difference = limbs_[0] ^ number;
    for (size_t i = 1; i < size(); ++i) difference |= limbs_[i];
    return difference == 0;
  }

  /// Of a number that is not negative.
  void write_to(BIGNUM &number) const {
    std::vector<uint8_t> bytes;
    bytes.reserve(size() * kLimbBits / 8 + 1);
    Sum window = 0;
    int num_bits = 0;
    for (const Limb limb : limbs_) {
      window |= Sum{limb} << num_bits;
      for (num_bits += kLimbBits; num_bits >= 8; num_bits -= 8) {
        bytes.push_back(static_cast<uint8_t>(window));
        window >>= 8;
      }
    }
    bytes.push_back(static_cast<uint8_t>(window));
    const bool written = BN_lebin2bn(bytes.data(), static_cast<int>(bytes.size()), &number);
    OPENSSL_cleanse(bytes.data(), bytes.size());
    if (!written) throw std::bad_alloc();
  }

 private:
  // Returns what goes on to the next limb.
  Limb put(size_t i, Limb sum) {
    const bool is_last = i + 1 == size();
    limbs_[i] = is_last ? sum : sum & kLimbMask;
    return sum >> kLimbBits;
  }

  std::vector<Limb> limbs_;
};

/// What the steps make of f and g: u·f + v·g and q·f + r·g, without their lowest limb, which is 0.
struct Matrix {
  Limb u, v, q, r;
};

// `eta` is −(δ + 1/2). f is odd; of both only the lowest limb matters.
Matrix make_steps(Limb &eta, Word f, Word g) {
  Word u = 1, v = 0, q = 0, r = 1;
  for (int i = 0; i < kStepsAtATime; ++i) {
    const Word is_odd = -(g & 1);
    const auto is_below = static_cast<Word>(sign_of(eta));
    g += ((f ^ is_below) - is_below) & is_odd;
    q += ((u ^ is_below) - is_below) & is_odd;
    r += ((v ^ is_below) - is_below) & is_odd;
    const Word swaps = is_below & is_odd;
    eta = (eta ^ static_cast<Limb>(swaps)) - 1;
    f += g & swaps;
    u += q & swaps;
    v += r & swaps;
    g >>= 1;
    u <<= 1;
    v <<= 1;
  }
  return {static_cast<Limb>(u), static_cast<Limb>(v), static_cast<Limb>(q), static_cast<Limb>(r)};
}

/// The sum of products of one row of a matrix, limb by limb.
struct Row {
  Limb a, b;
  Sum sum = 0;

  void add(Limb x, Limb y) { sum += Sum{a} * x + Sum{b} * y; }
  Limb take() {
    const auto limb = static_cast<Limb>(sum & kLimbMask);
    sum >>= kLimbBits;
    return limb;
  }
};

void apply(const Matrix &matrix, Limbs &f, Limbs &g) {
  Row first = {matrix.u, matrix.v}, second = {matrix.q, matrix.r};
  for (size_t i = 0; i < f.size(); ++i) {
    first.add(f[i], g[i]);
    second.add(f[i], g[i]);
    const Limb new_f = first.take(), new_g = second.take();
    if (i == 0) continue;
    f[i - 1] = new_f;
    g[i - 1] = new_g;
  }
  f[f.size() - 1] = static_cast<Limb>(first.sum);
  g[g.size() - 1] = static_cast<Limb>(second.sum);
}

/// The modulus, and its inverse modulo that of a word.
struct Modulus {
  Modulus(const BIGNUM &number, size_t len) : limbs(number, len) {
    const auto lowest = static_cast<Word>(limbs[0]);
    inverse = lowest;  // right in three bits; each round doubles them
    for (int i = 0; i < 5; ++i) inverse *= 2 - lowest * inverse;
  }

  /// How often to add the modulus to `sum` for its lowest limb to become 0; starts from `times`,
  /// which makes up for what is negative.
  Limb times_for(Sum sum, Limb times) const {
    const Word more = inverse * static_cast<Word>(sum) + static_cast<Word>(times);
    return times - static_cast<Limb>(more & kLimbMask);
  }

  const Limbs limbs;
  Word inverse;
};

// The same modulo the modulus. Both numbers are above −2 and below 1 times that, and stay so.
void apply(const Matrix &matrix, const Modulus &modulus, Limbs &d, Limbs &e) {
  Row first = {matrix.u, matrix.v}, second = {matrix.q, matrix.r};
  const Limb less_d = (matrix.u & d.sign()) + (matrix.v & e.sign());
  const Limb less_e = (matrix.q & d.sign()) + (matrix.r & e.sign());
  Limb times_d = 0, times_e = 0;
  for (size_t i = 0; i < d.size(); ++i) {
    first.add(d[i], e[i]);
    second.add(d[i], e[i]);
    if (i == 0) {
      times_d = modulus.times_for(first.sum, less_d);
      times_e = modulus.times_for(second.sum, less_e);
    }
    first.sum += Sum{times_d} * modulus.limbs[i];
    second.sum += Sum{times_e} * modulus.limbs[i];
    const Limb new_d = first.take(), new_e = second.take();
    if (i == 0) continue;
    d[i - 1] = new_d;
    e[i - 1] = new_e;
  }
  d[d.size() - 1] = static_cast<Limb>(first.sum);
  e[e.size() - 1] = static_cast<Limb>(second.sum);
}

// After so many steps g is 0, for numbers of so many bits.
int steps_for(int num_bits) {
  return static_cast<int>((int64_t{45907} * num_bits + 26313) / 19929) + 1;
}

}  // namespace

bool invert(const BIGNUM &value, const BIGNUM &modulus, BIGNUM &inverse) {
  const int num_bits = BN_num_bits(&modulus);
  const auto len = static_cast<size_t>(num_bits + 2) / kLimbBits + 1;
  const Modulus m(modulus, len);
  Limbs f(modulus, len), g(value, len), d(len), e(len);
  e[0] = 1;
  Limb eta = -1;
  for (int steps = steps_for(num_bits); steps > 0; steps -= kStepsAtATime) {
    const Matrix matrix = make_steps(eta, static_cast<Word>(f[0]), static_cast<Word>(g[0]));
    apply(matrix, f, g);
    apply(matrix, m, d, e);
  }
  // f is the greatest common divisor or its negative, and d what it takes of the value to get it.
  const Limb is_negative = f.sign();
  f.negate(is_negative);
  d.add(m.limbs, d.sign());
  d.negate(is_negative);
  d.add(m.limbs, d.sign());
  d.write_to(inverse);
  return f.is(1);
}

}  // namespace tee
