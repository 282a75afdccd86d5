// SPDX-License-Identifier: BSD-2-Clause
#include "floor.h"

#include "tsm/protocol/json.h"

namespace bench {
namespace {

using Json = tsm::Json;

constexpr size_t kAlLen = 8;
constexpr size_t kEncodedKeyLen = 4 + 256 + 4 + 3;
constexpr size_t kChainBlockLen = 12;
constexpr size_t kProtectLen = 20;  // of the RS256 header in base64url

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
  void add_signing(const Json &envelope, Form form);
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
  add(rsa_decrypt(Form::kPairWithoutPrimes, keys));
  add(hmac(len_of(jwe, "protect") + kAesBlockLen + len + kAlLen));
  add(aes(len, false));
}

void Floor::add_image(const Json &encrypted_ta, const char *image_name) {
  const size_t len = bytes_in(len_of(encrypted_ta, image_name));
  for (const char *name : {"key", "iv", image_name}) add(decode(len_of(encrypted_ta, name)));
  add(rsa_decrypt(Form::kPair, keys));
  add(depth == Depth::kCryptography ? aes(len, false) : decrypt_blocks(len));
  add(digest(len));
  if (depth != Depth::kCryptography) add(move(len));
}

void Floor::add_sealing(const Json &jwe) {
  const size_t len = bytes_in(len_of(jwe, "ciphertext"));
  add(draw(kAesBlockLen));
  add(draw(kCekLen));
  for (const char *name : {"protect", "iv", "ciphertext", "tag"}) {
    add(encode(bytes_in(len_of(jwe, name))));
  }
  add(encode(bytes_in(len_of(jwe.at("recipients").at(0), "encrypted_key"))));
  add(rsa_encrypt(keys));
  add(hmac(len_of(jwe, "protect") + kAesBlockLen + len + kAlLen));
  add(aes(len, true));
}

void Floor::add_signing(const Json &envelope, Form form) {
  for (const char *name : {"payload", "protect", "signature"}) {
    add(encode(bytes_in(len_of(envelope, name))));
  }
  add(digest(len_of(envelope, "protect") + 1 + len_of(envelope, "payload")));
  add(rsa_sign(form, keys));
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

Work verification_of(size_t payload_len, Keys keys) {
  return in_order({decode(payload_len), decode(kRsaLen * 4 / 3),
                   digest(kProtectLen + 1 + payload_len), rsa_verify(keys)});
}

Work signing_of(size_t payload_len, Keys keys) {
  return in_order({encode(bytes_in(payload_len)), encode(kRsaLen),
                   digest(kProtectLen + 1 + payload_len),
                   rsa_sign(Form::kPairWithoutPrimes, keys)});
}

Work work_of(const MessageCase &message, const std::string &request, const std::string &response,
             size_t dsi_len, Depth depth) {
  Floor floor(depth);
  const Json answer = tsm::parse_json(response).value().front();
  floor.add_reading(request);
  if (message.id == MessageId::kGetTaInfo) {
    floor.add_signing(answer, Form::kPair);
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
  floor.add_signing(answer, Form::kPairWithoutPrimes);
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
