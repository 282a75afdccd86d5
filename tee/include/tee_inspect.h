// SPDX-License-Identifier: BSD-2-Clause
/// Looking into the host TEE from outside, for developers: the stored objects of a trusted
/// application and the figures of its heap. A real device offers nothing of the kind.
#ifndef TEE_INSPECT_H
#define TEE_INSPECT_H

#include <tee_client_api.h>

#ifdef __cplusplus
extern "C" {
#endif

struct tee_heap_stats {
  uint32_t size;         // bytes: gpd.ta.dataSize
  uint32_t in_use;       // bytes charged now
  uint32_t peak;         // highest in_use since the instance was created
  uint32_t live_blocks;  // blocks allocated and not freed
  uint32_t peak_blocks;
  uint32_t open_objects;     // object handles, transient and persistent
  uint32_t open_operations;  // operation handles
  uint32_t open_sessions;    // TA-to-TA sessions that this instance has open
};

/// Figures of the live instance of trusted application `uuid`; TEEC_ERROR_ITEM_NOT_FOUND when it
/// has none.
TEEC_Result tee_inspect_stats(TEEC_Context *context, const TEEC_UUID *uuid,
                              struct tee_heap_stats *stats);

/// Calls `visit` for every persistent object of `uuid`, in the byte order of the IDs, until it
/// returns false. The ID is not NUL-terminated and is valid during the call only.
TEEC_Result tee_inspect_list(TEEC_Context *context, const TEEC_UUID *uuid,
                             bool (*visit)(void *closure, const void *id, size_t id_len,
                                           size_t data_len),
                             void *closure);

/// Reads the raw data stream of an object into a new buffer, which the caller frees with free().
TEEC_Result tee_inspect_get(TEEC_Context *context, const TEEC_UUID *uuid, const void *id,
                            size_t id_len, uint8_t **data, size_t *data_len);

/// Creates or replaces an object with exactly these bytes, as one durable change.
TEEC_Result tee_inspect_put(TEEC_Context *context, const TEEC_UUID *uuid, const void *id,
                            size_t id_len, const void *data, size_t data_len);

/// Removes an object; TEEC_ERROR_ITEM_NOT_FOUND when there is none.
TEEC_Result tee_inspect_remove(TEEC_Context *context, const TEEC_UUID *uuid, const void *id,
                               size_t id_len);

/// One line that says why the last call on this thread that returned an error did so ("state
/// directory X is in use by another process"); empty when there is nothing to add.
const char *tee_inspect_last_error(void);

#ifdef __cplusplus
}
#endif

#endif
