// SPDX-License-Identifier: BSD-2-Clause
/// Four macros that leave a function on failure. No others hide a return.
#ifndef FAILURE_H
#define FAILURE_H

#include "platform.h"

/// Logs a line of level TEE_TRACE_ERROR.
#define trace_error(function, line, ...) tee_trace(function, line, TEE_TRACE_ERROR, __VA_ARGS__)

/// Logs the text, a printf format with its arguments, and returns `code`.
#define FAIL(code, ...) FAIL_AS(__func__, code, __VA_ARGS__)

/// Unless `cond` holds: FAIL(code, ...).
#define CHECK(cond, code, ...) CHECK_AS(__func__, cond, code, __VA_ARGS__)

/// Returns the code of a call that failed; the callee has said why.
#define TRY(call)                     \
  do {                                \
    const TEE_Result r_ = (call);     \
    if (r_ != TEE_SUCCESS) return r_; \
  } while (0)

/// The same, and adds a line of our own: `text` ends in a conversion for the code.
#define TRY_LOG(call, text) TRY_LOG_AS(__func__, call, text)

/// FAIL, CHECK and TRY_LOG for a stage that logs under the name of the operation it was split from.
/// That is its last parameter:
///
///     static TEE_Result stage(int input, const char *as = __builtin_FUNCTION());
///
/// The operation leaves it out, and it is the operation's name; a stage that calls another hands
/// its own `as` on.
/// @{
#define FAIL_AS(as, code, ...)              \
  do {                                      \
    trace_error(as, __LINE__, __VA_ARGS__); \
    return (code);                          \
  } while (0)

#define CHECK_AS(as, cond, code, ...)            \
  do {                                           \
    if (!(cond)) FAIL_AS(as, code, __VA_ARGS__); \
  } while (0)

#define TRY_LOG_AS(as, call, text)                    \
  do {                                                \
    const TEE_Result r_ = (call);                     \
    if (r_ != TEE_SUCCESS) FAIL_AS(as, r_, text, r_); \
  } while (0)
/// @}

#endif
