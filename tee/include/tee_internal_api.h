// SPDX-License-Identifier: BSD-2-Clause
/// GlobalPlatform TEE Internal Core API 1.1: the part of it that trusted applications here use.
///
/// Names, signatures and constants are the standard's. The standard passes buffer lengths as
/// uint32_t in version 1.1 and as size_t from 1.3 on; define TEE_API_SIZE_T_LENGTHS to compile
/// a trusted application against the later form.
#ifndef TEE_INTERNAL_API_H
#define TEE_INTERNAL_API_H

#include <stdbool.h>
#include <stddef.h>
#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

#ifdef TEE_API_SIZE_T_LENGTHS
typedef size_t TEE_LengthType;
#else
typedef uint32_t TEE_LengthType;
#endif

// ---- Common types (section 3)

typedef uint32_t TEE_Result;

typedef struct {
  uint32_t timeLow;
  uint16_t timeMid;
  uint16_t timeHiAndVersion;
  uint8_t clockSeqAndNode[8];
} TEE_UUID;

typedef struct {
  uint32_t login;
  TEE_UUID uuid;
} TEE_Identity;

typedef union {
  struct {
    void *buffer;
    TEE_LengthType size;
  } memref;
  struct {
    uint32_t a;
    uint32_t b;
  } value;
} TEE_Param;

typedef struct __TEE_TASessionHandle *TEE_TASessionHandle;
typedef struct __TEE_PropSetHandle *TEE_PropSetHandle;
typedef struct __TEE_ObjectHandle *TEE_ObjectHandle;
typedef struct __TEE_OperationHandle *TEE_OperationHandle;

typedef uint32_t TEE_ObjectType;
typedef uint32_t TEE_OperationMode;

typedef struct {
  uint32_t attributeID;
  union {
    struct {
      void *buffer;
      TEE_LengthType length;
    } ref;
    struct {
      uint32_t a;
      uint32_t b;
    } value;
  } content;
} TEE_Attribute;

typedef struct {
  uint32_t objectType;
  uint32_t objectSize;
  uint32_t maxObjectSize;
  uint32_t objectUsage;
  uint32_t dataSize;
  uint32_t dataPosition;
  uint32_t handleFlags;
} TEE_ObjectInfo;

#define TEE_HANDLE_NULL 0

// ---- Result codes (table 3-2)

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

// ---- Parameters, sessions, identities (sections 4.3, 4.7, 4.9)

#define TEE_PARAM_TYPE_NONE 0u
#define TEE_PARAM_TYPE_VALUE_INPUT 1u
#define TEE_PARAM_TYPE_VALUE_OUTPUT 2u
#define TEE_PARAM_TYPE_VALUE_INOUT 3u
#define TEE_PARAM_TYPE_MEMREF_INPUT 5u
#define TEE_PARAM_TYPE_MEMREF_OUTPUT 6u
#define TEE_PARAM_TYPE_MEMREF_INOUT 7u

#define TEE_PARAM_TYPES(t0, t1, t2, t3) ((t0) | ((t1) << 4) | ((t2) << 8) | ((t3) << 12))
#define TEE_PARAM_TYPE_GET(t, i) (((t) >> ((i)*4)) & 0xFu)

#define TEE_TIMEOUT_INFINITE 0xFFFFFFFFu

#define TEE_ORIGIN_API 1u
#define TEE_ORIGIN_COMMS 2u
#define TEE_ORIGIN_TEE 3u
#define TEE_ORIGIN_TRUSTED_APP 4u

#define TEE_LOGIN_PUBLIC 0x00000000u
#define TEE_LOGIN_TRUSTED_APP 0xF0000000u

#define TEE_PROPSET_CURRENT_CLIENT ((TEE_PropSetHandle)0xFFFFFFFE)
#define TEE_PROPSET_CURRENT_TA ((TEE_PropSetHandle)0xFFFFFFFF)

/// Supports "gpd.client.identity" of TEE_PROPSET_CURRENT_CLIENT.
TEE_Result TEE_GetPropertyAsIdentity(TEE_PropSetHandle propsetOrEnumerator, const char *name,
                                     TEE_Identity *value);

void TEE_Panic(TEE_Result panicCode) __attribute__((noreturn));

TEE_Result TEE_OpenTASession(const TEE_UUID *destination, uint32_t cancellationRequestTimeout,
                             uint32_t paramTypes, TEE_Param params[4], TEE_TASessionHandle *session,
                             uint32_t *returnOrigin);
void TEE_CloseTASession(TEE_TASessionHandle session);
TEE_Result TEE_InvokeTACommand(TEE_TASessionHandle session, uint32_t cancellationRequestTimeout,
                               uint32_t commandID, uint32_t paramTypes, TEE_Param params[4],
                               uint32_t *returnOrigin);

// ---- Memory (section 4.11)

#define TEE_MALLOC_FILL_ZERO 0x00000000u

/// Zero-filled memory from the instance's heap; NULL when the heap is full. A size of 0 gives a
/// unique pointer that must not be dereferenced.
void *TEE_Malloc(TEE_LengthType size, uint32_t hint);
void TEE_Free(void *buffer);

// ---- Objects (section 5)

#define TEE_STORAGE_PRIVATE 0x00000001u

#define TEE_DATA_FLAG_ACCESS_READ 0x00000001u
#define TEE_DATA_FLAG_ACCESS_WRITE 0x00000002u
#define TEE_DATA_FLAG_ACCESS_WRITE_META 0x00000004u
#define TEE_DATA_FLAG_SHARE_READ 0x00000010u
#define TEE_DATA_FLAG_SHARE_WRITE 0x00000020u
#define TEE_DATA_FLAG_OVERWRITE 0x00000400u

#define TEE_HANDLE_FLAG_PERSISTENT 0x00010000u
#define TEE_HANDLE_FLAG_INITIALIZED 0x00020000u
#define TEE_HANDLE_FLAG_KEY_SET 0x00040000u
#define TEE_HANDLE_FLAG_EXPECT_TWO_KEYS 0x00080000u

#define TEE_OBJECT_ID_MAX_LEN 64u

#define TEE_TYPE_AES 0xA0000010u
#define TEE_TYPE_HMAC_SHA256 0xA0000004u
#define TEE_TYPE_RSA_PUBLIC_KEY 0xA0000030u
#define TEE_TYPE_RSA_KEYPAIR 0xA1000030u
#define TEE_TYPE_DATA 0xA00000BFu

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

TEE_Result TEE_GetObjectInfo1(TEE_ObjectHandle object, TEE_ObjectInfo *objectInfo);
TEE_Result TEE_GetObjectBufferAttribute(TEE_ObjectHandle object, uint32_t attributeID, void *buffer,
                                        TEE_LengthType *size);
void TEE_CloseObject(TEE_ObjectHandle object);

TEE_Result TEE_AllocateTransientObject(TEE_ObjectType objectType, uint32_t maxObjectSize,
                                       TEE_ObjectHandle *object);
void TEE_FreeTransientObject(TEE_ObjectHandle object);
TEE_Result TEE_PopulateTransientObject(TEE_ObjectHandle object, const TEE_Attribute *attrs,
                                       uint32_t attrCount);
void TEE_InitRefAttribute(TEE_Attribute *attr, uint32_t attributeID, const void *buffer,
                          TEE_LengthType length);
TEE_Result TEE_GenerateKey(TEE_ObjectHandle object, uint32_t keySize, const TEE_Attribute *params,
                           uint32_t paramCount);

TEE_Result TEE_OpenPersistentObject(uint32_t storageID, const void *objectID,
                                    TEE_LengthType objectIDLen, uint32_t flags,
                                    TEE_ObjectHandle *object);
TEE_Result TEE_CreatePersistentObject(uint32_t storageID, const void *objectID,
                                      TEE_LengthType objectIDLen, uint32_t flags,
                                      TEE_ObjectHandle attributes, const void *initialData,
                                      TEE_LengthType initialDataLen, TEE_ObjectHandle *object);
TEE_Result TEE_CloseAndDeletePersistentObject1(TEE_ObjectHandle object);
TEE_Result TEE_ReadObjectData(TEE_ObjectHandle object, void *buffer, TEE_LengthType size,
                              TEE_LengthType *count);
TEE_Result TEE_WriteObjectData(TEE_ObjectHandle object, const void *buffer, TEE_LengthType size);

// ---- Cryptographic operations (section 6)

#define TEE_ALG_AES_CBC_NOPAD 0x10000110u
#define TEE_ALG_AES_GCM 0x40000810u
#define TEE_ALG_HMAC_SHA256 0x30000004u
#define TEE_ALG_SHA256 0x50000004u
#define TEE_ALG_RSAES_PKCS1_V1_5 0x60000130u
#define TEE_ALG_RSASSA_PKCS1_V1_5_SHA256 0x70004830u

#define TEE_MODE_ENCRYPT 0u
#define TEE_MODE_DECRYPT 1u
#define TEE_MODE_SIGN 2u
#define TEE_MODE_VERIFY 3u
#define TEE_MODE_MAC 4u
#define TEE_MODE_DIGEST 5u

TEE_Result TEE_AllocateOperation(TEE_OperationHandle *operation, uint32_t algorithm, uint32_t mode,
                                 uint32_t maxKeySize);
void TEE_FreeOperation(TEE_OperationHandle operation);
TEE_Result TEE_SetOperationKey(TEE_OperationHandle operation, TEE_ObjectHandle key);

void TEE_DigestUpdate(TEE_OperationHandle operation, const void *chunk, TEE_LengthType chunkSize);
TEE_Result TEE_DigestDoFinal(TEE_OperationHandle operation, const void *chunk,
                             TEE_LengthType chunkLen, void *hash, TEE_LengthType *hashLen);

void TEE_CipherInit(TEE_OperationHandle operation, const void *IV, TEE_LengthType IVLen);
TEE_Result TEE_CipherUpdate(TEE_OperationHandle operation, const void *srcData,
                            TEE_LengthType srcLen, void *destData, TEE_LengthType *destLen);
TEE_Result TEE_CipherDoFinal(TEE_OperationHandle operation, const void *srcData,
                             TEE_LengthType srcLen, void *destData, TEE_LengthType *destLen);

void TEE_MACInit(TEE_OperationHandle operation, const void *IV, TEE_LengthType IVLen);
void TEE_MACUpdate(TEE_OperationHandle operation, const void *chunk, TEE_LengthType chunkSize);
TEE_Result TEE_MACComputeFinal(TEE_OperationHandle operation, const void *message,
                               TEE_LengthType messageLen, void *mac, TEE_LengthType *macLen);

TEE_Result TEE_AEInit(TEE_OperationHandle operation, const void *nonce, TEE_LengthType nonceLen,
                      uint32_t tagLen, uint32_t AADLen, uint32_t payloadLen);
void TEE_AEUpdateAAD(TEE_OperationHandle operation, const void *AADdata, TEE_LengthType AADdataLen);
TEE_Result TEE_AEUpdate(TEE_OperationHandle operation, const void *srcData, TEE_LengthType srcLen,
                        void *destData, TEE_LengthType *destLen);
TEE_Result TEE_AEEncryptFinal(TEE_OperationHandle operation, const void *srcData,
                              TEE_LengthType srcLen, void *destData, TEE_LengthType *destLen,
                              void *tag, TEE_LengthType *tagLen);
TEE_Result TEE_AEDecryptFinal(TEE_OperationHandle operation, const void *srcData,
                              TEE_LengthType srcLen, void *destData, TEE_LengthType *destLen,
                              void *tag, TEE_LengthType tagLen);

TEE_Result TEE_AsymmetricEncrypt(TEE_OperationHandle operation, const TEE_Attribute *params,
                                 uint32_t paramCount, const void *srcData, TEE_LengthType srcLen,
                                 void *destData, TEE_LengthType *destLen);
TEE_Result TEE_AsymmetricDecrypt(TEE_OperationHandle operation, const TEE_Attribute *params,
                                 uint32_t paramCount, const void *srcData, TEE_LengthType srcLen,
                                 void *destData, TEE_LengthType *destLen);
TEE_Result TEE_AsymmetricSignDigest(TEE_OperationHandle operation, const TEE_Attribute *params,
                                    uint32_t paramCount, const void *digest,
                                    TEE_LengthType digestLen, void *signature,
                                    TEE_LengthType *signatureLen);
TEE_Result TEE_AsymmetricVerifyDigest(TEE_OperationHandle operation, const TEE_Attribute *params,
                                      uint32_t paramCount, const void *digest,
                                      TEE_LengthType digestLen, const void *signature,
                                      TEE_LengthType signatureLen);

void TEE_GenerateRandom(void *randomBuffer, TEE_LengthType randomBufferLen);

// ---- TA entry points (section 4.3), implemented by each trusted application

#define TA_EXPORT __attribute__((visibility("default")))

TEE_Result TA_EXPORT TA_CreateEntryPoint(void);
void TA_EXPORT TA_DestroyEntryPoint(void);
TEE_Result TA_EXPORT TA_OpenSessionEntryPoint(uint32_t paramTypes, TEE_Param params[4],
                                              void **sessionContext);
void TA_EXPORT TA_CloseSessionEntryPoint(void *sessionContext);
TEE_Result TA_EXPORT TA_InvokeCommandEntryPoint(void *sessionContext, uint32_t commandID,
                                                uint32_t paramTypes, TEE_Param params[4]);

#ifdef __cplusplus
}
#endif

#endif
