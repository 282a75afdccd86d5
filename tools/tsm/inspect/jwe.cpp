// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/inspect/jwe.h"

#include "tsm/inspect/fields.h"
#include "tsm/protocol/jwe.h"

namespace tsm {
namespace {

constexpr size_t kWrappedKeyLen = 256;
constexpr size_t kTagLen = 16;
constexpr size_t kCbcBlockLen = 16;

const std::string *encrypted_key_text(const Json &jwe) {
  const Json *recipients = find_array(jwe, "recipients");
  return recipients == nullptr || recipients->size() != 1
             ? nullptr
             : find_string(recipients->front(), "encrypted_key");
}

std::optional<ContentCipher> inspect_header(const Json &jwe, Report *report) {
  const std::optional<Bytes> text = bytes_field(jwe, "protect", report);
  const std::optional<Json> header = text ? parse_field(*text, "protect", report) : std::nullopt;
  if (!header) return std::nullopt;
  for (const ContentCipher cipher : {ContentCipher::kA128CbcHs256, ContentCipher::kA128Gcm}) {
    if (*header != parse_json(protected_header_of(cipher))) continue;
    report->fact("protect", *text);
    return cipher;
  }
  report->failed("protect", *text + ": expected " +
                                std::string(protected_header_of(ContentCipher::kA128CbcHs256)) +
                                " or A128GCM");
  return std::nullopt;
}

void inspect_recipient(const Json &jwe, Report *report) {
  const Json *recipients = array_field(jwe, "recipients", report);
  if (recipients == nullptr) return;
  if (recipients->size() != 1) {
    report->failed("recipients", std::to_string(recipients->size()) + ": expected one");
    return;
  }
  const Json *header = object_field(recipients->front(), "header", report);
  const std::string *alg = header == nullptr ? nullptr : text_field(*header, "alg", report);
  if (alg != nullptr && *alg != "RSA1_5") report->failed("alg", *alg + ": expected RSA1_5");
  sized_field(recipients->front(), "encrypted_key", kWrappedKeyLen, report);
}

void inspect_sealed(const Json &jwe, std::optional<ContentCipher> cipher, Report *report) {
  sized_field(jwe, "iv", cipher ? iv_len(*cipher) : 0, report);
  const std::optional<Bytes> ciphertext = bytes_field(jwe, "ciphertext", report);
  const bool has_blocks = cipher == ContentCipher::kA128CbcHs256;
  if (ciphertext && has_blocks && ciphertext->size() % kCbcBlockLen != 0) {
    report->failed("ciphertext", bytes_text(ciphertext->size()) + ": expected blocks of 16");
  } else if (ciphertext) {
    report->fact("ciphertext", bytes_text(ciphertext->size()));
  }
  sized_field(jwe, "tag", kTagLen, report);
}

}  // namespace

bool unwraps(const RsaKey &key, const Json &jwe) {
  const std::string *text = encrypted_key_text(jwe);
  const std::optional<Bytes> wrapped = text == nullptr ? std::nullopt : base64url_decode(*text);
  if (!wrapped || !key.has_private_half()) return false;
  const std::optional<Bytes> cek = rsa1_5_decrypt(key, *wrapped);
  return cek && (cek->size() == cek_len(ContentCipher::kA128CbcHs256) ||
                 cek->size() == cek_len(ContentCipher::kA128Gcm));
}

std::optional<Bytes> inspect_jwe(const Json &jwe, const std::vector<KeyAtHand> &keys,
                                 const std::function<Chance(const KeyAtHand &)> &chance,
                                 std::string_view needed, Report *report) {
  const std::optional<ContentCipher> cipher = inspect_header(jwe, report);
  inspect_recipient(jwe, report);
  inspect_sealed(jwe, cipher, report);

  const auto private_chance = [&](const KeyAtHand &key) {
    return key.key.has_private_half() ? chance(key) : Chance::kNone;
  };
  const KeySearch search =
      find_key(keys, private_chance, [&](const KeyAtHand &key) { return unwraps(key.key, jwe); });
  if (!search.found) {
    report_search(search, "decryption", "", needed, report);
    return std::nullopt;
  }
  std::optional<Bytes> plain = jwe_decrypt(search.found->key, jwe);
  if (plain) {
    report_search(search, "decryption", "", needed, report);
  } else {
    report->failed("decryption", "the key " + search.found->name +
                                     " fits, but the tag does not: it covers the text of "
                                     "\"protect\", IV and ciphertext");
  }
  return plain;
}

}  // namespace tsm
