// SPDX-License-Identifier: BSD-2-Clause
/// Owners: whatever is taken is held at once by a type that gives it back.
#ifndef OWNERSHIP_H
#define OWNERSHIP_H

#include <stdint.h>
#include <string.h>
#include <tee_internal_api.h>

#include <memory>
#include <type_traits>

/// Overwrites memory in a way that the compiler may not drop.
inline void wipe(void *bytes, uint32_t len) {
  memset(bytes, 0, len);
  __asm__ __volatile__("" : : "r"(bytes) : "memory");
}

/// Zero-filled bytes, or NULL.
inline uint8_t *allocate_bytes(uint32_t len) {
  return static_cast<uint8_t *>(TEE_Malloc(len, TEE_MALLOC_FILL_ZERO));
}

/// A deleter that calls a function.
template <auto Free>
struct freed_by {
  /// Frees what an owner holds, which is never NULL.
  template <class T>
  void operator()(T *p) const {
    Free(p);
  }
};

/// Owns a handle or pointer that `Free` gives back.
template <class Handle, auto Free>
using owned = std::unique_ptr<std::remove_pointer_t<Handle>, freed_by<Free>>;

/// A buffer or text from TEE_Malloc.
template <class T>
using tee_ptr = owned<T *, TEE_Free>;

/// Overwrites a NUL-terminated text and frees it; NULL is ignored.
inline void wipe_and_free_text(char *text) {
  if (text == nullptr) return;
  wipe(text, static_cast<uint32_t>(strlen(text)));
  TEE_Free(text);
}

/// A NUL-terminated text that nobody may find in freed memory.
using secret_text = owned<char *, wipe_and_free_text>;

/// Bytes that nobody may find in freed memory. `data` and `len` are filled as out-parameters.
struct secret_bytes {
  uint8_t *data = nullptr;  // from TEE_Malloc
  uint32_t len = 0;         // bytes

  secret_bytes() = default;
  secret_bytes(const secret_bytes &) = delete;
  secret_bytes &operator=(const secret_bytes &) = delete;
  ~secret_bytes() { reset(); }

  /// Overwrites and frees the bytes, if there are any.
  void reset() {
    if (data != nullptr) {
      wipe(data, len);
      TEE_Free(data);
    }
    data = nullptr;
    len = 0;
  }

  /// Hands the bytes over: the caller frees them.
  uint8_t *release() {
    uint8_t *bytes = data;
    data = nullptr;
    len = 0;
    return bytes;
  }
};

/// A transient object, usually a key.
using key_object = owned<TEE_ObjectHandle, TEE_FreeTransientObject>;
/// A persistent object. Closing it makes durable what was written.
using stored_object = owned<TEE_ObjectHandle, TEE_CloseObject>;
/// A cryptographic operation.
using operation = owned<TEE_OperationHandle, TEE_FreeOperation>;

/// Lets a plain out-parameter fill an owner: f(out(owner)). The owner has it, and its old content
/// is freed, only when the whole expression is done: whoever reads the owner needs a new statement.
template <class T, class Deleter>
class out {
 public:
  /// For one call that fills `owner`, which must live longer.
  explicit out(std::unique_ptr<T, Deleter> &owner) : owner_(owner) {}
  ~out() { owner_.reset(handle_); }
  out(const out &) = delete;
  out &operator=(const out &) = delete;
  /// What the call writes to; NULL until then.
  operator T **() { return &handle_; }

 private:
  std::unique_ptr<T, Deleter> &owner_;
  T *handle_ = nullptr;
};

#endif
