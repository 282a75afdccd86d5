// SPDX-License-Identifier: BSD-2-Clause
/// The operation behind a TEE_OperationHandle.
///
/// Everything that does not depend on the data is prepared when the operation is allocated or
/// gets its key, so that a call which moves data costs one handle check and the work itself.
#ifndef TEE_OPERATION_H
#define TEE_OPERATION_H

#include <tee_internal_api.h>

#include <cstdint>

#include "evp.h"

struct __TEE_OperationHandle {
  uint32_t algorithm = 0;
  uint32_t mode = 0;
  uint32_t max_key_size = 0;  // bits
  bool has_key = false;
  bool active = false;   // between an init call and its final one
  uint32_t pending = 0;  // CBC: input bytes that wait for the rest of their block
  uint32_t tag_len = 0;  // GCM: bytes
  // The one that the algorithm works with is set; each holds its own copy of the key or a share.
  tee::DigestContext digest;
  tee::MacContext mac;
  tee::CipherContext cipher;
  tee::KeyContext rsa;
};

namespace tee {

/// The most significant hexadecimal digit of an algorithm identifier.
enum class OperationClass : uint32_t {
  kCipher = 1,
  kMac = 3,
  kAuthenticated = 4,
  kDigest = 5,
  kAsymmetricCipher = 6,
  kSignature = 7,
};

inline OperationClass class_of(uint32_t algorithm) {
  return static_cast<OperationClass>(algorithm >> 28);
}

/// The operation of a handle that the running instance has open; panics when it has not.
__TEE_OperationHandle &checked_operation(TEE_OperationHandle handle, const char *call);

/// The same, and panics when it is of another class.
__TEE_OperationHandle &checked_operation(TEE_OperationHandle handle, OperationClass wanted,
                                         const char *call);

/// The same, and panics unless a key is set.
__TEE_OperationHandle &checked_keyed(TEE_OperationHandle handle, OperationClass wanted,
                                     const char *call);

/// The same as checked_operation(), and panics unless the operation has been started.
__TEE_OperationHandle &checked_active(TEE_OperationHandle handle, OperationClass wanted,
                                      const char *call);

/// Panics when the operation was allocated for another mode.
void check_mode(const __TEE_OperationHandle &operation, uint32_t mode, const char *call);

/// Whether an output of `needed` bytes fits the capacity `*len`; `*len` becomes `needed` unless it
/// does.
inline bool fits(uint64_t needed, TEE_LengthType *len) {
  if (needed <= *len) return true;
  *len = static_cast<TEE_LengthType>(needed);
  return false;
}

}  // namespace tee

#endif
