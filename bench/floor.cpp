// SPDX-License-Identifier: BSD-2-Clause
#include "floor.h"

#include <openssl/core_names.h>
#include <openssl/crypto.h>
#include <openssl/evp.h>
#include <openssl/rsa.h>

#include <cstdlib>
#include <cstring>
#include <list>
#include <memory>
#include <stdexcept>

#include "inside.h"
#include "tsm/json.h"

#define JSMN_STATIC
#include <jsmn.h>

namespace bench {
namespace {

using Json = tsm::Json;

constexpr size_t kScratchLen = 8 << 20;
constexpr size_t kCekLen = 32;
constexpr size_t kDigestLen = 32;
constexpr size_t kRsaLen = 256;
constexpr size_t kAesBlockLen = 16;
constexpr size_t kAlLen = 8;
constexpr size_t kEncodedKeyLen = 4 + 256 + 4 + 3;
constexpr size_t kChainBlockLen = 12;
constexpr size_t kProtectLen = 20;  // of the RS256 header in base64url
constexpr unsigned kNumTokens = 1 << 12;

void require(int result) {
  if (result <= 0) throw std::runtime_error("OpenSSL failed");
}

// What the work is done on, and where its results go.
struct Scratch {
  std::vector<uint8_t> in = std::vector<uint8_t>(kScratchLen, 'A');  // bytes and base64 alike
  std::vector<uint8_t> out = std::vector<uint8_t>(kScratchLen);
};
Scratch &scratch() {
  static Scratch buffers;
  return buffers;
}

// ---- Base64, digests, ciphers

Work decode(size_t text_len) {
  return [len = static_cast<int>(text_len / 4 * 4)] {
    EVP_DecodeBlock(scratch().out.data(), scratch().in.data(), len);
  };
}

Work encode(size_t len) {
  return [len = static_cast<int>(len)] {
    EVP_EncodeBlock(scratch().out.data(), scratch().in.data(), len);
  };
}

Work digest(size_t len) {
  const std::shared_ptr<EVP_MD> sha(EVP_MD_fetch(nullptr, "SHA256", nullptr), EVP_MD_free);
  const std::shared_ptr<EVP_MD_CTX> context(EVP_MD_CTX_new(), EVP_MD_CTX_free);
  require(EVP_DigestInit_ex2(context.get(), sha.get(), nullptr));
  return [=] {
    require(EVP_DigestInit_ex2(context.get(), nullptr, nullptr));
    require(EVP_DigestUpdate(context.get(), scratch().in.data(), len));
    require(EVP_DigestFinal_ex(context.get(), scratch().out.data(), nullptr));
  };
}

Work hmac(size_t len) {
  EVP_MAC *algorithm = EVP_MAC_fetch(nullptr, "HMAC", nullptr);
  const std::shared_ptr<EVP_MAC_CTX> context(EVP_MAC_CTX_new(algorithm), EVP_MAC_CTX_free);
  EVP_MAC_free(algorithm);
  char name[] = "SHA256";
  const OSSL_PARAM params[] = {OSSL_PARAM_construct_utf8_string(OSSL_MAC_PARAM_DIGEST, name, 0),
                               OSSL_PARAM_construct_end()};
  require(EVP_MAC_CTX_set_params(context.get(), params));
  return [=] {
    size_t tag_len = 0;
    require(EVP_MAC_init(context.get(), scratch().in.data(), kAesBlockLen, nullptr));
    require(EVP_MAC_update(context.get(), scratch().in.data(), len));
    require(EVP_MAC_final(context.get(), scratch().out.data(), &tag_len, kCekLen));
  };
}

Work aes(size_t len, bool encrypt) {
  const std::shared_ptr<EVP_CIPHER> cipher(EVP_CIPHER_fetch(nullptr, "AES-128-CBC", nullptr),
                                           EVP_CIPHER_free);
  const std::shared_ptr<EVP_CIPHER_CTX> context(EVP_CIPHER_CTX_new(), EVP_CIPHER_CTX_free);
  require(EVP_CipherInit_ex2(context.get(), cipher.get(), nullptr, nullptr, encrypt, nullptr));
  return [=] {
    int produced = 0;
    require(EVP_CipherInit_ex2(context.get(), nullptr, scratch().in.data(), scratch().in.data(),
                               encrypt, nullptr));
    require(EVP_CIPHER_CTX_set_padding(context.get(), 0));
    require(EVP_CipherUpdate(context.get(), scratch().out.data(), &produced, scratch().in.data(),
                             static_cast<int>(len / kAesBlockLen * kAesBlockLen)));
  };
}

// As TEE_CipherUpdate gets it.
Work decrypt_blocks(size_t len) {
  const std::shared_ptr<EVP_CIPHER> cipher(EVP_CIPHER_fetch(nullptr, "AES-128-CBC", nullptr),
                                           EVP_CIPHER_free);
  const std::shared_ptr<EVP_CIPHER_CTX> context(EVP_CIPHER_CTX_new(), EVP_CIPHER_CTX_free);
  require(EVP_CipherInit_ex2(context.get(), cipher.get(), scratch().in.data(), scratch().in.data(),
                             0, nullptr));
  require(EVP_CIPHER_CTX_set_padding(context.get(), 0));
  return [=] {
    for (size_t at = 0; at + kAesBlockLen <= len; at += kAesBlockLen) {
      require(EVP_Cipher(context.get(), scratch().out.data() + at, scratch().in.data() + at,
                         kAesBlockLen));
    }
  };
}

// A zero-filled block of the heap whose content ends in the output buffer and is wiped.
Work move(size_t len) {
  return [=] {
    const std::unique_ptr<void, decltype(&std::free)> block(std::calloc(1, len), std::free);
    std::memcpy(scratch().out.data(), block.get(), len);
    OPENSSL_cleanse(block.get(), len);
  };
}

Work wipe_output(size_t len) {
  return [=] { OPENSSL_cleanse(scratch().out.data(), len); };
}

Work in_order(std::vector<Work> works) {
  return [works = std::move(works)] {
    for (const Work &work : works) work();
  };
}

// ---- RSA

enum class Form { kPublic, kPair };

/// The numbers of a key, in the byte order that OpenSSL imports.
class KeyNumbers {
 public:
  explicit KeyNumbers(Form form) {
    const struct {
      const char *name;
      Form first;  // the form that begins to have the number
    } numbers[] = {{OSSL_PKEY_PARAM_RSA_N, Form::kPublic},
                   {OSSL_PKEY_PARAM_RSA_E, Form::kPublic},
                   {OSSL_PKEY_PARAM_RSA_D, Form::kPair},
                   {OSSL_PKEY_PARAM_RSA_FACTOR1, Form::kPair},
                   {OSSL_PKEY_PARAM_RSA_FACTOR2, Form::kPair},
                   {OSSL_PKEY_PARAM_RSA_EXPONENT1, Form::kPair},
                   {OSSL_PKEY_PARAM_RSA_EXPONENT2, Form::kPair},
                   {OSSL_PKEY_PARAM_RSA_COEFFICIENT1, Form::kPair}};
    for (const auto &number : numbers) {
      if (number.first <= form) add(number.name);
    }
    params_.push_back(OSSL_PARAM_construct_end());
  }
  KeyNumbers(const KeyNumbers &) = delete;
  KeyNumbers &operator=(const KeyNumbers &) = delete;

  std::shared_ptr<EVP_PKEY> make_key() const {
    const std::shared_ptr<EVP_PKEY_CTX> context(EVP_PKEY_CTX_new_from_name(nullptr, "RSA", nullptr),
                                                EVP_PKEY_CTX_free);
    EVP_PKEY *key = nullptr;
    const int selection = params_.size() > 3 ? EVP_PKEY_KEYPAIR : EVP_PKEY_PUBLIC_KEY;
    require(EVP_PKEY_fromdata_init(context.get()));
    require(EVP_PKEY_fromdata(context.get(), &key, selection,
                              const_cast<OSSL_PARAM *>(params_.data())));
    return {key, EVP_PKEY_free};
  }

 private:
  void add(const char *name) {
    BIGNUM *value = nullptr;
    require(EVP_PKEY_get_bn_param(otrp_test::key_named("floor").get(), name, &value));
    std::string &bytes = bytes_.emplace_back(static_cast<size_t>(BN_num_bytes(value)), 0);
    auto *at = reinterpret_cast<uint8_t *>(bytes.data());
    require(BN_bn2lebinpad(value, at, static_cast<int>(bytes.size())));
    BN_free(value);
    params_.push_back(OSSL_PARAM_construct_BN(name, at, bytes.size()));
  }

  std::list<std::string> bytes_;
  std::vector<OSSL_PARAM> params_;
};

using KeyContext = std::shared_ptr<EVP_PKEY_CTX>;

Work rsa(Form form, Keys keys, int (*start)(EVP_PKEY_CTX *), bool signs,
         std::function<void(EVP_PKEY_CTX *)> run) {
  const auto numbers = std::make_shared<KeyNumbers>(form);
  const auto make_context = [=](const std::shared_ptr<EVP_PKEY> &key) {
    KeyContext context(EVP_PKEY_CTX_new(key.get(), nullptr), EVP_PKEY_CTX_free);
    require(start(context.get()));
    require(EVP_PKEY_CTX_set_rsa_padding(context.get(), RSA_PKCS1_PADDING));
    if (signs) require(EVP_PKEY_CTX_set_signature_md(context.get(), EVP_sha256()));
    return context;
  };
  if (keys == Keys::kNew) return [=] { run(make_context(numbers->make_key()).get()); };
  const auto key = numbers->make_key();
  if (keys == Keys::kAtHand) return [=] { run(make_context(key).get()); };
  return [context = make_context(key), run] { run(context.get()); };
}

Work rsa_encrypt(Keys keys) {
  return rsa(Form::kPublic, keys, EVP_PKEY_encrypt_init, false, [](EVP_PKEY_CTX *context) {
    size_t len = kRsaLen;
    require(EVP_PKEY_encrypt(context, scratch().out.data(), &len, scratch().in.data(), kCekLen));
  });
}

Work rsa_decrypt(Keys keys) {
  const std::string sealed =
      tsm::rsa1_5_encrypt(otrp_test::key_named("floor"), std::string(kCekLen, 'k'));
  return rsa(Form::kPair, keys, EVP_PKEY_decrypt_init, false, [=](EVP_PKEY_CTX *context) {
    size_t len = kRsaLen;
    require(EVP_PKEY_decrypt(context, scratch().out.data(), &len, bytes_of(sealed), sealed.size()));
  });
}

Work rsa_sign(Keys keys) {
  return rsa(Form::kPair, keys, EVP_PKEY_sign_init, true, [](EVP_PKEY_CTX *context) {
    size_t len = kRsaLen;
    require(EVP_PKEY_sign(context, scratch().out.data(), &len, scratch().in.data(), kDigestLen));
  });
}

Work rsa_verify(Keys keys) {
  const std::string signature = tsm::rs256_sign(otrp_test::key_named("floor"), "text");
  const std::string hash = tsm::sha256("text");
  return rsa(Form::kPublic, keys, EVP_PKEY_verify_init, true, [=](EVP_PKEY_CTX *context) {
    require(EVP_PKEY_verify(context, bytes_of(signature), signature.size(), bytes_of(hash),
                            hash.size()));
  });
}

// ---- The work of each part of a message

size_t len_of(const Json &object, const char *name) {
  return object.at(name).get_ref<const std::string &>().size();
}

size_t bytes_in(size_t text_len) {
  return text_len * 3 / 4;
}

// What the CA signs of an entry of a key chain.
size_t chain_block_len(const Json &entry) {
  return kChainBlockLen + len_of(entry, "tsmid") + bytes_in(len_of(entry, "tsm_pub_key"));
}

// Of a JWE: its plaintext fills the last block, but for one byte at least.
size_t plain_len(const Json &jwe) {
  return bytes_in(len_of(jwe, "ciphertext")) - 1;
}

struct Floor {
  explicit Floor(Depth to)
      : depth(to), keys(to == Depth::kWithRules ? Keys::kNew : Keys::kPrepared) {}

  const Depth depth;
  const Keys keys;
  std::vector<Work> works = {};

  void add(Work work) { works.push_back(std::move(work)); }
  void add_reading(const std::string &text);
  void add_payload(const std::string &text);
  void add_envelope_check(const Json &envelope);
  void add_key_chain(const Json &chain);
  void add_opening(const Json &jwe);
  void add_image(const Json &encrypted_ta, const char *image_name);
  void add_sealing(const Json &jwe);
  void add_signing(const Json &envelope);
};

void Floor::add_reading(const std::string &text) {
  if (depth == Depth::kWithRules) add(reading_of(text));
}

void Floor::add_payload(const std::string &text) {
  if (depth == Depth::kCryptography) return;
  add(move(text.size()));
  add_reading(text);
  add(wipe_output(text.size()));
}

void Floor::add_envelope_check(const Json &envelope) {
  add(verification_of(len_of(envelope, "payload"), keys));
}

void Floor::add_key_chain(const Json &chain) {
  add(encode(kEncodedKeyLen));
  add(digest(kEncodedKeyLen * 4 / 3));
  for (const Json &entry : chain.at("tsm_list")) {
    add(decode(len_of(entry, "tsm_pub_key")));
    add(decode(len_of(entry, "signature")));
    add(digest(chain_block_len(entry)));
    add(rsa_verify(keys));
  }
}

void Floor::add_opening(const Json &jwe) {
  const size_t len = bytes_in(len_of(jwe, "ciphertext"));
  for (const char *name : {"protect", "iv", "ciphertext", "tag"}) add(decode(len_of(jwe, name)));
  add(decode(len_of(jwe.at("recipients").at(0), "encrypted_key")));
  add(rsa_decrypt(keys));
  add(hmac(len_of(jwe, "protect") + kAesBlockLen + len + kAlLen));
  add(aes(len, false));
}

void Floor::add_image(const Json &encrypted_ta, const char *image_name) {
  const size_t len = bytes_in(len_of(encrypted_ta, image_name));
  for (const char *name : {"key", "iv", image_name}) add(decode(len_of(encrypted_ta, name)));
  add(rsa_decrypt(keys));
  add(depth == Depth::kCryptography ? aes(len, false) : decrypt_blocks(len));
  add(digest(len));
  if (depth != Depth::kCryptography) add(move(len));
}

void Floor::add_sealing(const Json &jwe) {
  const size_t len = bytes_in(len_of(jwe, "ciphertext"));
  for (const char *name : {"protect", "iv", "ciphertext", "tag"}) {
    add(encode(bytes_in(len_of(jwe, name))));
  }
  add(encode(bytes_in(len_of(jwe.at("recipients").at(0), "encrypted_key"))));
  add(rsa_encrypt(keys));
  add(hmac(len_of(jwe, "protect") + kAesBlockLen + len + kAlLen));
  add(aes(len, true));
}

void Floor::add_signing(const Json &envelope) {
  for (const char *name : {"payload", "protect", "signature"}) {
    add(encode(bytes_in(len_of(envelope, name))));
  }
  add(digest(len_of(envelope, "protect") + 1 + len_of(envelope, "payload")));
  add(rsa_sign(keys));
}

std::string payload_text(const Json &envelope) {
  return tsm::base64url_decode(envelope.at("payload").get<std::string>()).value();
}

Json payload_of(const Json &envelope) {
  return tsm::parse_json(payload_text(envelope)).value();
}

// The JWE in a response.
Json sealed_part_of(const Json &answer) {
  const Json payload = payload_of(answer);
  const Json members = payload.size() == 1 ? payload.front() : payload;
  return members.at(members.contains("edsi") ? "edsi" : "content");
}

}  // namespace

Work reading_of(std::string text) {
  return [text = std::move(text), tokens = std::vector<jsmntok_t>(kNumTokens)]() mutable {
    jsmn_parser parser;
    jsmn_init(&parser);
    require(jsmn_parse(&parser, text.data(), text.size(), tokens.data(), kNumTokens));
  };
}

Work verification_of(size_t payload_len, Keys keys) {
  return in_order({decode(payload_len), decode(kRsaLen * 4 / 3),
                   digest(kProtectLen + 1 + payload_len), rsa_verify(keys)});
}

Work signing_of(size_t payload_len, Keys keys) {
  return in_order({encode(bytes_in(payload_len)), encode(kRsaLen),
                   digest(kProtectLen + 1 + payload_len), rsa_sign(keys)});
}

Work work_of(const MessageCase &message, const std::string &request, const std::string &response,
             size_t dsi_len, Depth depth) {
  Floor floor(depth);
  const Json answer = tsm::parse_json(response).value().front();
  floor.add_reading(request);
  if (message.id == MessageId::kGetTaInfo) {
    floor.add_signing(answer);
    return in_order(floor.works);
  }

  const Json envelope = tsm::parse_json(request).value().front();
  floor.add_envelope_check(envelope);
  floor.add_payload(payload_text(envelope));
  const Json tbs = payload_of(envelope).front();
  if (tbs.contains("tsm_key_chain")) floor.add_key_chain(tbs.at("tsm_key_chain"));
  if (tbs.contains("dsihash")) {
    floor.add(encode(dsi_len));
    floor.add(digest(dsi_len * 4 / 3));
  }
  if (tbs.contains("content")) floor.add_opening(tbs.at("content"));
  if (tbs.contains("encrypted_ta")) {
    floor.add(decode(len_of(envelope, "signature2")));
    floor.add(digest(2 * kCekLen));
    floor.add(rsa_verify(floor.keys));
    const std::string image_name(tsm::image_member(message.id));
    floor.add_image(tbs.at("encrypted_ta"), image_name.c_str());
  }
  floor.add_sealing(sealed_part_of(answer));
  floor.add_signing(answer);
  return in_order(floor.works);
}

JoseParts jose_parts_of(const std::string &request, const std::string &response) {
  const Json envelope = tsm::parse_json(request).value().front();
  const Json answer = tsm::parse_json(response).value().front();
  const Json tbs = payload_of(envelope).front();
  JoseParts parts = {.encrypted = plain_len(sealed_part_of(answer)),
                     .signed_len = bytes_in(len_of(answer, "payload"))};
  if (tbs.contains("tsm_key_chain")) {
    for (const Json &entry : tbs.at("tsm_key_chain").at("tsm_list")) {
      parts.verified.push_back(chain_block_len(entry));
    }
  }
  parts.verified.push_back(bytes_in(len_of(envelope, "payload")));
  if (tbs.contains("content")) parts.decrypted = plain_len(tbs.at("content"));
  return parts;
}

}  // namespace bench
