// SPDX-License-Identifier: BSD-2-Clause
/// How failures travel inside the host TEE: as an Error, up to the C function that was called. No
/// exception crosses a C function.
#ifndef TEE_ERROR_H
#define TEE_ERROR_H

#include <tee_internal_api.h>

#include <string>
#include <string_view>

namespace tee {

/// Client API codes have the same numbers, so one code serves both worlds.
struct Error {
  TEE_Result code;
  std::string why;  // one line, for tee_inspect_last_error()
};

/// An Error that ends in the text of errno, with the code that suits it.
Error system_error(std::string why);

void set_last_error(std::string_view why) noexcept;
const char *last_error() noexcept;

/// The code of the exception being handled; its text becomes the last error.
TEE_Result handled_exception() noexcept;

/// What `call` returns, or the code of what it throws.
template <class Call>
TEE_Result result_of(Call &&call) noexcept {
  try {
    return call();
  } catch (...) {
    return handled_exception();
  }
}

/// The same for a call from the normal world: an error text never outlives the next call.
template <class Call>
TEE_Result client_result_of(Call &&call) noexcept {
  set_last_error({});
  const TEE_Result result = result_of(call);
  if (result == TEE_SUCCESS) set_last_error({});
  return result;
}

}  // namespace tee

#endif
