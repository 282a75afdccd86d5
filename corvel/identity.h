// SPDX-License-Identifier: BSD-2-Clause
/// What makes this device this device. It lies in one persistent object, which is created whole:
/// a device that loses power at its first use has either no identity yet, or all of it.
///
/// Object "IDENTITY": the device ID, kDeviceIdLen characters, then the TEE key in the form in
/// which it is handed out (see corvel.h), in order of the types.
#ifndef IDENTITY_H
#define IDENTITY_H

#include "cursor.h"
#include "ownership.h"

constexpr uint32_t kDeviceIdLen = 32;
constexpr uint32_t kEndorsementIdLen = 64;

/// The readers look into `stored`.
struct identity {
  secret_bytes stored;
  reader device_id;
  reader key_box;
  reader modulus;
  reader public_exponent;
};

/// Reads the identity into the fresh `*device`; makes and stores it first if there is none.
///
/// Returns TEE_ERROR_CORRUPT_OBJECT for an object of another form, which is left alone: those who
/// know this device know it by what was there. Other failures are the platform's.
[[nodiscard]] TEE_Result get_identity(identity *device);

/// An ID for the key that `label` names: the SHA-256 digest of device ID and label in
/// hexadecimal digits, with a final NUL.
[[nodiscard]] TEE_Result get_endorsement_id(const identity &device, const reader &label,
                                            char id[kEndorsementIdLen + 1]);

#endif
