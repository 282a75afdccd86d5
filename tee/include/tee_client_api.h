// SPDX-License-Identifier: BSD-2-Clause
/// GlobalPlatform TEE Client API 1.0: the door of the normal world.
///
/// Names, signatures and constants are the standard's. A client opens a context (a device), in it a
/// session with a trusted application, and in that invokes commands. Sizes are in bytes. What a
/// call is given stays the caller's. Threads may call at the same time; a device runs one command
/// after the other.
///
/// A NULL or missing argument gives TEEC_ERROR_BAD_PARAMETERS; tee_inspect_last_error() says in
/// words why a call failed.
#ifndef TEE_CLIENT_API_H
#define TEE_CLIENT_API_H

#include <stdbool.h>
#include <stddef.h>
#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

/// TEEC_SUCCESS or one of the codes below, or a trusted application's own.
typedef uint32_t TEEC_Result;

/// Result codes. TEEC_ERROR_CORRUPT_OBJECT, of a damaged database, is the Internal Core API's.
/// @{
#define TEEC_SUCCESS 0x00000000u
#define TEEC_ERROR_CORRUPT_OBJECT 0xF0100001u
#define TEEC_ERROR_GENERIC 0xFFFF0000u
#define TEEC_ERROR_ACCESS_DENIED 0xFFFF0001u
#define TEEC_ERROR_CANCEL 0xFFFF0002u
#define TEEC_ERROR_ACCESS_CONFLICT 0xFFFF0003u
#define TEEC_ERROR_EXCESS_DATA 0xFFFF0004u
#define TEEC_ERROR_BAD_FORMAT 0xFFFF0005u
#define TEEC_ERROR_BAD_PARAMETERS 0xFFFF0006u
#define TEEC_ERROR_BAD_STATE 0xFFFF0007u
#define TEEC_ERROR_ITEM_NOT_FOUND 0xFFFF0008u
#define TEEC_ERROR_NOT_IMPLEMENTED 0xFFFF0009u
#define TEEC_ERROR_NOT_SUPPORTED 0xFFFF000Au
#define TEEC_ERROR_NO_DATA 0xFFFF000Bu
#define TEEC_ERROR_OUT_OF_MEMORY 0xFFFF000Cu
#define TEEC_ERROR_BUSY 0xFFFF000Du
#define TEEC_ERROR_COMMUNICATION 0xFFFF000Eu
#define TEEC_ERROR_SECURITY 0xFFFF000Fu
#define TEEC_ERROR_SHORT_BUFFER 0xFFFF0010u
#define TEEC_ERROR_TARGET_DEAD 0xFFFF3024u
/// @}

/// Where a result arose: in this library, on the way, in the TEE, or in the trusted application,
/// whose code it then is.
/// @{
#define TEEC_ORIGIN_API 1u
#define TEEC_ORIGIN_COMMS 2u
#define TEEC_ORIGIN_TEE 3u
#define TEEC_ORIGIN_TRUSTED_APP 4u
/// @}

/// The client does not say who it is: the only login that is offered.
#define TEEC_LOGIN_PUBLIC 0x00000000u

/// Directions of shared memory, seen from the trusted application; both may be set.
/// @{
#define TEEC_MEM_INPUT 0x00000001u
#define TEEC_MEM_OUTPUT 0x00000002u
/// @}

/// Types of a parameter, for TEEC_PARAM_TYPES(): which member of TEEC_Parameter counts, and its
/// direction, seen from the trusted application.
/// @{
#define TEEC_NONE 0x00000000u
#define TEEC_VALUE_INPUT 0x00000001u
#define TEEC_VALUE_OUTPUT 0x00000002u
#define TEEC_VALUE_INOUT 0x00000003u
#define TEEC_MEMREF_TEMP_INPUT 0x00000005u
#define TEEC_MEMREF_TEMP_OUTPUT 0x00000006u
#define TEEC_MEMREF_TEMP_INOUT 0x00000007u
#define TEEC_MEMREF_WHOLE 0x0000000Cu
#define TEEC_MEMREF_PARTIAL_INPUT 0x0000000Du
#define TEEC_MEMREF_PARTIAL_OUTPUT 0x0000000Eu
#define TEEC_MEMREF_PARTIAL_INOUT 0x0000000Fu
/// @}

/// `paramTypes` of an operation: the types of its four parameters.
#define TEEC_PARAM_TYPES(p0, p1, p2, p3) ((p0) | ((p1) << 4) | ((p2) << 8) | ((p3) << 12))

/// Names a trusted application; its text (RFC 4122) has the hexadecimal digits of these, in order.
typedef struct {
  uint32_t timeLow;            // 8 digits
  uint16_t timeMid;            // 4 digits
  uint16_t timeHiAndVersion;   // 4 digits
  uint8_t clockSeqAndNode[8];  // 4 and 12 digits
} TEEC_UUID;

/// A connection to a device.
typedef struct {
  void *imp;  // the implementation's; NULL when not initialized
} TEEC_Context;

/// A session with a trusted application.
typedef struct {
  void *imp;  // the implementation's; NULL when not open
} TEEC_Session;

/// Memory that commands can refer to again and again, whole or in part.
typedef struct {
  void *buffer;    // the caller's when registered, the implementation's when allocated
  size_t size;     // bytes
  uint32_t flags;  // TEEC_MEM_INPUT and TEEC_MEM_OUTPUT
  void *imp;       // the implementation's
} TEEC_SharedMemory;

/// A buffer that one call refers to. NULL needs a size of 0, and reaches the trusted application
/// as that.
typedef struct {
  void *buffer;  // the caller's
  size_t size;   // bytes, at most 4 GiB - 1; of an output afterwards what was, or would be, written
} TEEC_TempMemoryReference;

/// Shared memory, or a part of it.
typedef struct {
  TEEC_SharedMemory *parent;  // registered or allocated
  size_t size;                // of the part, in bytes; afterwards as in TEEC_TempMemoryReference
  size_t offset;              // where the part begins, in bytes; not used with TEEC_MEMREF_WHOLE
} TEEC_RegisteredMemoryReference;

/// Two numbers.
typedef struct {
  uint32_t a;  // means what the command says
  uint32_t b;  // means what the command says
} TEEC_Value;

/// One parameter of a command; its type says which member counts.
typedef union {
  TEEC_TempMemoryReference tmpref;        // of TEEC_MEMREF_TEMP_*
  TEEC_RegisteredMemoryReference memref;  // of TEEC_MEMREF_WHOLE and TEEC_MEMREF_PARTIAL_*
  TEEC_Value value;                       // of TEEC_VALUE_*
} TEEC_Parameter;

/// The parameters of a call. Outputs are written back whatever its result is, unless its origin is
/// TEEC_ORIGIN_API.
typedef struct {
  uint32_t started;          // 0 where a call may be cancelled; nothing is read from it here
  uint32_t paramTypes;       // TEEC_PARAM_TYPES()
  TEEC_Parameter params[4];  // those of type TEEC_NONE need not be set
  void *imp;                 // the implementation's
} TEEC_Operation;

/// Connects to the device whose state directory is `name`. The directory is made when it is
/// missing, with mode 0700. Contexts of one process may share a device. TEEC_FinalizeContext()
/// closes it.
///
/// Returns TEEC_ERROR_BUSY when another process has the directory, TEEC_ERROR_CORRUPT_OBJECT when
/// its database is damaged (it is left as it is), TEEC_ERROR_ACCESS_DENIED when it may not be used.
TEEC_Result TEEC_InitializeContext(const char *name, TEEC_Context *context);

/// Disconnects. All sessions of the context must be closed before. NULL is ignored.
void TEEC_FinalizeContext(TEEC_Context *context);

/// Shares the `size` bytes at `buffer`, with the directions in `flags`. The memory stays the
/// caller's and must live until TEEC_ReleaseSharedMemory().
TEEC_Result TEEC_RegisterSharedMemory(TEEC_Context *context, TEEC_SharedMemory *sharedMem);

/// Shares `size` new bytes, all zero, with the directions in `flags`, and sets `buffer`.
TEEC_Result TEEC_AllocateSharedMemory(TEEC_Context *context, TEEC_SharedMemory *sharedMem);

/// Ends the sharing, frees what TEEC_AllocateSharedMemory() gave and clears the structure. NULL is
/// ignored.
void TEEC_ReleaseSharedMemory(TEEC_SharedMemory *sharedMem);

/// Opens a session with the trusted application `destination`, whose instance is created when it
/// has none. `connectionMethod` is TEEC_LOGIN_PUBLIC and `connectionData` NULL; anything else gives
/// TEEC_ERROR_NOT_SUPPORTED. `operation` (may be NULL: no parameters) goes to the trusted
/// application. `*returnOrigin` (may be NULL) says where the result arose.
///
/// Returns TEEC_ERROR_ITEM_NOT_FOUND when there is no image of that UUID, TEEC_ERROR_BAD_FORMAT
/// when there is no good one, or what the trusted application answers. TEEC_CloseSession() closes
/// it.
TEEC_Result TEEC_OpenSession(TEEC_Context *context, TEEC_Session *session,
                             const TEEC_UUID *destination, uint32_t connectionMethod,
                             const void *connectionData, TEEC_Operation *operation,
                             uint32_t *returnOrigin);

/// Closes the session; with its last one an instance ends. NULL is ignored.
void TEEC_CloseSession(TEEC_Session *session);

/// Invokes a command in an open session and waits for its end. `operation` (may be NULL: no
/// parameters) goes to the trusted application; `*returnOrigin` (may be NULL) says where the result
/// arose. A memory reference reaches the trusted application without a copy: both worlds see the
/// same bytes while the command runs, as on a device with shared memory.
///
/// Returns what the trusted application answers, or TEEC_ERROR_BAD_PARAMETERS with the origin
/// TEEC_ORIGIN_API for a memory reference that is none; nothing was invoked then.
TEEC_Result TEEC_InvokeCommand(TEEC_Session *session, uint32_t commandID, TEEC_Operation *operation,
                               uint32_t *returnOrigin);

/// Asks for an end of the call that uses `operation`. Commands here run to their end all the same.
void TEEC_RequestCancellation(TEEC_Operation *operation);

#ifdef __cplusplus
}
#endif

#endif
