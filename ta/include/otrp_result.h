// SPDX-License-Identifier: BSD-2-Clause
/// Result codes of the agent, and the conventions that every function of it keeps.
///
/// A function returns TEE_SUCCESS or a code that says what went wrong: one of those below or a
/// code of the platform, passed through unchanged. It hands results out through out-parameters.
/// After a failure it has handed out nothing: pointers are NULL and lengths 0. A buffer, text or
/// JSON value that is handed out belongs to the caller. Buffers come from TEE_Malloc and go back
/// with TEE_Free. Lengths are in bytes and leave out a terminating NUL. Whoever finds a failure
/// logs it, once.
#ifndef OTRP_RESULT_H
#define OTRP_RESULT_H

#include <tee_internal_api.h>

/// Codes of the agent's own. Clients see them as results of an invocation, as status words of
/// answers, and as "error_code" in responses.
enum : TEE_Result {
  OTRP_DSI_MISMATCH = 0xDEAD0001,        // stale DSI hash; foreign TSM; device ID rejected
  OTRP_SD_EXISTS = 0xDEAD0002,           // CreateSD: the SD name is taken
  OTRP_SD_MISMATCH = 0xDEAD0004,         // UpdateSD: name, SP or TSM differs from the SD record
  OTRP_BAD_REQUEST = 0xDEAD0006,         // malformed, unknown, unverifiable or undecryptable
  OTRP_TA_DECRYPT_FAILED = 0xDEAD0007,   // TA image cannot be decrypted
  OTRP_TA_EXISTS = 0xDEAD0008,           // TA is in the SD, or registered, already
  OTRP_NOT_FOUND = 0xDEAD000A,           // no SD or TA record; TA not registered
  OTRP_DSI_HASH_FAILED = 0xDEAD000C,     // DSI hash cannot be computed
  OTRP_RESPONSE_FAILED = 0xDEAD000E,     // response not encrypted or signed; SD list or record bad
  OTRP_CA_CHECK_FAILED = 0xDEAD0010,     // the CA-TSM key does not vouch for it
  OTRP_TA_INFO_INCOMPLETE = 0xDEAD1001,  // a TA record lacks a member
  OTRP_NO_MEMORY = 0xDEAD1002,  // no memory, or a value that cannot be built, decoded or parsed
  OTRP_SD_LIST_BROKEN = 0xDEAD1003,  // the stored SD list is not what it should be
  OTRP_MISSING = 0xDEAD1004,         // an argument or member is missing; no such entry in the DSI
  OTRP_SP_NOT_FOUND = 0xDEAD1005,    // no record of the SP
};

#endif
