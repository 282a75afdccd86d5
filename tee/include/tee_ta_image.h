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

/// What an image begins with, and the name under which its `struct tee_ta_image` is exported.
/// @{
#define TEE_TA_IMAGE_MAGIC 0x41544854u  // "THTA"
#define TEE_TA_IMAGE_VERSION 1u
#define TEE_TA_IMAGE_SYMBOL "tee_ta_image"
/// @}

/// Which member of a property's value counts.
enum tee_property_type { TEE_PROPERTY_BOOL = 0, TEE_PROPERTY_U32 = 1, TEE_PROPERTY_STRING = 2 };

/// A property of a trusted application. The loader wants gpd.ta.singleInstance (true),
/// gpd.ta.multiSession (true), gpd.ta.instanceKeepAlive (false) and gpd.ta.dataSize.
struct tee_property {
  const char *name;  // NUL-terminated
  uint32_t type;     // enum tee_property_type
  union {
    bool boolean;
    uint32_t u32;
    const char *string;
  } value;  // the member that the type says
};

/// What the TEE is told about a trusted application besides its identity.
struct tee_ta_metadata {
  uint32_t trace_level;            // highest TEE_TRACE_* that is printed
  uint32_t reserved[2];            // 2 and 1; nothing reads them
  uint32_t signature_header_mode;  // for the OTrP agent's build alone; the loader does not read it
  const char *trace_prefix;        // begins its log lines; never NULL
  uint32_t num_properties;         // how many are in `properties`
  const struct tee_property *properties;  // NULL when there are none
};

/// The five TA_*EntryPoint functions; none may be NULL.
struct tee_ta_entry_points {
  TEE_Result (*create)(void);  // TA_CreateEntryPoint
  void (*destroy)(void);       // TA_DestroyEntryPoint
  /// TA_OpenSessionEntryPoint
  TEE_Result (*open_session)(uint32_t param_types, TEE_Param params[4], void **session_context);
  void (*close_session)(void *session_context);  // TA_CloseSessionEntryPoint
  /// TA_InvokeCommandEntryPoint
  TEE_Result (*invoke_command)(void *session_context, uint32_t command_id, uint32_t param_types,
                               TEE_Param params[4]);
};

/// The header of an image.
struct tee_ta_image {
  uint32_t magic;                           // TEE_TA_IMAGE_MAGIC
  uint32_t version;                         // TEE_TA_IMAGE_VERSION
  TEE_UUID uuid;                            // the one that the file is named by
  uint32_t stack_size;                      // bytes
  uint32_t flags;                           // for real TEEs; nothing reads them here
  const struct tee_ta_metadata *metadata;   // never NULL
  struct tee_ta_entry_points entry_points;  // called through these, by no name
};

#ifdef __cplusplus
}
#endif

#endif
