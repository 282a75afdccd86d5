// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/protocol/jwe.h"

namespace tsm {
namespace {

constexpr std::string_view kCbcHs256 = "A128CBC-HS256";
constexpr std::string_view kGcm = "A128GCM";

std::optional<Bytes> find_bytes(const Json &object, std::string_view name) {
  const std::string *text = find_string(object, name);
  return text == nullptr ? std::nullopt : base64url_decode(*text);
}

std::optional<ContentCipher> cipher_of(std::string_view protected_header) {
  const std::optional<Json> header = parse_json(protected_header);
  const std::string *enc = header ? find_string(*header, "enc") : nullptr;
  if (enc == nullptr) return std::nullopt;
  if (*enc == kCbcHs256) return ContentCipher::kA128CbcHs256;
  if (*enc == kGcm) return ContentCipher::kA128Gcm;
  return std::nullopt;
}

std::optional<Bytes> unwrap_cek(const RsaKey &recipient, const Json &jwe) {
  const Json *recipients = find_array(jwe, "recipients");
  if (recipients == nullptr || recipients->size() != 1) return std::nullopt;
  const Json &entry = recipients->front();
  const Json *header = find_object(entry, "header");
  const std::string *alg = header == nullptr ? nullptr : find_string(*header, "alg");
  if (alg == nullptr || *alg != "RSA1_5") return std::nullopt;
  const std::optional<Bytes> encrypted_key = find_bytes(entry, "encrypted_key");
  return encrypted_key ? rsa1_5_decrypt(recipient, *encrypted_key) : std::nullopt;
}

}  // namespace

std::string_view protected_header_of(ContentCipher cipher) {
  return cipher == ContentCipher::kA128Gcm ? R"({"alg":"dir","enc":"A128GCM"})"
                                           : R"({"alg":"dir","enc":"A128CBC-HS256"})";
}

Json jwe_encrypt(const RsaKey &recipient, std::string_view plaintext, const JweOptions &options) {
  const std::string header =
      options.protected_header.value_or(std::string(protected_header_of(options.cipher)));
  const Bytes cek = options.cek ? *options.cek : random_bytes(cek_len(options.cipher));
  const Bytes iv = options.iv ? *options.iv : random_bytes(iv_len(options.cipher));
  const Sealed sealed = seal_content(options.cipher, cek, iv, base64url_encode(header), plaintext);
  return jwe_object(header, rsa1_5_encrypt(recipient, cek), iv, sealed);
}

Json jwe_object(std::string_view protected_header, std::string_view encrypted_key,
                std::string_view iv, const Sealed &sealed) {
  const Json recipient = {{"header", {{"alg", "RSA1_5"}}},
                          {"encrypted_key", base64url_encode(encrypted_key)}};
  return {{"protect", base64url_encode(protected_header)},
          {"recipients", Json::array({recipient})},
          {"iv", base64url_encode(iv)},
          {"ciphertext", base64url_encode(sealed.ciphertext)},
          {"tag", base64url_encode(sealed.tag)}};
}

std::optional<Bytes> jwe_decrypt(const RsaKey &recipient, const Json &jwe) {
  const std::string *aad = find_string(jwe, "protect");
  const std::optional<Bytes> header = find_bytes(jwe, "protect");
  const std::optional<ContentCipher> cipher = header ? cipher_of(*header) : std::nullopt;
  const std::optional<Bytes> iv = find_bytes(jwe, "iv");
  const std::optional<Bytes> ciphertext = find_bytes(jwe, "ciphertext");
  const std::optional<Bytes> tag = find_bytes(jwe, "tag");
  const std::optional<Bytes> cek = unwrap_cek(recipient, jwe);
  if (!cipher || !iv || !ciphertext || !tag || !cek) return std::nullopt;
  return open_content(*cipher, *cek, *iv, *aad, {*ciphertext, *tag});
}

}  // namespace tsm
