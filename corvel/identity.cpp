// SPDX-License-Identifier: BSD-2-Clause
#include "identity.h"

#include "failure.h"

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

static void write_hex(const uint8_t *bytes, uint32_t len, char *text) {
  static const char kDigits[] = "0123456789abcdef";
  for (uint32_t i = 0; i < len; ++i) {
    text[2 * i] = kDigits[bytes[i] >> 4];
    text[2 * i + 1] = kDigits[bytes[i] & 0xF];
  }
}

// ---- Making

static void put_device_id(writer *out) {
  uint8_t random[kDeviceIdLen / 2];
  char id[kDeviceIdLen];
  TEE_GenerateRandom(random, sizeof(random));
  write_hex(random, sizeof(random), id);
  put(out, {id, sizeof id});
}

static TEE_Result put_key_box(TEE_ObjectHandle key, writer *out) {
  secret_bytes value;
  value.data = allocate_bytes(kKeySize / 8);
  if (value.data == nullptr) return TEE_ERROR_OUT_OF_MEMORY;
  value.len = kKeySize / 8;
  for (const key_record &record : kKeyRecords) {
    tee_length len = value.len;
    TRY(TEE_GetObjectBufferAttribute(key, record.attribute, value.data, &len));
    put_u16(out, record.type);
    put_u16(out, static_cast<uint16_t>(len));
    put(out, {value.data, static_cast<uint32_t>(len)});
  }
  return out->ok ? TEE_SUCCESS : TEE_ERROR_EXCESS_DATA;
}

static TEE_Result generate_key_box(writer *box) {
  key_object key;
  TRY(TEE_AllocateTransientObject(TEE_TYPE_RSA_KEYPAIR, kKeySize, out(key)));
  TRY(TEE_GenerateKey(key.get(), kKeySize, nullptr, 0));
  return put_key_box(key.get(), box);
}

static TEE_Result make_identity() {
  secret_bytes draft;
  draft.data = allocate_bytes(kMaxIdentityLen);
  if (draft.data == nullptr) return TEE_ERROR_OUT_OF_MEMORY;
  draft.len = kMaxIdentityLen;
  writer rest = {draft.data, draft.len};
  put_device_id(&rest);
  TRY(generate_key_box(&rest));

  stored_object object;
  return TEE_CreatePersistentObject(TEE_STORAGE_PRIVATE, kObjectId, sizeof kObjectId,
                                    TEE_DATA_FLAG_ACCESS_WRITE, TEE_HANDLE_NULL, draft.data,
                                    draft.len - rest.left, out(object));
}

// ---- Reading

static bool take_record(reader *in, uint16_t type, reader *value) {
  uint16_t found = 0;
  uint16_t len = 0;
  if (!take_u16(in, &found) || found != type || !take_u16(in, &len)) return false;
  value->left = len;
  return take(in, len, &value->at);
}

static bool parse_identity(reader in, identity *device) {
  reader private_exponent = {};
  device->device_id.left = kDeviceIdLen;
  if (!take(&in, kDeviceIdLen, &device->device_id.at)) return false;
  device->key_box = in;
  return take_record(&in, kKeyRecords[0].type, &device->modulus) &&
         take_record(&in, kKeyRecords[1].type, &device->public_exponent) &&
         take_record(&in, kKeyRecords[2].type, &private_exponent) && in.left == 0;
}

static TEE_Result read_identity(identity *device) {
  stored_object object;
  TRY(TEE_OpenPersistentObject(TEE_STORAGE_PRIVATE, kObjectId, sizeof kObjectId,
                               TEE_DATA_FLAG_ACCESS_READ, out(object)));
  // One byte more, so that an object that is too long does not pass for a shorter one.
  secret_bytes &stored = device->stored;
  stored.data = allocate_bytes(kMaxIdentityLen + 1);
  if (stored.data == nullptr) return TEE_ERROR_OUT_OF_MEMORY;
  stored.len = kMaxIdentityLen + 1;
  tee_length len = 0;
  TRY(let_go_if_corrupt(&object, TEE_ReadObjectData(object.get(), stored.data, stored.len, &len)));
  const bool is_whole = parse_identity({stored.data, static_cast<uint32_t>(len)}, device);
  return is_whole ? TEE_SUCCESS : TEE_ERROR_CORRUPT_OBJECT;
}

// A new identity is read back like an old one: what is given out is what storage holds.
static TEE_Result read_or_make_identity(identity *device) {
  const TEE_Result result = read_identity(device);
  if (result != TEE_ERROR_ITEM_NOT_FOUND) return result;
  TRY(make_identity());
  return read_identity(device);
}

TEE_Result get_identity(identity *device) {
  TRY_LOG(read_or_make_identity(device), "no identity, 0x%x");
  return TEE_SUCCESS;
}

TEE_Result get_endorsement_id(const identity &device, const reader &label,
                              char id[kEndorsementIdLen + 1]) {
  operation sha256;
  TRY(TEE_AllocateOperation(out(sha256), TEE_ALG_SHA256, TEE_MODE_DIGEST, 0));
  uint8_t digest[kDigestLen];
  tee_length digest_len = sizeof digest;
  TEE_DigestUpdate(sha256.get(), device.device_id.at, device.device_id.left);
  TRY(TEE_DigestDoFinal(sha256.get(), label.at, label.left, digest, &digest_len));
  write_hex(digest, sizeof digest, id);
  id[kEndorsementIdLen] = '\0';
  return TEE_SUCCESS;
}
