// SPDX-License-Identifier: BSD-2-Clause
/// The protocol's JWE objects: the one recipient gets the content key by RSA1_5, for all that the
/// protected header names "dir".
///
///     {"protect", "recipients": [{"header": {"alg"}, "encrypted_key"}], "iv", "ciphertext", "tag"}
#ifndef TSM_PROTOCOL_JWE_H
#define TSM_PROTOCOL_JWE_H

#include <optional>
#include <string>
#include <string_view>

#include "tsm/protocol/crypto.h"
#include "tsm/protocol/json.h"

namespace tsm {

/// Everything has a default: the header of the cipher, and a fresh random content key and IV.
struct JweOptions {
  ContentCipher cipher = ContentCipher::kA128CbcHs256;
  std::optional<std::string> protected_header = std::nullopt;
  std::optional<Bytes> cek = std::nullopt;
  std::optional<Bytes> iv = std::nullopt;
};

std::string_view protected_header_of(ContentCipher cipher);

Json jwe_encrypt(const RsaKey &recipient, std::string_view plaintext,
                 const JweOptions &options = {});

/// The same from the parts, for objects whose parts do not fit together.
Json jwe_object(std::string_view protected_header, std::string_view encrypted_key,
                std::string_view iv, const Sealed &sealed);

/// Nothing when a member is missing or malformed, the header names another algorithm, or the
/// content does not authenticate.
std::optional<Bytes> jwe_decrypt(const RsaKey &recipient, const Json &jwe);

}  // namespace tsm

#endif
