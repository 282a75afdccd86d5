// SPDX-License-Identifier: BSD-2-Clause
#include "works.h"

#include <benchmark/benchmark.h>
#include <openssl/core_names.h>
#include <openssl/crypto.h>
#include <openssl/evp.h>
#include <openssl/rand.h>

#include <cctype>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <stdexcept>

#define JSMN_STATIC
#include <jsmn.h>

namespace bench {

static constexpr size_t kScratchLen = 8 << 20;
static constexpr unsigned kNumTokens = 1 << 12;

void require(int result) {
  if (result <= 0) throw std::runtime_error("OpenSSL failed");
}

Scratch &scratch() {
  static Scratch buffers = {std::vector<uint8_t>(kScratchLen, 'A'),
                            std::vector<uint8_t>(kScratchLen)};
  return buffers;
}

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

Work draw(size_t len) {
  return [len = static_cast<int>(len)] { require(RAND_bytes(scratch().out.data(), len)); };
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

// Nothing in a long word tells the tokenizer anything, so it need not see all of it.
static std::string without_long_words(const std::string &text) {
  constexpr size_t kLongWord = 64;
  std::string rest;
  size_t word_len = 0;
  for (const char c : text) {
    const bool goes_on = std::isalnum(static_cast<unsigned char>(c)) != 0 || c == '-' || c == '_';
    word_len = goes_on ? word_len + 1 : 0;
    if (word_len <= kLongWord) rest += c;
  }
  return rest;
}

Work reading_of(std::string text) {
  return [rest = without_long_words(text), text = std::move(text),
          tokens = std::vector<jsmntok_t>(kNumTokens)]() mutable {
    benchmark::DoNotOptimize(std::memchr(text.data(), 0, text.size()));
    jsmn_parser parser;
    jsmn_init(&parser);
    require(jsmn_parse(&parser, rest.data(), rest.size(), tokens.data(), kNumTokens));
  };
}

}  // namespace bench
