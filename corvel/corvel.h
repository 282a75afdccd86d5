// SPDX-License-Identifier: BSD-2-Clause
/// The commands of the key service, which holds the identity of the device: its ID and the TEE's
/// 2048-bit RSA key pair, both made at first use and never changed.
///
/// Output buffers: the size becomes the length of what was written. Where it is too small, it
/// becomes the length that is needed, the result is TEE_ERROR_SHORT_BUFFER and nothing is written.
/// Parameters that are not mentioned are NONE. Wrong parameter types and wrong labels give
/// TEE_ERROR_BAD_PARAMETERS, unknown commands TEE_ERROR_NOT_SUPPORTED.
#ifndef CORVEL_H
#define CORVEL_H

// For trusted applications only; any other client gets TEE_ERROR_ACCESS_DENIED.

/// 0, MEMREF_OUTPUT: the key pair as records {type, length, value}, the first two as 2 bytes
/// little-endian: 0x11 modulus, 0x12 public exponent, 0x13 private exponent, all big-endian.
/// 1, VALUE_OUTPUT: a is the length of all records.
#define CORVEL_CMD_TEE_KEY 2u

/// 0, MEMREF_OUTPUT: the SP endorsement-key ID, 64 hexadecimal digits and a NUL.
/// 1, VALUE_OUTPUT: a is the length of the ID without its NUL.
/// 2, MEMREF_INPUT: CORVEL_SP_EK_LABEL.
#define CORVEL_CMD_SP_EK_ID 5u

/// 0, MEMREF_INPUT: CORVEL_EK_LABEL.
/// 1, MEMREF_OUTPUT: the device ID, 32 hexadecimal digits without a NUL.
/// 2, VALUE_OUTPUT: a is the length of the device ID.
#define CORVEL_CMD_DEVICE_ID 11u

// Labels count with their NUL.
#define CORVEL_EK_LABEL "EK"
#define CORVEL_SP_EK_LABEL "SP_EK_ID"

// For everyone: what a factory hands to those who are to manage the device.

/// 0, MEMREF_OUTPUT: the device ID, as above.
/// 1, MEMREF_OUTPUT: the public half of the TEE key: modulus length (4 bytes little-endian),
/// modulus, exponent length (the same), exponent.
/// When either buffer is too small, both sizes become what is needed.
#define CORVEL_CMD_PUBLIC_IDENTITY 0x100u

#endif
