// SPDX-License-Identifier: BSD-2-Clause
// Encrypted objects are opened, changed inside or in a part, and closed again.
#include <openssl/hmac.h>

#include <algorithm>

#include "support/mutation.h"
#include "support/require.h"
#include "support/stored_device.h"
#include "tsm/jwe.h"

using namespace fuzz;

namespace {

tsm::JweOptions mutated_options(Random &random) {
  tsm::JweOptions options;
  if (random.one_in(2)) options.cipher = tsm::ContentCipher::kA128Gcm;
  if (random.one_in(4)) {
    const std::string header(tsm::protected_header_of(options.cipher));
    options.protected_header = random.one_in(2) ? header.substr(0, random.below(header.size()))
                                                : mutate_json(header, header.size(), random);
  }
  return options;
}

// RFC 7518, 5.2.2.1.
std::string cbc_tag(const std::string &mac_key, const std::string &signed_text) {
  uint8_t digest[32];
  HMAC(EVP_sha256(), mac_key.data(), static_cast<int>(mac_key.size()),
       reinterpret_cast<const uint8_t *>(signed_text.data()), signed_text.size(), digest, nullptr);
  return {reinterpret_cast<const char *>(digest), sizeof digest / 2};
}

// Any bytes and any IV under a tag that is right: what comes out has no good padding, if it can be
// decrypted at all.
tsm::Json with_right_tag(std::string_view ciphertext, Random &random) {
  const auto cipher = tsm::ContentCipher::kA128CbcHs256;
  const std::string cek = tsm::random_bytes(tsm::cek_len(cipher));
  const std::string iv =
      tsm::random_bytes(random.one_in(2) ? tsm::iv_len(cipher) : random.below(20));
  const std::string header(tsm::protected_header_of(cipher));
  const std::string aad = tsm::base64url_encode(header);
  std::string aad_bits = tsm::little_endian(8 * aad.size(), 8);
  std::ranges::reverse(aad_bits);
  const std::string tag = cbc_tag(cek.substr(0, 16), aad + iv + std::string(ciphertext) + aad_bits);
  return tsm::jwe_object(header, tsm::rsa1_5_encrypt(stored_device().tsm.key, cek), iv,
                         {std::string(ciphertext), tag});
}

}  // namespace

extern "C" size_t LLVMFuzzerCustomMutator(uint8_t *data, size_t size, size_t max_size,
                                          unsigned seed) {
  Random random(seed);
  const std::string_view input = as_view(data, size);
  const std::optional<tsm::Json> jwe = tsm::parse_json(input);
  const auto opened = jwe ? tsm::jwe_decrypt(stored_device().tsm.key, *jwe) : std::nullopt;
  if (!opened || random.one_in(3)) {
    return give(mutate_json(input, max_size, random), data, max_size);
  }
  const std::string plaintext = mutate_json(*opened, max_size / 2, random);
  const tsm::Json mutated = random.one_in(8) ? with_right_tag(plaintext, random)
                                             : tsm::jwe_encrypt(stored_device().tsm.key, plaintext,
                                                                mutated_options(random));
  const std::string text = mutated.dump();
  if (text.size() > max_size) return give(mutate_json(input, max_size, random), data, max_size);
  return give(text, data, max_size);
}
