// SPDX-License-Identifier: BSD-2-Clause
#include "../../tee/src/inversion.h"

#include <gtest/gtest.h>

#include "../../tee/src/evp.h"

namespace {

using Number = std::unique_ptr<BIGNUM, tee::FreedBy<BN_free>>;

std::string hex(const BIGNUM *number) {
  char *digits = BN_bn2hex(number);
  const std::string text = digits;
  OPENSSL_free(digits);
  return text;
}

// Lengths about a limb's and about several, where a carry or a sign might find no room.
TEST(Inversion, AgreesWithOpenSsl) {
  const std::unique_ptr<BN_CTX, tee::FreedBy<BN_CTX_free>> scratch(BN_CTX_new());
  const Number modulus(BN_new()), value(BN_new()), wanted(BN_new()), found(BN_new());
  for (const int num_bits :
       {2, 3, 29, 30, 31, 58, 59, 60, 61, 62, 63, 122, 123, 124, 185, 186, 1024, 2047, 4096}) {
    for (int i = 0; i < 40; ++i) {
      BN_rand(modulus.get(), num_bits, i % 2 == 0 ? BN_RAND_TOP_ONE : BN_RAND_TOP_TWO, 1);
      BN_set_word(value.get(), 1);
      if (i % 4 == 1) BN_sub(value.get(), modulus.get(), value.get());
      if (i % 4 > 1) {
        do BN_rand_range(value.get(), modulus.get());
        while (BN_is_zero(value.get()));
      }
      ERR_set_mark();
      const bool is_coprime =
          BN_mod_inverse(wanted.get(), value.get(), modulus.get(), scratch.get()) != nullptr;
      ERR_pop_to_mark();
      SCOPED_TRACE(hex(value.get()) + " mod " + hex(modulus.get()));
      EXPECT_EQ(tee::invert(*value, *modulus, *found), is_coprime);
      if (is_coprime) {
        EXPECT_EQ(hex(found.get()), hex(wanted.get()));
      }
    }
  }
}

}  // namespace
