// SPDX-License-Identifier: BSD-2-Clause
/// Owners: whatever is taken is held at once by a type that gives it back.
#ifndef OWNERSHIP_H
#define OWNERSHIP_H

#include "platform.h"

/// Overwrites memory in a way that the compiler may not drop.
inline void wipe(void *bytes, uint32_t len) {
  memset(bytes, 0, len);
  __asm__ __volatile__("" : : "r"(bytes) : "memory");
}

/// Zero-filled bytes, or NULL.
inline uint8_t *allocate_bytes(uint32_t len) {
  return static_cast<uint8_t *>(TEE_Malloc(len, TEE_MALLOC_FILL_ZERO));
}

/// Owns the handle or pointer that it was made with, and gives it back with `Free`. Move-only.
template <class Handle, auto Free>
class owned {
 public:
  /// Owns nothing yet.
  owned() = default;
  /// Takes over what it is given, or NULL, or what another owned, which owns nothing then.
  /// @{
  explicit owned(Handle handle) : handle_(handle) {}
  owned(owned &&other) : handle_(other.release()) {}
  owned &operator=(owned &&other) {
    reset(other.release());
    return *this;
  }
  /// @}
  ~owned() { reset(); }

  /// What is held, which stays the owner's; NULL for nothing.
  /// @{
  Handle get() const { return handle_; }
  Handle operator->() const { return handle_; }
  /// @}
  /// Whether anything is held.
  explicit operator bool() const { return handle_ != nullptr; }

  /// Frees what is held and holds `handle`.
  void reset(Handle handle = nullptr) {
    const Handle old = handle_;
    handle_ = handle;
    if (old != nullptr) Free(old);
  }

  /// Hands over what is held: it is the caller's to free.
  [[nodiscard]] Handle release() {
    const Handle handle = handle_;
    handle_ = nullptr;
    return handle;
  }

 private:
  Handle handle_ = nullptr;
};

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
/// A persistent object.
using stored_object = owned<TEE_ObjectHandle, TEE_CloseObject>;
/// Passes on the result of a call on `object`: a platform that finds it corrupt has closed its
/// handle by itself, and takes a second close for a fault of the caller.
inline TEE_Result let_go_if_corrupt(stored_object *object, TEE_Result result) {
  if (result == TEE_ERROR_CORRUPT_OBJECT) (void)object->release();
  return result;
}

/// A cryptographic operation.
using operation = owned<TEE_OperationHandle, TEE_FreeOperation>;

/// Lets a plain out-parameter fill an owner: f(out(owner)). The owner has it, and its old content
/// is freed, only when the whole expression is done: whoever reads the owner needs a new statement.
template <class Handle, auto Free>
class out {
 public:
  /// For one call that fills `owner`, which must live longer.
  explicit out(owned<Handle, Free> &owner) : owner_(owner) {}
  ~out() { owner_.reset(handle_); }
  out(const out &) = delete;
  out &operator=(const out &) = delete;
  /// What the call writes to; NULL until then.
  operator Handle *() { return &handle_; }

 private:
  owned<Handle, Free> &owner_;
  Handle handle_ = nullptr;
};

#endif
