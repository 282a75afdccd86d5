// SPDX-License-Identifier: BSD-2-Clause
/// Result codes of the agent, and the conventions that every function of it keeps.
///
/// A function returns TEE_SUCCESS or a code that says what went wrong: one of those below or a
/// code of the platform, as it came. Everything else that it yields goes where its caller points:
/// something new there is the caller's to give back, to TEE_Free or to the owner of its type, and
/// a call that fails leaves NULL and 0. Lengths are in bytes and leave out a terminating NUL.
/// Whoever finds a failure logs it, once.
#ifndef OTRP_RESULT_H
#define OTRP_RESULT_H

#include "platform.h"

/// Codes of the agent's own. Clients see them as results of an invocation, as status words of
/// answers, and as "error_code" in responses.
/// Stale DSI hash; foreign TSM; device ID rejected.
constexpr TEE_Result OTRP_DSI_MISMATCH = 0xDEAD0001;
/// CreateSD: the SD name is taken.
constexpr TEE_Result OTRP_SD_EXISTS = 0xDEAD0002;
/// UpdateSD: the SD is recorded under another name, SP or TSM.
constexpr TEE_Result OTRP_SD_MISMATCH = 0xDEAD0004;
/// Malformed, unknown, unverifiable or undecryptable.
constexpr TEE_Result OTRP_BAD_REQUEST = 0xDEAD0006;
/// TA image cannot be decrypted.
constexpr TEE_Result OTRP_TA_DECRYPT_FAILED = 0xDEAD0007;
/// TA is in the SD, or registered, already.
constexpr TEE_Result OTRP_TA_EXISTS = 0xDEAD0008;
/// No SD or TA record; TA not registered.
constexpr TEE_Result OTRP_NOT_FOUND = 0xDEAD000A;
/// DSI hash cannot be computed.
constexpr TEE_Result OTRP_DSI_HASH_FAILED = 0xDEAD000C;
/// Response not encrypted or signed; SD list or record bad.
constexpr TEE_Result OTRP_RESPONSE_FAILED = 0xDEAD000E;
/// The CA-TSM key does not vouch for it.
constexpr TEE_Result OTRP_CA_CHECK_FAILED = 0xDEAD0010;
/// A TA record lacks a member.
constexpr TEE_Result OTRP_TA_INFO_INCOMPLETE = 0xDEAD1001;
/// No memory, or something that did not come out: a text, a document, a key.
constexpr TEE_Result OTRP_NO_MEMORY = 0xDEAD1002;
/// The stored SD list is not what it should be.
constexpr TEE_Result OTRP_SD_LIST_BROKEN = 0xDEAD1003;
/// An argument or member is missing; no such entry in the DSI.
constexpr TEE_Result OTRP_MISSING = 0xDEAD1004;
/// No record of the SP.
constexpr TEE_Result OTRP_SP_NOT_FOUND = 0xDEAD1005;

#endif
