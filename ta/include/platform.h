// SPDX-License-Identifier: BSD-2-Clause
/// The one door to the platform: no other file of a trusted application includes a header of a kit.
///
/// Kits are written for C. Theirs are given C linkage here, whatever they say themselves, and so
/// are C's string functions, which come from the kit. Its macros are in force from here on: names
/// such as __data, __unused, min, swap, BIT or fallthrough are theirs.
#ifndef PLATFORM_H
#define PLATFORM_H

// First and outside: what the headers below include again is then nothing.
#include <stdarg.h>
#include <stdbool.h>
#include <stddef.h>
#include <stdint.h>

extern "C" {

#include <string.h>
//
#include <tee_internal_api.h>
//
#include <tee_trace.h>
// Kits that have this one declare the entry points there.
#if __has_include(<tee_ta_api.h>)
#include <tee_ta_api.h>
#endif

/// The five functions that a TEE calls. Declared here as well, because not every kit's header of
/// the API does; they are seen from outside the image.
/// @{
#define TA_ENTRY_POINT __attribute__((__visibility__("default")))
TA_ENTRY_POINT TEE_Result TA_CreateEntryPoint(void);
TA_ENTRY_POINT void TA_DestroyEntryPoint(void);
TA_ENTRY_POINT TEE_Result TA_OpenSessionEntryPoint(uint32_t param_types, TEE_Param params[4],
                                                   void **session);
TA_ENTRY_POINT void TA_CloseSessionEntryPoint(void *session);
TA_ENTRY_POINT TEE_Result TA_InvokeCommandEntryPoint(void *session, uint32_t command_id,
                                                     uint32_t param_types, TEE_Param params[4]);
#undef TA_ENTRY_POINT
/// @}
}

/// Never defined: names the type that the last parameter of a function points to.
template <class R, class A, class B, class C, class D, class Length>
Length length_parameter(R (*)(A, B, C, D, Length *));

/// The type behind the length pointers of TEE_* functions: uint32_t up to Internal Core API 1.1,
/// size_t in 1.3. Lengths of our own are uint32_t everywhere.
using tee_length = decltype(length_parameter(&TEE_MACComputeFinal));

#endif
