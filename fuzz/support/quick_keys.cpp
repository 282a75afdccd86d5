// SPDX-License-Identifier: BSD-2-Clause
// Key generation in place of the TEE's own, for all of this program: the primes of a key as long as
// devices have would take longer to find than everything else that a run does.
#include <dlfcn.h>
#include <tee_internal_api.h>

#include <algorithm>

#include "support/stored_device.h"

TEE_Result TEE_GenerateKey(TEE_ObjectHandle object, uint32_t keySize, const TEE_Attribute *params,
                           uint32_t paramCount) {
  static const auto generate =
      reinterpret_cast<decltype(&TEE_GenerateKey)>(::dlsym(RTLD_NEXT, "TEE_GenerateKey"));
  return generate(object, std::min<uint32_t>(keySize, fuzz::kKeyBits), params, paramCount);
}
