// SPDX-License-Identifier: BSD-2-Clause
// Encrypted objects are opened, changed inside or in a part, and closed again.
#include <openssl/hmac.h>

#include <algorithm>

#include "support/mutation.h"
#include "support/stored_device.h"
#include "tsm/protocol/jwe.h"

namespace fuzz {

using tsm::ContentCipher;
using tsm::Json;

static tsm::JweOptions mutated_options(Random &random) {
  tsm::JweOptions options;
  if (random.one_in(2)) options.cipher = ContentCipher::kA128Gcm;
  if (random.one_in(4)) {
    const std::string header(tsm::protected_header_of(options.cipher));
    options.protected_header = random.one_in(2) ? header.substr(0, random.below(header.size()))
                                                : mutate_json(header, header.size(), random);
  }
  return options;
}

// Any bytes and any IV under a tag that is right (RFC 7518, 5.2.2.1): what comes out has no good
// padding, if it can be decrypted at all.
static Json with_right_tag(const tsm::RsaKey &key, const std::string &ciphertext, Random &random) {
  const std::string cek = tsm::random_bytes(32);
  const std::string iv = tsm::random_bytes(random.one_in(2) ? 16 : random.below(20));
  const std::string header(tsm::protected_header_of(ContentCipher::kA128CbcHs256));
  const std::string aad = tsm::base64url_encode(header);
  std::string aad_bits = tsm::little_endian(8 * aad.size(), 8);
  std::ranges::reverse(aad_bits);
  const std::string signed_text = aad + iv + ciphertext + aad_bits;
  uint8_t digest[32];
  HMAC(EVP_sha256(), cek.data(), 16, reinterpret_cast<const uint8_t *>(signed_text.data()),
       signed_text.size(), digest, nullptr);
  const std::string tag(reinterpret_cast<const char *>(digest), 16);
  return tsm::jwe_object(header, tsm::rsa1_5_encrypt(key, cek), iv, {ciphertext, tag});
}

std::string mutate(std::string_view input, size_t max_len, Random &random) {
  static const tsm::RsaKey key = stored_device().tee_key();
  const std::optional<Json> jwe = tsm::parse_json(input);
  const auto opened = jwe ? tsm::jwe_decrypt(key, *jwe) : std::nullopt;
  if (!opened || random.one_in(3)) return mutate_json(input, max_len, random);
  const std::string plaintext = mutate_json(*opened, max_len / 2, random);
  const Json mutated = random.one_in(8) ? with_right_tag(key, plaintext, random)
                                        : tsm::jwe_encrypt(key, plaintext, mutated_options(random));
  return mutated.dump();
}

}  // namespace fuzz
