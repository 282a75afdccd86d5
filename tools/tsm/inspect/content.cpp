// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/inspect/content.h"

#include <algorithm>

#include "tsm/inspect/fields.h"
#include "tsm/protocol/image.h"

namespace tsm {
namespace {

constexpr size_t kRsaLen = 256;
constexpr size_t kImageKeyLen = 32;
constexpr size_t kAesBlockLen = 16;
constexpr size_t kTaidLen = 32;
constexpr size_t kMaxNameLen = 56;

std::string key_text(const RsaKey &key) {
  return "RSA, " + std::to_string(8 * key.modulus_len()) + " bits, " + key.fingerprint();
}

Chance chance_as_ca(const KeyAtHand &key) {
  return chance_as(Party::kCa, key);
}

void inspect_name(const Json &content, std::string_view name, Report *report) {
  const std::string *text = text_field(content, name, report);
  if (text == nullptr) return;
  if (!text->empty() && text->size() <= kMaxNameLen) return report->fact(name, *text);
  report->failed(name, *text + ": " + bytes_text(text->size()) + ", expected 1 to 56");
}

/// The device would list a TA of another ID, and then fail to register its image.
void inspect_new_taid(const Json &content, Report *report) {
  const std::string *text = text_field(content, "taid", report);
  if (text == nullptr) return;
  if (text->size() == kTaidLen) return report->fact("taid", *text);
  report->failed("taid", *text + ": " + std::to_string(text->size()) +
                             " characters, expected 32: its image could not be registered");
}

void inspect_changes(const Json &content, Report *report) {
  const Json *changes = object_field(content, "changes", report);
  if (changes == nullptr) return;
  if (changes->empty()) return report->fact("changes", "none");
  const std::string *renew = text_field(*changes, "renewteespaik", report);
  if (renew != nullptr && *renew == "true") report->fact("renewteespaik", *renew);
  if (renew != nullptr && *renew != "true") {
    report->failed("renewteespaik", *renew + ": expected true, else nothing is renewed");
  }
  shown_field(*changes, "spcert", report);
}

void inspect_deleteta(const Json &content, Report *report) {
  const std::string *text = text_field(content, "deleteta", report);
  if (text == nullptr) return;
  const bool is_known = *text == "true" || *text == "false" || *text == "TRUE" || *text == "FALSE";
  if (is_known) return report->fact("deleteta", *text);
  report->failed("deleteta", *text + ": expected true or false");
}

void inspect_ta_content(MessageId id, const Json &content, Report *report) {
  for (const char *name : {"spid", "sdname"}) inspect_name(content, name, report);
  if (id == MessageId::kInstallTa) {
    inspect_new_taid(content, report);
  } else {
    inspect_name(content, "taid", report);
  }
  shown_field(content, "ta_version", report);
  report_others(content, {"spid", "sdname", "taid", "ta_version"}, report);
}

void inspect_sd_content(MessageId id, const Json &content, Report *report) {
  shown_field(content, "tsmid", report);
  inspect_name(content, "sdname", report);
  if (id == MessageId::kDeleteTa) inspect_name(content, "taid", report);
  if (id == MessageId::kDeleteSd) inspect_deleteta(content, report);
  if (id == MessageId::kCreateSd || id == MessageId::kUpdateSd) {
    inspect_name(content, "spid", report);
  }
  if (id == MessageId::kCreateSd) shown_field(content, "spcert", report);
  if (id == MessageId::kUpdateSd) inspect_changes(content, report);
}

std::optional<Json> parse_content(std::string_view plain, Report *report) {
  std::optional<Json> content = parse_field(plain, "content", report);
  if (content) report->begin("content, decrypted");
  return content;
}

/// What is wrong with a text that should be an encoded public key.
std::string key_problem(const Bytes &encoded) {
  const auto starts_with = [&](std::string_view bytes) { return encoded.starts_with(bytes); };
  if (starts_with(std::string_view("\0\0\1\0", 4))) {
    return "its lengths are big-endian: expected little-endian";
  }
  if (starts_with("\x30\x82"))
    return "it is a DER structure: expected length, modulus, length, exponent";
  if (starts_with("-----")) return "it is PEM text: expected length, modulus, length, exponent";
  return "it is no encoded key: expected length, modulus, length, exponent";
}

std::optional<RsaKey> key_field(const Json &entry, std::string_view name, Report *report) {
  const std::optional<Bytes> encoded = bytes_field(entry, name, report);
  if (!encoded) return std::nullopt;
  const std::optional<RsaKey> key = RsaKey::from_encoded(*encoded);
  if (!key) {
    report->failed(name, key_problem(*encoded));
  } else if (key->modulus_len() != kRsaLen) {
    report->failed(name, key_text(*key) + ": expected 2048 bits");
  } else {
    report->fact(name, key_text(*key));
  }
  return key;
}

/// Ways in which the hash of a CA-TSM key is computed wrongly.
std::string ca_hash_way(const std::string &hash, const RsaKey &ca) {
  const std::pair<std::string, const char *> ways[] = {
      {ca.encoded(), "the encoded key, not its base64url text"},
      {base64_encode(ca.encoded()), "standard base64"},
      {base64url_encode(ca.encoded()) + "==", "base64url with padding"},
      {base64url_encode(ca.encoded()) + "=", "base64url with padding"}};
  for (const auto &[text, what] : ways) {
    if (hex_encode(sha256(text)) == hash) return what;
  }
  return "";
}

void inspect_ca_hash(const std::string &hash, const std::vector<KeyAtHand> &keys, Report *report) {
  for (const KeyAtHand &key : keys) {
    const bool may_be_ca = chance_as_ca(key) != Chance::kNone;
    const std::string way = may_be_ca ? ca_hash_way(hash, key.key) : "";
    if (way.empty()) continue;
    return report->failed("ca_tsm_hash", hash + ", of " + key.name +
                                             " computed another way than "
                                             "the device does (" +
                                             way + "): expected " + ca_tsm_hash(key.key));
  }
  const auto has_hash = [&](const KeyAtHand &key) { return ca_tsm_hash(key.key) == hash; };
  report_search(find_key(keys, chance_as_ca, has_hash), "ca_tsm_hash", hash,
                "the CA-TSM key (--key)", report);
}

bool entry_verifies(const Json &entry, const RsaKey &ca) {
  const std::string *tsmid = find_string(entry, "tsmid");
  const std::string *key_text = find_string(entry, "tsm_pub_key");
  const std::string *signature_text = find_string(entry, "signature");
  const std::optional<Bytes> key = key_text ? base64url_decode(*key_text) : std::nullopt;
  const std::optional<Bytes> signature =
      signature_text ? base64url_decode(*signature_text) : std::nullopt;
  if (tsmid == nullptr || !key || !signature) return false;
  return rs256_verify(ca, tsm_entry_block(tsmid->size(), signature->size()) + *tsmid + *key,
                      *signature);
}

void inspect_entry(const Json &entry, const std::string *ca_hash, const AtHand &at_hand,
                   Report *report) {
  shown_field(entry, "tsmid", report);
  key_field(entry, "tsm_pub_key", report);
  const std::optional<Bytes> signature = sized_field(entry, "signature", kRsaLen, report);
  if (!signature) return;
  // The hash says which key is meant; without it any may be.
  const auto chance = [&](const KeyAtHand &key) {
    const bool is_meant = ca_hash != nullptr && ca_tsm_hash(key.key) == *ca_hash;
    return is_meant ? Chance::kMustFit : chance_as_ca(key);
  };
  const auto signs = [&](const KeyAtHand &key) { return entry_verifies(entry, key.key); };
  report_search(find_key(at_hand.keys, chance, signs), "signature",
                "RS256 over algorithm, lengths, tsmid and encoded key", "the CA-TSM key (--key)",
                report);
}

}  // namespace

std::string key_or_text(const std::string &text) {
  const std::optional<Bytes> encoded = base64url_decode(text);
  const std::optional<RsaKey> key = encoded ? RsaKey::from_encoded(*encoded) : std::nullopt;
  return key ? key_text(*key) : text;
}

std::optional<Json> inspect_content(MessageId id, std::string_view plain, Report *report) {
  std::optional<Json> content = parse_content(plain, report);
  if (!content) return std::nullopt;
  if (image_member(id).empty()) {
    inspect_sd_content(id, *content, report);
  } else {
    inspect_ta_content(id, *content, report);
  }
  return content;
}

void add_chain_key(const Json &chain, const std::string &tsmid, std::vector<KeyAtHand> *keys) {
  const Json *entries = find_array(chain, "tsm_list");
  if (entries == nullptr) return;
  for (const Json &entry : *entries) {
    const std::string *name = find_string(entry, "tsmid");
    const std::string *text = find_string(entry, "tsm_pub_key");
    const std::optional<Bytes> encoded = text ? base64url_decode(*text) : std::nullopt;
    const std::optional<RsaKey> key = encoded ? RsaKey::from_encoded(*encoded) : std::nullopt;
    if (key && name != nullptr && *name == tsmid) {
      keys->push_back({"the key chain's entry", *key, Party::kTsm, tsmid});
    }
  }
}

void inspect_key_chain(const Json &chain, const std::string &tsmid, const AtHand &at_hand,
                       Report *report) {
  report->begin("tsm_key_chain");
  const std::string *hash = text_field(chain, "ca_tsm_hash", report);
  if (hash != nullptr) inspect_ca_hash(*hash, at_hand.keys, report);
  const Json *entries = array_field(chain, "tsm_list", report);
  if (entries == nullptr) return;
  bool is_listed = false;
  for (size_t i = 0; i < entries->size(); ++i) {
    const Json &entry = entries->at(i);
    report->begin("tsm_list, entry " + std::to_string(i + 1));
    inspect_entry(entry, hash, at_hand, report);
    const std::string *name = find_string(entry, "tsmid");
    is_listed = is_listed || (name != nullptr && *name == tsmid);
  }
  if (!is_listed) {
    report->not_checked("tsm_list", "has no entry of the sender, " + tsmid +
                                        ": needs a device that knows it already");
  }
}

void inspect_image(std::string_view image, Report *report) {
  report->begin("TA image");
  report->fact("length", bytes_text(image.size()));
  const std::optional<Image> parsed = parse_image(image);
  if (!parsed) {
    return report->failed("header",
                          "none: expected a digest length of 32 at offset 16, and a digest at 20");
  }
  const std::string digest = hex_encode(parsed->digest);
  if (parsed->digest_matches) return report->verified("digest", digest + ", of the payload");
  if (parsed->has_own_magic) return report->failed("digest", digest + ": not of the payload");
  report->not_checked("digest", digest + ": needs its maker's rule, it is not of the payload");
}

void inspect_encrypted_ta(MessageId id, const Json &encrypted_ta, const AtHand &at_hand,
                          Report *report) {
  report->begin("encrypted_ta, for the service provider's AIK");
  const std::optional<Bytes> wrapped = sized_field(encrypted_ta, "key", kRsaLen, report);
  const std::optional<Bytes> iv = sized_field(encrypted_ta, "iv", kAesBlockLen, report);
  const std::string_view name = image_member(id);
  const std::optional<Bytes> ciphertext = sized_field(encrypted_ta, name, 0, report);
  if (ciphertext && ciphertext->size() % kAesBlockLen != 0) {
    report->failed(name, "not in blocks of 16 bytes");
  }
  report_others(encrypted_ta, {"key", "iv", name}, report);
  if (!wrapped || !iv || !ciphertext) return;

  std::optional<Bytes> key;
  const KeySearch search = find_key(
      at_hand.keys,
      [](const KeyAtHand &at) {
        return at.key.has_private_half() ? chance_as(Party::kProvider, at) : Chance::kNone;
      },
      [&](const KeyAtHand &at) {
        key = rsa1_5_decrypt(at.key, *wrapped);
        return key && key->size() >= kImageKeyLen;
      });
  report_search(search, "decryption", "",
                "the AIK, private (--key aik=PEM), which only the device has", report);
  if (!search.found) return;
  const std::optional<Bytes> image =
      aes_cbc_decrypt(std::string_view(*key).substr(kAesBlockLen, kAesBlockLen), *iv, *ciphertext);
  if (!image) return report->failed(name, "does not decrypt with the second half of \"key\"");
  inspect_image(*image, report);
}

void inspect_signature2(const Json &envelope, const Json &members, const std::string *taid,
                        const std::string &tsmid, const AtHand &at_hand, Report *report) {
  report->begin("signature2, by the CA-TSM");
  const std::optional<Bytes> signature = sized_field(envelope, "signature2", kRsaLen, report);
  const std::string *tid = find_string(members, "tid");
  const std::string *rid = find_string(members, "rid");
  if (!signature || tid == nullptr || rid == nullptr) return;
  const char *what = "RS256 over tid, rid, device ID, taid and tsmid";
  if (taid == nullptr || !at_hand.device_id) {
    return report->not_checked(
        "signature2",
        std::string(what) + ": needs " +
            (at_hand.device_id ? "the decrypted content" : "the device file (--device)"));
  }
  const std::string signed_text = *tid + *rid + *at_hand.device_id + *taid + tsmid;
  const auto signs = [&](const KeyAtHand &key) {
    return rs256_verify(key.key, signed_text, *signature);
  };
  report_search(find_key(at_hand.keys, chance_as_ca, signs), "signature2", what,
                "the CA-TSM key (--key ca=PEM)", report);
}

}  // namespace tsm
