// SPDX-License-Identifier: BSD-2-Clause
#include "error.h"

#include <cerrno>
#include <exception>
#include <new>
#include <system_error>

namespace tee {

static thread_local std::string t_last_error;

static TEE_Result code_of_errno(int error) {
  switch (error) {
    case EACCES:
    case EPERM:
    case EROFS:
      return TEE_ERROR_ACCESS_DENIED;
    case ENOSPC:
    case EDQUOT:
      return TEE_ERROR_STORAGE_NO_SPACE;
    case ENOENT:
    case ENOTDIR:
    case ENAMETOOLONG:
    case ELOOP:
      return TEE_ERROR_BAD_PARAMETERS;
    case ENOMEM:
      return TEE_ERROR_OUT_OF_MEMORY;
    default:
      return TEE_ERROR_GENERIC;
  }
}

Error system_error(std::string why) {
  const int error = errno;
  return {code_of_errno(error), std::move(why) + ": " + std::generic_category().message(error)};
}

void set_last_error(std::string_view why) noexcept {
  try {
    t_last_error = why;
  } catch (...) {
    t_last_error.clear();
  }
}

const char *last_error() noexcept {
  return t_last_error.c_str();
}

TEE_Result handled_exception() noexcept {
  try {
    throw;
  } catch (const Error &error) {
    set_last_error(error.why);
    return error.code;
  } catch (const std::bad_alloc &) {
    set_last_error("the host is out of memory");
    return TEE_ERROR_OUT_OF_MEMORY;
  } catch (const std::exception &exception) {
    set_last_error(exception.what());
    return TEE_ERROR_GENERIC;
  } catch (...) {
    return TEE_ERROR_GENERIC;
  }
}

}  // namespace tee
