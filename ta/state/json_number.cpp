// SPDX-License-Identifier: BSD-2-Clause
// Short numbers take one exact operation. Any other is guessed in doubles, and the guess corrected
// by comparing in whole numbers with the points halfway to its neighbours.
#include "state/json_number.h"

#include "ownership.h"

namespace {

// A halfway point between two doubles has no more digits; what comes behind only says "and more".
constexpr uint32_t kMaxDigits = 768;
// Both sides of a comparison fit: kMaxDigits + 1 digits times 2^1075, and 54 bits times 10^1099.
constexpr uint32_t kNumLimbs = 120;

// Natural numbers: limbs of 32 bits, the lowest first.
struct natural {
  uint32_t limbs[kNumLimbs];
  uint32_t num_limbs;
};

struct comparison {
  natural left;
  natural right;
};

struct decimal {
  const char *first;  // digit that is not zero; NULL when all are
  const char *end;
  int64_t num_digits;  // from the first on
  int64_t exponent;    // of the last
};

constexpr double kPowersOfTen[] = {1e0,  1e1,  1e2,  1e3,  1e4,  1e5,  1e6,  1e7,
                                   1e8,  1e9,  1e10, 1e11, 1e12, 1e13, 1e14, 1e15,
                                   1e16, 1e17, 1e18, 1e19, 1e20, 1e21, 1e22};
constexpr int64_t kLastPower = 22;       // the last that a double holds exactly
constexpr int64_t kExactDigits = 15;     // so many any double holds
constexpr int64_t kGuessDigits = 18;     // so many 64 bits hold
constexpr int64_t kMaxMagnitude = 310;   // 10^309 is too large
constexpr int64_t kMinMagnitude = -330;  // 10^-330 is nothing
constexpr uint64_t kLargestDouble = 0x7FEFFFFFFFFFFFFF;

}  // namespace

static decimal take_apart(const char *at, const char *end, int64_t exponent) {
  decimal number = {nullptr, end, 0, exponent};
  bool in_fraction = false;
  for (; at != end; ++at) {
    if (*at == '.') {
      in_fraction = true;
      continue;
    }
    if (in_fraction) --number.exponent;
    if (number.first == nullptr && *at != '0') number.first = at;
    if (number.first != nullptr) ++number.num_digits;
  }
  return number;
}

// ---- The guess

// Exact when the first kExactDigits digits are all and the exponent is in the table.
static double guess(const decimal &number) {
  uint64_t head = 0;
  int64_t exponent = number.exponent + number.num_digits;
  const int64_t last = exponent - kGuessDigits;
  for (const char *at = number.first; at != number.end && exponent > last; ++at) {
    if (*at == '.') continue;
    head = head * 10 + static_cast<uint64_t>(*at - '0');
    --exponent;
  }
  auto value = static_cast<double>(head);
  for (; exponent > kLastPower; exponent -= kLastPower) value *= kPowersOfTen[kLastPower];
  for (; exponent < -kLastPower; exponent += kLastPower) value /= kPowersOfTen[kLastPower];
  return exponent < 0 ? value / kPowersOfTen[-exponent] : value * kPowersOfTen[exponent];
}

// ---- Whole numbers

static void multiply_add(natural *n, uint32_t factor, uint32_t more) {
  uint64_t carry = more;
  for (uint32_t i = 0; i < n->num_limbs; ++i) {
    carry += uint64_t{n->limbs[i]} * factor;
    n->limbs[i] = static_cast<uint32_t>(carry);
    carry >>= 32;
  }
  if (carry != 0) n->limbs[n->num_limbs++] = static_cast<uint32_t>(carry);
}

static void multiply_by_power(natural *n, uint32_t base, int64_t exponent) {
  const int64_t step = base == 10 ? 9 : 31;
  while (exponent > 0) {
    uint32_t factor = 1;
    for (int64_t i = 0; i < step && exponent > 0; ++i, --exponent) factor *= base;
    multiply_add(n, factor, 0);
  }
}

static int compare(const natural &a, const natural &b) {
  if (a.num_limbs != b.num_limbs) return a.num_limbs < b.num_limbs ? -1 : 1;
  for (uint32_t i = a.num_limbs; i-- > 0;) {
    if (a.limbs[i] != b.limbs[i]) return a.limbs[i] < b.limbs[i] ? -1 : 1;
  }
  return 0;
}

// Returns the exponent that belongs to the digits.
static int64_t read_digits(const decimal &number, natural *n) {
  int64_t left = number.num_digits;
  bool more = false;
  n->num_limbs = 0;
  for (const char *at = number.first; at != number.end; ++at) {
    if (*at == '.') continue;
    if (number.num_digits - left < kMaxDigits) {
      multiply_add(n, 10, static_cast<uint32_t>(*at - '0'));
      --left;
    } else {
      more = more || *at != '0';
    }
  }
  if (more) multiply_add(n, 10, 1);
  return number.exponent + left - (more ? 1 : 0);
}

// Compares the number with the point halfway between the double of these bits and the next.
static int compare_with_halfway(const decimal &number, uint64_t bits, comparison *sides) {
  const auto biased = static_cast<int64_t>(bits >> 52);
  uint64_t halves = 2 * (bits & ((uint64_t{1} << 52) - 1)) + 1;
  if (biased != 0) halves += uint64_t{1} << 53;
  const int64_t binary = (biased != 0 ? biased : 1) - 1076;

  const int64_t exponent = read_digits(number, &sides->left);
  sides->right.limbs[0] = static_cast<uint32_t>(halves);
  sides->right.limbs[1] = static_cast<uint32_t>(halves >> 32);
  sides->right.num_limbs = halves >> 32 != 0 ? 2 : 1;
  multiply_by_power(exponent < 0 ? &sides->right : &sides->left, 10,
                    exponent < 0 ? -exponent : exponent);
  multiply_by_power(binary < 0 ? &sides->left : &sides->right, 2, binary < 0 ? -binary : binary);
  return compare(sides->left, sides->right);
}

// ---- The nearest

static bool correct(const decimal &number, uint64_t *bits) {
  const tee_ptr<comparison> sides(
      reinterpret_cast<comparison *>(allocate_bytes(sizeof(comparison))));
  if (!sides) return false;
  if (*bits > kLargestDouble) *bits = kLargestDouble;
  for (int order = 1; order > 0;) {
    order = compare_with_halfway(number, *bits, sides.get());
    if (order == 0 && *bits % 2 != 0) order = 1;
    if (order > 0) ++*bits;
    if (*bits > kLargestDouble) return false;
  }
  for (int order = -1; order < 0 && *bits != 0;) {
    order = compare_with_halfway(number, *bits - 1, sides.get());
    if (order == 0 && *bits % 2 != 0) order = -1;
    if (order < 0) --*bits;
  }
  return true;
}

bool nearest_double(const char *at, const char *end, int64_t exponent, double *value) {
  *value = 0;
  const decimal number = take_apart(at, end, exponent);
  const int64_t magnitude = number.exponent + number.num_digits;
  if (number.first == nullptr || magnitude < kMinMagnitude) return true;
  if (magnitude > kMaxMagnitude) return false;

  *value = guess(number);
  const bool is_exact = number.num_digits <= kExactDigits && number.exponent <= kLastPower &&
                        number.exponent >= -kLastPower;
  if (is_exact) return true;
  uint64_t bits;
  static_assert(sizeof bits == sizeof *value);
  memcpy(&bits, value, sizeof bits);
  if (!correct(number, &bits)) return false;
  memcpy(value, &bits, sizeof bits);
  return true;
}
