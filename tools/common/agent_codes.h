// SPDX-License-Identifier: BSD-2-Clause
/// The result codes that the agent answers with: its own, from the public header, and those of the
/// TEE that it passes through, from the Client API. Here are those that neither of them names.
#ifndef COMMON_AGENT_CODES_H
#define COMMON_AGENT_CODES_H

#include <otrp.h>

#include <cstdint>

namespace tools {

constexpr uint32_t kStorageNotAvailable = 0xF0100003;
constexpr uint32_t kStorageNoSpace = 0xFFFF3041;
constexpr uint32_t kMacInvalid = 0xFFFF3071;
constexpr uint32_t kSignatureInvalid = 0xFFFF3072;

}  // namespace tools

#endif
