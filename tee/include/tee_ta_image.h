// SPDX-License-Identifier: BSD-2-Clause
/// The TA image format of the host TEE: what the loader reads from a trusted application's shared
/// object. `tee_add_ta_image()` (tee/cmake) compiles tee/image/ta_image.cpp into every image, from
/// the `ta_config.h` that the trusted application's build provides.
#ifndef TEE_TA_IMAGE_H
#define TEE_TA_IMAGE_H

#include <tee_internal_api.h>

#ifdef __cplusplus
extern "C" {
#endif

#define TEE_TA_IMAGE_MAGIC 0x41544854u  // "THTA"
#define TEE_TA_IMAGE_VERSION 1u
#define TEE_TA_IMAGE_SYMBOL "tee_ta_image"

enum tee_property_type { TEE_PROPERTY_BOOL = 0, TEE_PROPERTY_U32 = 1, TEE_PROPERTY_STRING = 2 };

struct tee_property {
  const char *name;
  uint32_t type;  // enum tee_property_type
  union {
    bool boolean;
    uint32_t u32;
    const char *string;
  } value;
};

struct tee_ta_metadata {
  uint32_t trace_level;
  uint32_t reserved[2];  // 2 and 1; nothing reads them
  uint32_t signature_header_mode;
  const char *trace_prefix;
  uint32_t num_properties;
  const struct tee_property *properties;
};

struct tee_ta_entry_points {
  TEE_Result (*create)(void);
  void (*destroy)(void);
  TEE_Result (*open_session)(uint32_t param_types, TEE_Param params[4], void **session_context);
  void (*close_session)(void *session_context);
  TEE_Result (*invoke_command)(void *session_context, uint32_t command_id, uint32_t param_types,
                               TEE_Param params[4]);
};

struct tee_ta_image {
  uint32_t magic;
  uint32_t version;
  TEE_UUID uuid;
  uint32_t stack_size;  // bytes
  uint32_t flags;
  const struct tee_ta_metadata *metadata;
  struct tee_ta_entry_points entry_points;
};

#ifdef __cplusplus
}
#endif

#endif
