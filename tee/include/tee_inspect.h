// SPDX-License-Identifier: BSD-2-Clause
/// Looking into the host TEE from outside, for developers: the stored objects of a trusted
/// application, the figures of its heap, its trace. A real device offers nothing of the kind.
///
/// `context` is initialized, `uuid` the trusted application, which need not run. IDs are any bytes,
/// of up to 64. What else than the codes named below can come is TEEC_ERROR_BAD_PARAMETERS and the
/// storage's.
#ifndef TEE_INSPECT_H
#define TEE_INSPECT_H

#include <tee_client_api.h>

#ifdef __cplusplus
extern "C" {
#endif

/// What an instance holds.
struct tee_heap_stats {
  uint32_t size;             // bytes: gpd.ta.dataSize
  uint32_t in_use;           // bytes charged now
  uint32_t peak;             // highest in_use since the instance was created
  uint32_t live_blocks;      // blocks allocated and not freed
  uint32_t peak_blocks;      // highest live_blocks since the instance was created
  uint32_t open_objects;     // object handles, transient and persistent
  uint32_t open_operations;  // operation handles
  uint32_t open_sessions;    // TA-to-TA sessions that this instance has open
};

/// Figures of the live instance of a trusted application; TEEC_ERROR_ITEM_NOT_FOUND when it has
/// none.
TEEC_Result tee_inspect_stats(TEEC_Context *context, const TEEC_UUID *uuid,
                              struct tee_heap_stats *stats);

/// Calls `visit` for every persistent object, in the byte order of the IDs, until it returns false.
/// It gets `closure`, the ID, which is not NUL-terminated and valid during the call only, and the
/// length of the data in bytes. It must not call into the device.
TEEC_Result tee_inspect_list(TEEC_Context *context, const TEEC_UUID *uuid,
                             bool (*visit)(void *closure, const void *id, size_t id_len,
                                           size_t data_len),
                             void *closure);

/// Reads the raw data stream of an object into a new buffer, which the caller frees with free().
/// After a failure `*data` is NULL; TEEC_ERROR_ITEM_NOT_FOUND when there is no such object.
TEEC_Result tee_inspect_get(TEEC_Context *context, const TEEC_UUID *uuid, const void *id,
                            size_t id_len, uint8_t **data, size_t *data_len);

/// Creates or replaces an object with exactly these bytes, as one durable change. An instance that
/// has the object open does not see it, and may overwrite it.
TEEC_Result tee_inspect_put(TEEC_Context *context, const TEEC_UUID *uuid, const void *id,
                            size_t id_len, const void *data, size_t data_len);

/// Removes an object; TEEC_ERROR_ITEM_NOT_FOUND when there is none.
TEEC_Result tee_inspect_remove(TEEC_Context *context, const TEEC_UUID *uuid, const void *id,
                               size_t id_len);

/// One line that says why the last call on this thread that returned an error did so ("state
/// directory X is in use by another process"); empty when there is nothing to add. Never NULL;
/// valid until the thread's next call.
const char *tee_inspect_last_error(void);

/// Hands the lines of the trace that this thread's calls cause to `take`, each with its line feed,
/// in place of standard error; NULL: to standard error again. `take` gets `closure`, a line that is
/// valid during the call only, and its length. It must not call into the device.
void tee_inspect_trace(void (*take)(void *closure, const char *line, size_t len), void *closure);

#ifdef __cplusplus
}
#endif

#endif
