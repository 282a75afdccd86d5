// SPDX-License-Identifier: BSD-2-Clause
/// The key service's entry points under names of their own: the agent's are in the same program.
#ifndef FUZZ_CORVEL_ENTRY_POINTS_H
#define FUZZ_CORVEL_ENTRY_POINTS_H

#include <tee_internal_api.h>

extern "C" {
TEE_Result corvel_create(void);
void corvel_destroy(void);
TEE_Result corvel_open(uint32_t param_types, TEE_Param params[4], void **session_context);
void corvel_close(void *session_context);
TEE_Result corvel_invoke(void *session_context, uint32_t command_id, uint32_t param_types,
                         TEE_Param params[4]);
}

#endif
