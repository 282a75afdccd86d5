// SPDX-License-Identifier: BSD-2-Clause
/// Differences between the kits of TEE vendors, met in one place.
#ifndef PLATFORM_H
#define PLATFORM_H

#include <stdint.h>
#include <tee_internal_api.h>

/// Never defined: names the type that the last parameter of a function points to.
template <class R, class A, class B, class C, class D, class Length>
Length length_parameter(R (*)(A, B, C, D, Length *));

/// The type behind the length pointers of TEE_* functions: uint32_t up to Internal Core API 1.1,
/// size_t in 1.3. The agent's own lengths are uint32_t everywhere.
using tee_length = decltype(length_parameter(&TEE_MACComputeFinal));

#endif
