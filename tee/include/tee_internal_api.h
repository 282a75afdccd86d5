// SPDX-License-Identifier: BSD-2-Clause
/// GlobalPlatform TEE Internal Core API 1.1: the part of it that trusted applications here use.
///
/// Names, signatures and constants are the standard's. The standard passes buffer lengths as
/// uint32_t in version 1.1 and as size_t from 1.3 on; define TEE_API_SIZE_T_LENGTHS to compile
/// a trusted application against the later form.
///
/// Lengths are in bytes, sizes of keys in bits. Outputs with a length pointer take the capacity of
/// the buffer there and leave the length that was written; when that is too small the call returns
/// TEE_ERROR_SHORT_BUFFER and leaves the length that is needed. Handles belong to the instance that
/// opened them, which closes what it leaves open when it ends; TEE_HANDLE_NULL may be closed and
/// freed. What the standard calls a programmer error (a handle
/// that is not open, a call out of order, an attribute of another type) panics: one line on
/// standard error, and the process aborts. The other results are those that the standard gives each
/// call, and TEE_ERROR_OUT_OF_MEMORY where the host has none; a persistent object that a call finds
/// corrupt (TEE_ERROR_CORRUPT_OBJECT) has its handle closed.
///
/// What differs from the standard:
///
/// - RSA keys begin at 512 bits, not 256. Their size is a multiple of 8.
/// - The nonce of AES-GCM has at most 128 bytes (TEE_ERROR_NOT_SUPPORTED).
/// - Persistent objects hold data, not keys, and are not truncated, renamed or enumerated.
/// - Uses of a key are not restricted: TEE_ObjectInfo has all of them.
/// - Time limits of calls between trusted applications, the IV of a MAC and the parameters of
///   asymmetric operations are ignored. A memory reference in such a call is handed on as it is,
///   whosever the memory.
#ifndef TEE_INTERNAL_API_H
#define TEE_INTERNAL_API_H

#include <stdbool.h>
#include <stddef.h>
#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

/// A length or capacity of a buffer, in bytes. The name is this header's own.
#ifdef TEE_API_SIZE_T_LENGTHS
typedef size_t TEE_LengthType;
#else
typedef uint32_t TEE_LengthType;
#endif

// ---- Common types (section 3)

/// TEE_SUCCESS or a code that says what went wrong.
typedef uint32_t TEE_Result;

/// Names a trusted application; its text (RFC 4122) has the hexadecimal digits of these, in order.
typedef struct {
  uint32_t timeLow;            // 8 digits
  uint16_t timeMid;            // 4 digits
  uint16_t timeHiAndVersion;   // 4 digits
  uint8_t clockSeqAndNode[8];  // 4 and 12 digits
} TEE_UUID;

/// Who a client is.
typedef struct {
  uint32_t login;  // TEE_LOGIN_PUBLIC or TEE_LOGIN_TRUSTED_APP
  TEE_UUID uuid;   // of the calling trusted application; zeros for the normal world
} TEE_Identity;

/// One of the four parameters of a command; its type says which member counts.
typedef union {
  struct {
    void *buffer;         // of the client, which may change it at any time
    TEE_LengthType size;  // bytes; of an output afterwards what was, or would be, written
  } memref;               // of TEE_PARAM_TYPE_MEMREF_*
  struct {
    uint32_t a;
    uint32_t b;
  } value;  // of TEE_PARAM_TYPE_VALUE_*
} TEE_Param;

/// Handles: of a session with another trusted application, a set of properties, an object and a
/// cryptographic operation.
/// @{
typedef struct __TEE_TASessionHandle *TEE_TASessionHandle;
typedef struct __TEE_PropSetHandle *TEE_PropSetHandle;
typedef struct __TEE_ObjectHandle *TEE_ObjectHandle;
typedef struct __TEE_OperationHandle *TEE_OperationHandle;
/// @}

/// One of TEE_TYPE_*.
typedef uint32_t TEE_ObjectType;

/// One of TEE_MODE_*.
typedef uint32_t TEE_OperationMode;

/// A component of a key, or a parameter of its generation. Numbers are big-endian.
typedef struct {
  uint32_t attributeID;  // TEE_ATTR_*
  union {
    struct {
      void *buffer;
      TEE_LengthType length;
    } ref;
    struct {
      uint32_t a;
      uint32_t b;
    } value;  // of attributes with TEE_ATTR_FLAG_VALUE, of which this TEE has none
  } content;  // stays the caller's; a key copies it
} TEE_Attribute;

/// What TEE_GetObjectInfo1() tells.
typedef struct {
  uint32_t objectType;     // TEE_TYPE_*
  uint32_t objectSize;     // of a key, in bits; 0 until it is set
  uint32_t maxObjectSize;  // of a key, in bits
  uint32_t objectUsage;    // all bits set: uses are not restricted here
  uint32_t dataSize;       // of a persistent object's data stream, in bytes
  uint32_t dataPosition;   // of this handle in it, in bytes
  uint32_t handleFlags;    // TEE_HANDLE_FLAG_*, and TEE_DATA_FLAG_* of a persistent object
} TEE_ObjectInfo;

/// No handle.
#define TEE_HANDLE_NULL 0

// ---- Result codes (table 3-2)

/// Result codes that calls return, or trusted applications answer with.
/// @{
#define TEE_SUCCESS 0x00000000u
#define TEE_ERROR_CORRUPT_OBJECT 0xF0100001u
#define TEE_ERROR_CORRUPT_OBJECT_2 0xF0100002u
#define TEE_ERROR_STORAGE_NOT_AVAILABLE 0xF0100003u
#define TEE_ERROR_STORAGE_NOT_AVAILABLE_2 0xF0100004u
#define TEE_ERROR_GENERIC 0xFFFF0000u
#define TEE_ERROR_ACCESS_DENIED 0xFFFF0001u
#define TEE_ERROR_CANCEL 0xFFFF0002u
#define TEE_ERROR_ACCESS_CONFLICT 0xFFFF0003u
#define TEE_ERROR_EXCESS_DATA 0xFFFF0004u
#define TEE_ERROR_BAD_FORMAT 0xFFFF0005u
#define TEE_ERROR_BAD_PARAMETERS 0xFFFF0006u
#define TEE_ERROR_BAD_STATE 0xFFFF0007u
#define TEE_ERROR_ITEM_NOT_FOUND 0xFFFF0008u
#define TEE_ERROR_NOT_IMPLEMENTED 0xFFFF0009u
#define TEE_ERROR_NOT_SUPPORTED 0xFFFF000Au
#define TEE_ERROR_NO_DATA 0xFFFF000Bu
#define TEE_ERROR_OUT_OF_MEMORY 0xFFFF000Cu
#define TEE_ERROR_BUSY 0xFFFF000Du
#define TEE_ERROR_COMMUNICATION 0xFFFF000Eu
#define TEE_ERROR_SECURITY 0xFFFF000Fu
#define TEE_ERROR_SHORT_BUFFER 0xFFFF0010u
#define TEE_ERROR_TARGET_DEAD 0xFFFF3024u
#define TEE_ERROR_STORAGE_NO_SPACE 0xFFFF3041u
#define TEE_ERROR_MAC_INVALID 0xFFFF3071u
#define TEE_ERROR_SIGNATURE_INVALID 0xFFFF3072u
/// @}

// ---- Parameters, sessions, identities (sections 4.3, 4.7, 4.9)

/// Types of a parameter; the directions are seen from the trusted application that is called.
/// @{
#define TEE_PARAM_TYPE_NONE 0u
#define TEE_PARAM_TYPE_VALUE_INPUT 1u
#define TEE_PARAM_TYPE_VALUE_OUTPUT 2u
#define TEE_PARAM_TYPE_VALUE_INOUT 3u
#define TEE_PARAM_TYPE_MEMREF_INPUT 5u
#define TEE_PARAM_TYPE_MEMREF_OUTPUT 6u
#define TEE_PARAM_TYPE_MEMREF_INOUT 7u
/// @}

/// The types of four parameters as one number, and the type of parameter `i` in it.
/// @{
#define TEE_PARAM_TYPES(t0, t1, t2, t3) ((t0) | ((t1) << 4) | ((t2) << 8) | ((t3) << 12))
#define TEE_PARAM_TYPE_GET(t, i) (((t) >> ((i)*4)) & 0xFu)
/// @}

/// Waits for as long as it takes; other times are taken like it.
#define TEE_TIMEOUT_INFINITE 0xFFFFFFFFu

/// Where a result arose: in the caller's TEE, on the way, in the other's TEE, or in the trusted
/// application that was called.
/// @{
#define TEE_ORIGIN_API 1u
#define TEE_ORIGIN_COMMS 2u
#define TEE_ORIGIN_TEE 3u
#define TEE_ORIGIN_TRUSTED_APP 4u
/// @}

/// Kinds of clients: the normal world, and another trusted application.
/// @{
#define TEE_LOGIN_PUBLIC 0x00000000u
#define TEE_LOGIN_TRUSTED_APP 0xF0000000u
/// @}

/// Properties of the client that has called, and of this trusted application.
/// @{
#define TEE_PROPSET_CURRENT_CLIENT ((TEE_PropSetHandle)0xFFFFFFFE)
#define TEE_PROPSET_CURRENT_TA ((TEE_PropSetHandle)0xFFFFFFFF)
/// @}

/// Says who has called: `name` is "gpd.client.identity", of TEE_PROPSET_CURRENT_CLIENT. Anything
/// else gives TEE_ERROR_ITEM_NOT_FOUND.
TEE_Result TEE_GetPropertyAsIdentity(TEE_PropSetHandle propsetOrEnumerator, const char *name,
                                     TEE_Identity *value);

/// Ends the process: the trusted application has found itself at fault.
void TEE_Panic(TEE_Result panicCode) __attribute__((noreturn));

/// Opens a session with another trusted application, which learns the caller's UUID. `params` may
/// be NULL when no parameter is passed, `returnOrigin` NULL always.
///
/// Returns TEE_ERROR_BUSY where the other would have to wait for the caller,
/// TEE_ERROR_ITEM_NOT_FOUND when it is not there, or what it answers; `*session` is TEE_HANDLE_NULL
/// then.
TEE_Result TEE_OpenTASession(const TEE_UUID *destination, uint32_t cancellationRequestTimeout,
                             uint32_t paramTypes, TEE_Param params[4], TEE_TASessionHandle *session,
                             uint32_t *returnOrigin);

/// Closes the session.
void TEE_CloseTASession(TEE_TASessionHandle session);

/// Invokes a command and waits for its end. Memory references reach the other without a copy.
/// Returns what it answers; outputs are written back whatever that is.
TEE_Result TEE_InvokeTACommand(TEE_TASessionHandle session, uint32_t cancellationRequestTimeout,
                               uint32_t commandID, uint32_t paramTypes, TEE_Param params[4],
                               uint32_t *returnOrigin);

// ---- Memory (section 4.11)

/// The hint of TEE_Malloc().
#define TEE_MALLOC_FILL_ZERO 0x00000000u

/// Zero-filled memory from the instance's heap of gpd.ta.dataSize bytes; NULL when that is full.
/// A block takes its size, rounded up to 16 bytes, and 16 more. A size of 0 gives a unique pointer
/// that must not be dereferenced. TEE_Free() frees it.
void *TEE_Malloc(TEE_LengthType size, uint32_t hint);

/// Frees memory of TEE_Malloc(); NULL is ignored.
void TEE_Free(void *buffer);

// ---- Objects (section 5)

/// The storage of the trusted application, which no other can see: the only one here.
#define TEE_STORAGE_PRIVATE 0x00000001u

/// What a handle of a persistent object may do, what it lets other handles of the object do
/// meanwhile, and whether a creation may replace an object.
/// @{
#define TEE_DATA_FLAG_ACCESS_READ 0x00000001u
#define TEE_DATA_FLAG_ACCESS_WRITE 0x00000002u
#define TEE_DATA_FLAG_ACCESS_WRITE_META 0x00000004u
#define TEE_DATA_FLAG_SHARE_READ 0x00000010u
#define TEE_DATA_FLAG_SHARE_WRITE 0x00000020u
#define TEE_DATA_FLAG_OVERWRITE 0x00000400u
/// @}

/// Flags in `handleFlags` of TEE_ObjectInfo.
/// @{
#define TEE_HANDLE_FLAG_PERSISTENT 0x00010000u
#define TEE_HANDLE_FLAG_INITIALIZED 0x00020000u
#define TEE_HANDLE_FLAG_KEY_SET 0x00040000u
#define TEE_HANDLE_FLAG_EXPECT_TWO_KEYS 0x00080000u
/// @}

/// Bytes of the longest object ID.
#define TEE_OBJECT_ID_MAX_LEN 64u

/// Object types. Keys of AES have 128, 192 or 256 bits, of HMAC 192 to 1024 (whole bytes), of RSA
/// 512 to 4096 (whole bytes). TEE_TYPE_DATA is a persistent object without a key.
/// @{
#define TEE_TYPE_AES 0xA0000010u
#define TEE_TYPE_HMAC_SHA256 0xA0000004u
#define TEE_TYPE_RSA_PUBLIC_KEY 0xA0000030u
#define TEE_TYPE_RSA_KEYPAIR 0xA1000030u
#define TEE_TYPE_DATA 0xA00000BFu
/// @}

/// Attributes of objects, and the flags in their IDs: two numbers instead of a buffer; not secret.
/// @{
#define TEE_ATTR_FLAG_VALUE 0x20000000u
#define TEE_ATTR_FLAG_PUBLIC 0x10000000u
#define TEE_ATTR_SECRET_VALUE 0xC0000000u
#define TEE_ATTR_RSA_MODULUS 0xD0000130u
#define TEE_ATTR_RSA_PUBLIC_EXPONENT 0xD0000230u
#define TEE_ATTR_RSA_PRIVATE_EXPONENT 0xC0000330u
#define TEE_ATTR_RSA_PRIME1 0xC0000430u
#define TEE_ATTR_RSA_PRIME2 0xC0000530u
#define TEE_ATTR_RSA_EXPONENT1 0xC0000630u
#define TEE_ATTR_RSA_EXPONENT2 0xC0000730u
#define TEE_ATTR_RSA_COEFFICIENT 0xC0000830u
/// @}

/// Describes an object of any kind.
TEE_Result TEE_GetObjectInfo1(TEE_ObjectHandle object, TEE_ObjectInfo *objectInfo);

/// Copies an attribute of a key that is set. TEE_ERROR_ITEM_NOT_FOUND when the key has none of this
/// ID: a key pair that was populated without primes has none of theirs.
TEE_Result TEE_GetObjectBufferAttribute(TEE_ObjectHandle object, uint32_t attributeID, void *buffer,
                                        TEE_LengthType *size);

/// Closes an object. It cannot fail: what was written is durable already. An object that was
/// created empty and never written becomes durable now; when storage cannot take it, it is not
/// there when it is opened next.
void TEE_CloseObject(TEE_ObjectHandle object);

/// Makes an object for a key of up to `maxObjectSize` bits, to be populated or generated.
/// TEE_ERROR_NOT_SUPPORTED for a type or size that keys cannot have.
TEE_Result TEE_AllocateTransientObject(TEE_ObjectType objectType, uint32_t maxObjectSize,
                                       TEE_ObjectHandle *object);

/// Wipes and frees the object.
void TEE_FreeTransientObject(TEE_ObjectHandle object);

/// Sets the key from its components: TEE_ATTR_SECRET_VALUE; or modulus and public exponent, for a
/// key pair the private exponent, and either all five of the others or none. Values are copied.
/// TEE_ERROR_BAD_PARAMETERS when they are no key; the object is as before then.
TEE_Result TEE_PopulateTransientObject(TEE_ObjectHandle object, const TEE_Attribute *attrs,
                                       uint32_t attrCount);

/// Fills `attr`; the buffer is not copied.
void TEE_InitRefAttribute(TEE_Attribute *attr, uint32_t attributeID, const void *buffer,
                          TEE_LengthType length);

/// Makes a random key of `keySize` bits in an object that has none. The one parameter is
/// TEE_ATTR_RSA_PUBLIC_EXPONENT, of RSA (65537 without it). TEE_ERROR_BAD_PARAMETERS for an
/// exponent that such keys cannot have; a size that they cannot have panics.
TEE_Result TEE_GenerateKey(TEE_ObjectHandle object, uint32_t keySize, const TEE_Attribute *params,
                           uint32_t paramCount);

/// Opens a persistent object, positioned at its start. The ID is any bytes, of up to
/// TEE_OBJECT_ID_MAX_LEN, not in memory that the caller of a command shares.
///
/// Returns TEE_ERROR_ITEM_NOT_FOUND, TEE_ERROR_ACCESS_CONFLICT when other handles and this one do
/// not share what they do, or a code of the storage; `*object` is TEE_HANDLE_NULL then.
TEE_Result TEE_OpenPersistentObject(uint32_t storageID, const void *objectID,
                                    TEE_LengthType objectIDLen, uint32_t flags,
                                    TEE_ObjectHandle *object);

/// Creates an object with `initialData` (may be NULL when it is empty), positioned at its start. It
/// is durable when the call returns; without data it may wait for the first TEE_WriteObjectData()
/// (of any size, 0 included) or for TEE_CloseObject(), and what it replaces stays until then.
/// `attributes` is TEE_HANDLE_NULL: objects with keys give TEE_ERROR_NOT_SUPPORTED. `object` must
/// not be NULL, as it may in the standard.
///
/// Returns TEE_ERROR_ACCESS_CONFLICT when the object exists and TEE_DATA_FLAG_OVERWRITE is not set,
/// or when it is open; TEE_ERROR_STORAGE_NO_SPACE, or another code of the storage.
TEE_Result TEE_CreatePersistentObject(uint32_t storageID, const void *objectID,
                                      TEE_LengthType objectIDLen, uint32_t flags,
                                      TEE_ObjectHandle attributes, const void *initialData,
                                      TEE_LengthType initialDataLen, TEE_ObjectHandle *object);

/// Deletes an object that was opened with TEE_DATA_FLAG_ACCESS_WRITE_META, durably. The handle is
/// closed whatever the result, which is TEE_ERROR_STORAGE_NOT_AVAILABLE when the object is still
/// there.
TEE_Result TEE_CloseAndDeletePersistentObject1(TEE_ObjectHandle object);

/// Reads up to `size` bytes from the position on; `*count` receives how many. At the end of the
/// data that is 0, and a success.
TEE_Result TEE_ReadObjectData(TEE_ObjectHandle object, void *buffer, TEE_LengthType size,
                              TEE_LengthType *count);

/// Writes all bytes at the position, over what is there and past its end, or none. They are durable
/// when the call returns.
///
/// Returns TEE_ERROR_STORAGE_NO_SPACE when the storage or the host's memory is full, or another
/// code of the storage (TEE_ERROR_STORAGE_NOT_AVAILABLE, TEE_ERROR_CORRUPT_OBJECT).
TEE_Result TEE_WriteObjectData(TEE_ObjectHandle object, const void *buffer, TEE_LengthType size);

// ---- Cryptographic operations (section 6)

/// Algorithms: AES in CBC mode without padding, and in GCM (NIST SP 800-38A, 800-38D), HMAC (RFC
/// 2104) and digest with SHA-256 (FIPS 180-4), RSA encryption and signatures of PKCS #1 v1.5 (RFC
/// 8017).
/// @{
#define TEE_ALG_AES_CBC_NOPAD 0x10000110u
#define TEE_ALG_AES_GCM 0x40000810u
#define TEE_ALG_HMAC_SHA256 0x30000004u
#define TEE_ALG_SHA256 0x50000004u
#define TEE_ALG_RSAES_PKCS1_V1_5 0x60000130u
#define TEE_ALG_RSASSA_PKCS1_V1_5_SHA256 0x70004830u
/// @}

/// What an operation does.
/// @{
#define TEE_MODE_ENCRYPT 0u
#define TEE_MODE_DECRYPT 1u
#define TEE_MODE_SIGN 2u
#define TEE_MODE_VERIFY 3u
#define TEE_MODE_MAC 4u
#define TEE_MODE_DIGEST 5u
/// @}

/// Makes an operation for keys of up to `maxKeySize` bits (0 for a digest).
/// TEE_ERROR_NOT_SUPPORTED for an algorithm, mode or size that does not go with the others.
TEE_Result TEE_AllocateOperation(TEE_OperationHandle *operation, uint32_t algorithm, uint32_t mode,
                                 uint32_t maxKeySize);

/// Frees the operation and its copy of the key.
void TEE_FreeOperation(TEE_OperationHandle operation);

/// Gives the operation a copy of the key; TEE_HANDLE_NULL takes its key away. A key pair also
/// encrypts and verifies.
TEE_Result TEE_SetOperationKey(TEE_OperationHandle operation, TEE_ObjectHandle key);

/// Adds bytes to the digest.
void TEE_DigestUpdate(TEE_OperationHandle operation, const void *chunk, TEE_LengthType chunkSize);

/// Adds the last bytes, gives the digest, of 32 bytes, and begins a new one.
TEE_Result TEE_DigestDoFinal(TEE_OperationHandle operation, const void *chunk,
                             TEE_LengthType chunkLen, void *hash, TEE_LengthType *hashLen);

/// Starts a cipher with an IV of 16 bytes.
void TEE_CipherInit(TEE_OperationHandle operation, const void *IV, TEE_LengthType IVLen);

/// Encrypts or decrypts. Whole blocks come out; the rest waits for more. Source and destination may
/// be the same.
TEE_Result TEE_CipherUpdate(TEE_OperationHandle operation, const void *srcData,
                            TEE_LengthType srcLen, void *destData, TEE_LengthType *destLen);

/// The same, and ends; all input together must be whole blocks.
TEE_Result TEE_CipherDoFinal(TEE_OperationHandle operation, const void *srcData,
                             TEE_LengthType srcLen, void *destData, TEE_LengthType *destLen);

/// Starts a MAC; the IV is ignored.
void TEE_MACInit(TEE_OperationHandle operation, const void *IV, TEE_LengthType IVLen);

/// Adds bytes to the MAC.
void TEE_MACUpdate(TEE_OperationHandle operation, const void *chunk, TEE_LengthType chunkSize);

/// Adds the last bytes, gives the MAC, of 32 bytes, and ends.
TEE_Result TEE_MACComputeFinal(TEE_OperationHandle operation, const void *message,
                               TEE_LengthType messageLen, void *mac, TEE_LengthType *macLen);

/// Starts authenticated encryption with a tag of `tagLen` bits: 96, 104, 112, 120 or 128. The
/// lengths of AAD and payload need not be known. TEE_ERROR_NOT_SUPPORTED for another tag or a
/// longer nonce than 128 bytes; an empty nonce, and an operation that is running, panic.
TEE_Result TEE_AEInit(TEE_OperationHandle operation, const void *nonce, TEE_LengthType nonceLen,
                      uint32_t tagLen, uint32_t AADLen, uint32_t payloadLen);

/// Adds bytes that are authenticated but not encrypted; before the payload.
void TEE_AEUpdateAAD(TEE_OperationHandle operation, const void *AADdata, TEE_LengthType AADdataLen);

/// Encrypts or decrypts; as many bytes come out. Nothing decrypted is to be trusted before
/// TEE_AEDecryptFinal() has succeeded.
TEE_Result TEE_AEUpdate(TEE_OperationHandle operation, const void *srcData, TEE_LengthType srcLen,
                        void *destData, TEE_LengthType *destLen);

/// Encrypts the last bytes, gives the tag and ends.
TEE_Result TEE_AEEncryptFinal(TEE_OperationHandle operation, const void *srcData,
                              TEE_LengthType srcLen, void *destData, TEE_LengthType *destLen,
                              void *tag, TEE_LengthType *tagLen);

/// Decrypts the last bytes, compares the tag (`tagLen` in bytes) and ends. TEE_ERROR_MAC_INVALID
/// when it differs.
TEE_Result TEE_AEDecryptFinal(TEE_OperationHandle operation, const void *srcData,
                              TEE_LengthType srcLen, void *destData, TEE_LengthType *destLen,
                              void *tag, TEE_LengthType tagLen);

/// Encrypts up to as many bytes as the modulus has, less 11. Parameters are ignored. The output has
/// the length of the modulus. TEE_ERROR_BAD_PARAMETERS for longer input.
TEE_Result TEE_AsymmetricEncrypt(TEE_OperationHandle operation, const TEE_Attribute *params,
                                 uint32_t paramCount, const void *srcData, TEE_LengthType srcLen,
                                 void *destData, TEE_LengthType *destLen);

/// Decrypts. TEE_ERROR_BAD_PARAMETERS for input of another length than the modulus, or with bad
/// padding; a caller must not let others see a difference.
TEE_Result TEE_AsymmetricDecrypt(TEE_OperationHandle operation, const TEE_Attribute *params,
                                 uint32_t paramCount, const void *srcData, TEE_LengthType srcLen,
                                 void *destData, TEE_LengthType *destLen);

/// Signs a SHA-256 digest, of 32 bytes. The signature has the length of the modulus.
TEE_Result TEE_AsymmetricSignDigest(TEE_OperationHandle operation, const TEE_Attribute *params,
                                    uint32_t paramCount, const void *digest,
                                    TEE_LengthType digestLen, void *signature,
                                    TEE_LengthType *signatureLen);

/// Verifies the signature of a SHA-256 digest. TEE_ERROR_SIGNATURE_INVALID when it is none.
TEE_Result TEE_AsymmetricVerifyDigest(TEE_OperationHandle operation, const TEE_Attribute *params,
                                      uint32_t paramCount, const void *digest,
                                      TEE_LengthType digestLen, const void *signature,
                                      TEE_LengthType signatureLen);

/// Fills the buffer with bytes of a cryptographic random number generator.
void TEE_GenerateRandom(void *randomBuffer, TEE_LengthType randomBufferLen);

// ---- TA entry points (section 4.3), implemented by each trusted application

/// Makes a function visible outside the trusted application's image.
#define TA_EXPORT __attribute__((visibility("default")))

/// A new instance starts. Any other result than TEE_SUCCESS ends it, and is the client's answer.
TEE_Result TA_EXPORT TA_CreateEntryPoint(void);

/// The instance ends: its last session has been closed.
void TA_EXPORT TA_DestroyEntryPoint(void);

/// A client opens a session. `*sessionContext` is handed to the session's other calls. Any other
/// result than TEE_SUCCESS refuses it.
TEE_Result TA_EXPORT TA_OpenSessionEntryPoint(uint32_t paramTypes, TEE_Param params[4],
                                              void **sessionContext);

/// A client closes its session.
void TA_EXPORT TA_CloseSessionEntryPoint(void *sessionContext);

/// A client invokes a command. The result is its answer; what it may have changed in `params` goes
/// back to the client.
TEE_Result TA_EXPORT TA_InvokeCommandEntryPoint(void *sessionContext, uint32_t commandID,
                                                uint32_t paramTypes, TEE_Param params[4]);

#ifdef __cplusplus
}
#endif

#endif
