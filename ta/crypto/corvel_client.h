// SPDX-License-Identifier: BSD-2-Clause
/// What the agent asks of Corvel, the trusted application that knows who this device is and has its
/// key.
///
/// Each question has a session to itself. Corvel's own codes are handed on. Lengths are what the
/// key service's value output says, but never more than the buffer that it was given:
/// TEE_ERROR_EXCESS_DATA then.
#ifndef CORVEL_CLIENT_H
#define CORVEL_CLIENT_H

#include <stdint.h>

#include "platform.h"

[[nodiscard]] TEE_Result open_corvel_session(TEE_TASessionHandle *session);

/// `*len` is the capacity of `buffer`, then the ID's length. No terminator is added.
[[nodiscard]] TEE_Result corvel_get_device_id(void *buffer, uint32_t *len);

/// The serialized TLV box of the TEE key; `*len` as above.
[[nodiscard]] TEE_Result corvel_get_tee_key(void *buffer, uint32_t *len);

/// The SP endorsement-key ID, a NUL-terminated text in a new buffer of 80 bytes.
[[nodiscard]] TEE_Result corvel_get_sp_ek_id(char **id);

/// The device's RSA key pair as a new key object, or NULL. The caller frees it.
TEE_ObjectHandle get_tee_key();

#endif
