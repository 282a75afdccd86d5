// SPDX-License-Identifier: BSD-2-Clause
#include "support/sealed_request.h"

#include <map>

#include "tsm/dsi.h"
#include "tsm/jwe.h"
#include "tsm/trust.h"

namespace fuzz {
namespace {

using tsm::Json;
using tsm::MessageId;

constexpr size_t kWordLen = 4;

std::optional<std::string_view> take(std::string_view *in, size_t len) {
  if (len > in->size()) return std::nullopt;
  const std::string_view bytes = in->substr(0, len);
  in->remove_prefix(len);
  return bytes;
}

std::optional<uint32_t> take_word(std::string_view *in) {
  const auto bytes = take(in, kWordLen);
  if (!bytes) return std::nullopt;
  uint32_t word = 0;
  for (size_t i = kWordLen; i-- > 0;) word = word << 8 | static_cast<uint8_t>((*bytes)[i]);
  return word;
}

bool skip_block(std::string_view *in) {
  const auto len = take_word(in);
  return len && take(in, *len);
}

const tsm::Message *find_message_by_request(std::string_view name) {
  for (const tsm::Message &message : tsm::messages()) {
    if (message.request == name) return &message;
  }
  return nullptr;
}

// Signing with a key of full length takes its time, and most mutations leave alone what is signed.
std::string signature2_over(std::string_view tid, std::string_view rid, std::string_view taid) {
  static std::map<std::string, std::string> signatures;
  if (signatures.size() > 1000) signatures.clear();
  std::string &signature =
      signatures[Json{tid, rid, taid}.dump(-1, ' ', false, Json::error_handler_t::replace)];
  if (signature.empty()) {
    const StoredDevice &device = stored_device();
    signature = tsm::signature2(dev_ca(), tid, rid, device.device_id(), taid, device.tsm.tsmid);
  }
  return signature;
}

std::string text_member(const Json &members, std::string_view name) {
  const std::string *text = tsm::find_string(members, name);
  return text == nullptr ? "" : *text;
}

// The text of `value`, in which the only null is replaced by `raw` as it stands.
std::string with_raw(const Json &value, std::string_view raw) {
  std::string text = value.dump();
  const size_t at = text.find("null");
  return text.replace(at, 4, raw);
}

}  // namespace

std::string request_around(MessageId id, std::string_view content, std::string_view image) {
  if (id == MessageId::kGetTaInfo) return std::string(content);
  const StoredDevice &device = stored_device();
  static const std::string dsihash = device.dsihash();
  static const tsm::RsaKey tee_key = device.tee_key();
  static const tsm::RsaKey aik = tsm::find_aik(device.dsi(), "bank").value();

  const tsm::Message &message = tsm::message_of(id);
  const tsm::RequestOptions options = {.rid = kRid, .tid = kTid, .dsihash = dsihash};
  if (id == MessageId::kGetDeviceState) {
    Json tbs = tsm::tbs_request(message, {.rid = kRid, .tid = kTid}, "", nullptr, nullptr);
    tbs[std::string(message.tbs_request)]["tsm_key_chain"] = nullptr;
    return seal_payload(message, with_raw(tbs, content), "");
  }
  const std::optional<Json> members = tsm::parse_json(content);
  const std::string_view image_name = tsm::image_member(id);
  const Json tbs =
      tsm::tbs_request(message, options, nullptr,
                       image_name.empty() ? Json() : tsm::encrypted_ta(aik, image, image_name),
                       tsm::jwe_encrypt(tee_key, content));
  return seal_payload(message, tbs.dump(), members ? text_member(*members, "taid") : "");
}

Json *OpenedRequest::members() {
  const std::string name(message->tbs_request);
  return tbs.is_object() && tbs.contains(name) && tbs[name].is_object() ? &tbs[name] : nullptr;
}

std::optional<OpenedRequest> open_request(std::string_view text) {
  static const tsm::RsaKey tee_key = stored_device().tee_key();
  const std::optional<Json> json = tsm::parse_json(text);
  if (!json || !json->is_object() || json->size() != 1) return std::nullopt;
  const tsm::Message *message = find_message_by_request(json->begin().key());
  if (message == nullptr || message->tbs_request.empty()) return std::nullopt;
  const std::string *encoded = tsm::find_string(*json->begin(), "payload");
  const auto payload = encoded == nullptr ? std::nullopt : tsm::base64url_decode(*encoded);
  if (!payload) return std::nullopt;

  OpenedRequest request = {message, *payload, tsm::parse_json(*payload).value_or(nullptr), {}};
  if (const Json *members = request.members()) {
    const Json *content = tsm::find_object(*members, "content");
    if (content != nullptr) request.content = tsm::jwe_decrypt(tee_key, *content);
  }
  return request;
}

std::string seal_payload(const tsm::Message &message, std::string_view payload,
                         std::string_view taid) {
  const StoredDevice &device = stored_device();
  Json extra = Json::object();
  if (!tsm::image_member(message.id).empty()) {
    const std::optional<Json> tbs = tsm::parse_json(payload);
    const Json *members = tbs ? tsm::find_object(*tbs, message.tbs_request) : nullptr;
    const Json ids = members == nullptr ? Json() : *members;
    extra["signature2"] = signature2_over(text_member(ids, "tid"), text_member(ids, "rid"), taid);
  }
  return tsm::seal_text(payload, message.request, device.tsm.tsmid, device.tsm.key, extra);
}

std::optional<Frame> parse_frame(std::string_view bytes) {
  std::string_view in = bytes;
  if (!take_word(&in) || !skip_block(&in) || !skip_block(&in)) return std::nullopt;
  const std::string_view head = bytes.substr(0, bytes.size() - in.size());
  const auto id = take_word(&in);
  const auto len = take_word(&in);
  if (!id || !len || *len > in.size()) return std::nullopt;
  return Frame{std::string(head), *id, std::string(in.substr(0, *len))};
}

std::string serialize_frame(const Frame &frame) {
  return frame.head + tsm::little_endian(frame.message_id, kWordLen) +
         tsm::little_endian(frame.text.size(), kWordLen) + frame.text;
}

}  // namespace fuzz
