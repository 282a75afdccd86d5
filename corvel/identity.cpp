// SPDX-License-Identifier: BSD-2-Clause
#include "identity.h"

#include <string.h>
#include <tee_trace.h>

static constexpr char kObjectId[] = {'I', 'D', 'E', 'N', 'T', 'I', 'T', 'Y'};

static constexpr uint32_t kKeySize = 2048;  // bits
static constexpr uint32_t kRecordHeaderLen = 4;
static constexpr uint32_t kDigestLen = kEndorsementIdLen / 2;

struct key_record {
  uint16_t type;
  uint32_t attribute;
};

static const key_record kKeyRecords[] = {
    {0x11, TEE_ATTR_RSA_MODULUS},
    {0x12, TEE_ATTR_RSA_PUBLIC_EXPONENT},
    {0x13, TEE_ATTR_RSA_PRIVATE_EXPONENT},
};
static constexpr uint32_t kNumKeyRecords = sizeof(kKeyRecords) / sizeof(kKeyRecords[0]);
static constexpr uint32_t kMaxIdentityLen =
    kDeviceIdLen + kNumKeyRecords * (kRecordHeaderLen + kKeySize / 8);

static void wipe(void *bytes, uint32_t len) {
  memset(bytes, 0, len);
  __asm__ __volatile__("" : : "r"(bytes) : "memory");  // or the compiler would drop it
}

secret_buffer::~secret_buffer() {
  if (data_ == nullptr) return;
  wipe(data_, len_);
  TEE_Free(data_);
}

bool secret_buffer::allocate(uint32_t len) {
  data_ = static_cast<uint8_t *>(TEE_Malloc(len, TEE_MALLOC_FILL_ZERO));
  len_ = len;
  return data_ != nullptr;
}

static void write_hex(const uint8_t *bytes, uint32_t len, char *text) {
  static const char kDigits[] = "0123456789abcdef";
  for (uint32_t i = 0; i < len; ++i) {
    text[2 * i] = kDigits[bytes[i] >> 4];
    text[2 * i + 1] = kDigits[bytes[i] & 0xF];
  }
}

// ---- Making

static void write_device_id(uint8_t *id) {
  uint8_t random[kDeviceIdLen / 2];
  TEE_GenerateRandom(random, sizeof(random));
  write_hex(random, sizeof(random), reinterpret_cast<char *>(id));
}

// The caller has room for the three records of a key of kKeySize bits.
static TEE_Result write_key_box(TEE_ObjectHandle key, uint8_t *box, uint32_t *box_len) {
  *box_len = 0;
  for (const key_record &record : kKeyRecords) {
    uint8_t *header = box + *box_len;
    TEE_LengthType len = kKeySize / 8;
    const TEE_Result result =
        TEE_GetObjectBufferAttribute(key, record.attribute, header + kRecordHeaderLen, &len);
    if (result != TEE_SUCCESS) return result;
    header[0] = static_cast<uint8_t>(record.type & 0xFF);
    header[1] = static_cast<uint8_t>(record.type >> 8);
    header[2] = static_cast<uint8_t>(len & 0xFF);
    header[3] = static_cast<uint8_t>(len >> 8);
    *box_len += kRecordHeaderLen + static_cast<uint32_t>(len);
  }
  return TEE_SUCCESS;
}

static TEE_Result generate_key_box(uint8_t *box, uint32_t *box_len) {
  TEE_ObjectHandle key = TEE_HANDLE_NULL;
  TEE_Result result = TEE_AllocateTransientObject(TEE_TYPE_RSA_KEYPAIR, kKeySize, &key);
  if (result != TEE_SUCCESS) return result;
  result = TEE_GenerateKey(key, kKeySize, nullptr, 0);
  if (result == TEE_SUCCESS) result = write_key_box(key, box, box_len);
  TEE_FreeTransientObject(key);
  return result;
}

static TEE_Result make_identity() {
  secret_buffer draft;
  if (!draft.allocate(kMaxIdentityLen)) return TEE_ERROR_OUT_OF_MEMORY;
  write_device_id(draft.data());
  uint32_t box_len = 0;
  TEE_Result result = generate_key_box(draft.data() + kDeviceIdLen, &box_len);
  if (result != TEE_SUCCESS) return result;

  TEE_ObjectHandle object = TEE_HANDLE_NULL;
  result = TEE_CreatePersistentObject(TEE_STORAGE_PRIVATE, kObjectId, sizeof(kObjectId),
                                      TEE_DATA_FLAG_ACCESS_WRITE, TEE_HANDLE_NULL, draft.data(),
                                      kDeviceIdLen + box_len, &object);
  if (result != TEE_SUCCESS) return result;
  TEE_CloseObject(object);
  return TEE_SUCCESS;
}

// ---- Reading

static bool take(byte_view *from, uint32_t len, byte_view *taken) {
  if (len == 0 || len > from->len) return false;
  *taken = {from->data, len};
  from->data += len;
  from->len -= len;
  return true;
}

static bool take_record(byte_view *from, uint16_t type, byte_view *value) {
  byte_view header;
  if (!take(from, kRecordHeaderLen, &header)) return false;
  const auto found_type = static_cast<uint16_t>(header.data[0] | header.data[1] << 8);
  const auto len = static_cast<uint32_t>(header.data[2] | header.data[3] << 8);
  return found_type == type && take(from, len, value);
}

static bool parse_identity(byte_view left, identity *device) {
  byte_view private_exponent;
  if (!take(&left, kDeviceIdLen, &device->device_id)) return false;
  device->key_box = left;
  return take_record(&left, kKeyRecords[0].type, &device->modulus) &&
         take_record(&left, kKeyRecords[1].type, &device->public_exponent) &&
         take_record(&left, kKeyRecords[2].type, &private_exponent) && left.len == 0;
}

static TEE_Result read_identity(identity *device) {
  TEE_ObjectHandle object = TEE_HANDLE_NULL;
  TEE_Result result = TEE_OpenPersistentObject(TEE_STORAGE_PRIVATE, kObjectId, sizeof(kObjectId),
                                               TEE_DATA_FLAG_ACCESS_READ, &object);
  if (result != TEE_SUCCESS) return result;

  // One byte more, so that an object that is too long does not pass for a shorter one.
  TEE_LengthType len = 0;
  result = device->stored.allocate(kMaxIdentityLen + 1)
               ? TEE_ReadObjectData(object, device->stored.data(), kMaxIdentityLen + 1, &len)
               : TEE_ERROR_OUT_OF_MEMORY;
  TEE_CloseObject(object);
  if (result != TEE_SUCCESS) return result;
  const byte_view found = {device->stored.data(), static_cast<uint32_t>(len)};
  return parse_identity(found, device) ? TEE_SUCCESS : TEE_ERROR_CORRUPT_OBJECT;
}

// A new identity is read back like an old one: what is given out is what storage holds.
TEE_Result get_identity(identity *device) {
  TEE_Result result = read_identity(device);
  if (result == TEE_ERROR_ITEM_NOT_FOUND) {
    result = make_identity();
    if (result == TEE_SUCCESS) result = read_identity(device);
  }
  if (result != TEE_SUCCESS) {
    tee_trace(__func__, __LINE__, TEE_TRACE_ERROR, "no identity, 0x%x", result);
  }
  return result;
}

TEE_Result get_endorsement_id(const identity &device, byte_view label,
                              char id[kEndorsementIdLen + 1]) {
  TEE_OperationHandle sha256 = TEE_HANDLE_NULL;
  TEE_Result result = TEE_AllocateOperation(&sha256, TEE_ALG_SHA256, TEE_MODE_DIGEST, 0);
  if (result != TEE_SUCCESS) return result;

  uint8_t digest[kDigestLen];
  TEE_LengthType digest_len = sizeof(digest);
  TEE_DigestUpdate(sha256, device.device_id.data, device.device_id.len);
  result = TEE_DigestDoFinal(sha256, label.data, label.len, digest, &digest_len);
  TEE_FreeOperation(sha256);
  if (result != TEE_SUCCESS) return result;

  write_hex(digest, sizeof(digest), id);
  id[kEndorsementIdLen] = '\0';
  return TEE_SUCCESS;
}
