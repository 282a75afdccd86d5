// SPDX-License-Identifier: BSD-2-Clause
/// The trace facility over the message function of kits of the make kind, whose levels have the
/// same numbers. They show a message according to their own settings.
#ifndef TEE_TRACE_H
#define TEE_TRACE_H

#include <trace.h>

#define TEE_TRACE_ALWAYS 0
#define TEE_TRACE_ERROR 1
#define TEE_TRACE_INFO 2
#define TEE_TRACE_DEBUG 3
#define TEE_TRACE_FLOW 4

#define tee_trace(function, line, level, ...) \
  trace_printf(function, line, level, (level) != TEE_TRACE_ALWAYS, __VA_ARGS__)

#endif
