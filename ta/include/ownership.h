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

template <auto Free>
struct freed_by {
  template <class T>
  void operator()(T *p) const {
    Free(p);
  }
};

template <class Handle, auto Free>
using owned = std::unique_ptr<std::remove_pointer_t<Handle>, freed_by<Free>>;

/// A buffer or text from TEE_Malloc.
template <class T>
using tee_ptr = owned<T *, TEE_Free>;

inline void wipe_and_free_text(char *text) {
  if (text == nullptr) return;
  wipe(text, static_cast<uint32_t>(strlen(text)));
  TEE_Free(text);
}

/// A NUL-terminated text that nobody may find in freed memory.
using secret_text = owned<char *, wipe_and_free_text>;

/// Bytes that nobody may find in freed memory. `data` and `len` are filled as out-parameters.
struct secret_bytes {
  uint8_t *data = nullptr;
  uint32_t len = 0;

  secret_bytes() = default;
  secret_bytes(const secret_bytes &) = delete;
  secret_bytes &operator=(const secret_bytes &) = delete;
  ~secret_bytes() { reset(); }

  void reset() {
    if (data != nullptr) {
      wipe(data, len);
      TEE_Free(data);
    }
    data = nullptr;
    len = 0;
  }

  uint8_t *release() {
    uint8_t *bytes = data;
    data = nullptr;
    len = 0;
    return bytes;
  }
};

using key_object = owned<TEE_ObjectHandle, TEE_FreeTransientObject>;
using stored_object = owned<TEE_ObjectHandle, TEE_CloseObject>;
using operation = owned<TEE_OperationHandle, TEE_FreeOperation>;

/// Lets a plain out-parameter fill an owner: f(out(owner)). The owner has it, and its old content
/// is freed, only when the whole expression is done: whoever reads the owner needs a new statement.
template <class T, class Deleter>
class out {
 public:
  explicit out(std::unique_ptr<T, Deleter> &owner) : owner_(owner) {}
  ~out() { owner_.reset(handle_); }
  out(const out &) = delete;
  out &operator=(const out &) = delete;
  operator T **() { return &handle_; }

 private:
  std::unique_ptr<T, Deleter> &owner_;
  T *handle_ = nullptr;
};

#endif
