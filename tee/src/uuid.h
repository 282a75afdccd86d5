// SPDX-License-Identifier: BSD-2-Clause
/// UUIDs as bytes and as text.
#ifndef TEE_UUID_H
#define TEE_UUID_H

#include <tee_client_api.h>
#include <tee_internal_api.h>

#include <array>
#include <string>

namespace tee {

/// The 16 bytes in the order of the text form (RFC 4122, section 4.1.2).
using UuidBytes = std::array<uint8_t, 16>;

UuidBytes uuid_bytes(const TEE_UUID &uuid);

/// "c7acaae4-686e-41ee-97d4-49ed38960151"
std::string uuid_text(const TEE_UUID &uuid);

TEE_UUID from_client(const TEEC_UUID &uuid);

}  // namespace tee

#endif
