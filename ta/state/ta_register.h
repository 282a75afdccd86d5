// SPDX-License-Identifier: BSD-2-Clause
/// Which image each TA was installed from, by its digest.
///
/// It is one object, OTRP_TA_REGISTER_INFO, whose payload is
///
///     count (4 bytes, little-endian) | count rows of: taid (32 characters) | digest (32 bytes)
///
/// The rows stand in the order in which they came, without holes.
#ifndef TA_REGISTER_H
#define TA_REGISTER_H

#include <stdint.h>

#include "platform.h"

/// A TA image starts with a header of at least this many bytes. It holds the length of the image
/// digest (16 bits, little-endian) at offset 16 and the digest at offset 20.
constexpr uint32_t kTaImageHeaderLen = 52;

enum ta_register_operation : int32_t {
  kRegisterTa = 1,
  kUpdateTa = 2,
  kUnregisterTa = 3,
};

/// Changes the row of `taid`. `ta_image` has at least kTaImageHeaderLen bytes, or is NULL, which
/// only kUnregisterTa accepts.
///
/// OTRP_MISSING for a taid that has not 32 characters, an unknown operation or an image without a
/// 32-byte digest; OTRP_TA_EXISTS when the row to add is there; OTRP_NOT_FOUND when the row to
/// change is not; OTRP_NO_MEMORY; TEE_ERROR_BAD_FORMAT when the stored count does not fit the
/// table; a storage code. After a failure the table is as it was.
[[nodiscard]] TEE_Result save_ta_register_info(const char *taid, const uint8_t *ta_image,
                                               int32_t operation_code);

#endif
