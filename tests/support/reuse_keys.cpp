// SPDX-License-Identifier: BSD-2-Clause
// Linked into test programs that are emulated: finding RSA keys would be most of their work. More
// keys than a test has at a time, so that those which it compares still differ.
#include <tee_test.h>

[[maybe_unused]] static const bool is_reusing = (tee::test::reuse_generated_keys(16), true);
