// SPDX-License-Identifier: BSD-2-Clause
#include <openssl/rand.h>
#include <tee_internal_api.h>

#include "running.h"

void TEE_GenerateRandom(void *randomBuffer, TEE_LengthType randomBufferLen) {
  auto *bytes = static_cast<unsigned char *>(randomBuffer);
  if (RAND_bytes_ex(nullptr, bytes, randomBufferLen, 0) != 1) {
    tee::panic(__func__, "no random numbers to be had");
  }
}
