// SPDX-License-Identifier: BSD-2-Clause
// The image header that this kit links into a trusted application, from what its folder says.
#include <tee_ta_api.h>
#include <user_ta_header_defines.h>

const struct ta_header {
  TEE_UUID uuid;
  uint32_t stack_size;
  uint32_t flags;
  uint32_t data_size;
  const char *version;
  const char *description;
} ta_header __attribute__((__section__(".ta_header"))) = {
    TA_UUID, TA_STACK_SIZE, TA_FLAGS, TA_DATA_SIZE, TA_VERSION, TA_DESCRIPTION,
};

// Where the image starts: the TEE calls through this.
const void *const ta_entry_points[] __attribute__((__section__(".ta_header"))) = {
    (const void *)TA_CreateEntryPoint,       (const void *)TA_DestroyEntryPoint,
    (const void *)TA_OpenSessionEntryPoint,  (const void *)TA_CloseSessionEntryPoint,
    (const void *)TA_InvokeCommandEntryPoint};
