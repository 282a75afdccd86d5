// SPDX-License-Identifier: BSD-2-Clause
// Linked into test programs: finding RSA keys would be most of their work. More keys than a test
// compares, so that those still differ.
#include <tee_test.h>

#include "support/kept_key.h"

[[maybe_unused]] static const bool is_reusing =
    (tee::test::reuse_generated_keys(8, otrp_test::key_folder()), true);
