// SPDX-License-Identifier: BSD-2-Clause
/// The trace facility of the TEE: one log line per call, on standard error or in a test's sink.
///
/// A line reads "LEVEL [0xTHREAD] PREFIX:FUNCTION:LINE: MESSAGE". The prefix and the highest level
/// that appears come from the image header of the trusted application that calls. Control
/// characters in a message, which may come from outside, are printed as "\xNN".
#ifndef TEE_TRACE_H
#define TEE_TRACE_H

#ifdef __cplusplus
extern "C" {
#endif

/// Levels of log lines, the most important first.
/// @{
#define TEE_TRACE_ALWAYS 0
#define TEE_TRACE_ERROR 1
#define TEE_TRACE_INFO 2
#define TEE_TRACE_DEBUG 3
#define TEE_TRACE_FLOW 4
/// @}

/// Logs a line, as from line `line` of `function`. `level` is one of the above: tags "MSG" (logged
/// whatever the TA's level), "ERR", "INF", "DBG", "FLW"; any other level is tagged "UKN". `format`
/// is printf's; a line feed is added at its end unless it has one.
void tee_trace(const char *function, int line, int level, const char *format, ...)
    __attribute__((format(printf, 4, 5)));

#ifdef __cplusplus
}
#endif

#endif
