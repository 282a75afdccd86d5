// SPDX-License-Identifier: BSD-2-Clause
/// The process functions of the eight messages; message.h says what a process function is. Each is
/// the public face of the source that bears its message's name.
#ifndef OPERATIONS_H
#define OPERATIONS_H

#include "message.h"

[[nodiscard]] TEE_Result getdevstat_process(const char *tsmid, const jsmn_object *tbs,
                                            char **response, ta_image *image,
                                            const jsmn_object *request);
[[nodiscard]] TEE_Result installta_process(const char *tsmid, const jsmn_object *tbs,
                                           char **response, ta_image *image,
                                           const jsmn_object *request);
[[nodiscard]] TEE_Result updateta_process(const char *tsmid, const jsmn_object *tbs,
                                          char **response, ta_image *image,
                                          const jsmn_object *request);
[[nodiscard]] TEE_Result deleteta_process(const char *tsmid, const jsmn_object *tbs,
                                          char **response, ta_image *image,
                                          const jsmn_object *request);
[[nodiscard]] TEE_Result createsd_process(const char *tsmid, const jsmn_object *tbs,
                                          char **response, ta_image *image,
                                          const jsmn_object *request);
[[nodiscard]] TEE_Result updatesd_process(const char *tsmid, const jsmn_object *tbs,
                                          char **response, ta_image *image,
                                          const jsmn_object *request);
[[nodiscard]] TEE_Result deletesd_process(const char *tsmid, const jsmn_object *tbs,
                                          char **response, ta_image *image,
                                          const jsmn_object *request);
[[nodiscard]] TEE_Result gettainfo_process(const char *tsmid, const jsmn_object *tbs,
                                           char **response, ta_image *image,
                                           const jsmn_object *request);

/// How GetTAInfo encodes: with the AIK of the SP that its response is about.
[[nodiscard]] TEE_Result gettainfo_sign_encode(const char *response, uint8_t *destination,
                                               uint32_t *len);

#endif
