// SPDX-License-Identifier: BSD-2-Clause
// A change anywhere in a signed message is found out at the signature. So messages are opened,
// changed inside, and closed again.
#include "support/mutation.h"
#include "support/sealed_request.h"
#include "tsm/protocol/dsi.h"
#include "tsm/protocol/jwe.h"

namespace fuzz {

using tsm::ContentCipher;
using tsm::Json;

constexpr size_t kWordLen = 4;

static const tsm::Message *message_of_request(const Json &envelope) {
  const std::string name =
      envelope.is_object() && envelope.size() == 1 ? envelope.begin().key() : "";
  for (const tsm::Message &message : tsm::messages()) {
    if (message.request == name && !message.tbs_request.empty()) return &message;
  }
  return nullptr;
}

// The content's "taid", over which a message with an image is signed a second time.
static std::string mutate_content(Json *content, size_t max_len, Random &random) {
  static const tsm::RsaKey tee_key = stored_device().tee_key();
  std::string text = tsm::jwe_decrypt(tee_key, *content).value_or("");
  if (!text.empty() && !random.one_in(3)) {
    text = mutate_json(text, max_len, random);
    const auto cipher = random.one_in(4) ? ContentCipher::kA128Gcm : ContentCipher::kA128CbcHs256;
    *content = tsm::jwe_encrypt(tee_key, text, {.cipher = cipher});
  }
  return taid_of(text);
}

static std::string mutate_message(const std::string &text, size_t max_len, Random &random) {
  static const tsm::RsaKey aik = tsm::find_aik(stored_device().dsi(), "bank").value();
  const Json root = tsm::parse_json(text).value_or(nullptr);
  const tsm::Message *message = message_of_request(root);
  const std::string *encoded = message ? tsm::find_string(*root.begin(), "payload") : nullptr;
  const auto payload = encoded ? tsm::base64url_decode(*encoded) : std::nullopt;
  const auto tbs = payload ? tsm::parse_json(*payload) : std::nullopt;
  const Json *found = tbs ? tsm::find_object(*tbs, message->tbs_request) : nullptr;
  if (found == nullptr || random.one_in(4)) return mutate_json(text, max_len, random);

  Json members = *found;
  std::string taid;
  if (tsm::find_object(members, "content")) {
    taid = mutate_content(&members["content"], max_len, random);
  }
  const std::string_view image_name = tsm::image_member(message->id);
  if (!image_name.empty() && random.one_in(4)) {
    const std::string image = mutate_bytes(std::string(64, 'i'), max_len / 4);
    members["encrypted_ta"] = tsm::encrypted_ta(aik, image, image_name);
  }
  std::string changed = tsm::serialize_as_device({{std::string(message->tbs_request), members}});
  if (members == *found) changed = mutate_json(*payload, max_len, random);
  return seal_payload(*message, changed, taid);
}

// The message is the text that ends the frame; its ID and its length stand before it.
std::string mutate(std::string_view input, size_t max_len, Random &random) {
  const size_t at = input.find('{');
  if (at == std::string_view::npos || at < 2 * kWordLen) return "";
  const std::string text = mutate_message(std::string(input.substr(at)), max_len, random);
  const std::string head(input.substr(0, at - 2 * kWordLen));
  const std::string id = random.one_in(16) ? tsm::little_endian(1 + random.below(8), kWordLen)
                                           : std::string(input.substr(head.size(), kWordLen));
  return head + id + tsm::little_endian(text.size(), kWordLen) + text;
}

}  // namespace fuzz
