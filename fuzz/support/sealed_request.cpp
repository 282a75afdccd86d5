// SPDX-License-Identifier: BSD-2-Clause
#include "support/sealed_request.h"

#include "support/manager.h"
#include "tsm/protocol/dsi.h"
#include "tsm/protocol/jwe.h"
#include "tsm/protocol/trust.h"

namespace fuzz {

using tsm::Json;
using tsm::MessageId;

// Same in every run: what is found once can be run again.
constexpr char kRid[] = "0123456789abcdef";
constexpr char kTid[] = "fedcba9876543210";

static std::string text_member(const Json &members, std::string_view name) {
  const std::string *text = tsm::find_string(members, name);
  return text == nullptr ? "" : *text;
}

// Signing with a key of full length takes its time, and most mutations leave alone what is signed.
static std::string signature2_over(const Json &ids, std::string_view taid) {
  static std::map<std::string, std::string> signatures;
  const StoredDevice &device = stored_device();
  const std::string tid = text_member(ids, "tid"), rid = text_member(ids, "rid");
  if (signatures.size() > 1000) signatures.clear();
  std::string &signature = signatures[tid + '\0' + rid + '\0' + std::string(taid)];
  if (signature.empty()) {
    signature =
        tsm::signature2(otrp_test::dev_ca(), tid, rid, device.device_id(), taid, device.tsm.tsmid);
  }
  return signature;
}

static std::string request_around(MessageId id, std::string_view content, std::string_view image) {
  if (id == MessageId::kGetTaInfo) return std::string(content);
  const StoredDevice &device = stored_device();
  static const std::string dsihash = tsm::dsi_hash_of_text(device.dsi_text);
  static const tsm::RsaKey tee_key = device.tee_key();
  static const tsm::RsaKey aik = tsm::find_aik(device.dsi(), "bank").value();

  const tsm::Message &message = tsm::message_of(id);
  if (id == MessageId::kGetDeviceState) {
    // The key chain stands as it is given, JSON or not, in the place of a text.
    const Json tbs = tsm::tbs_request(message, {.rid = kRid, .tid = kTid}, "chain", {}, {});
    std::string text = tbs.dump();
    text.replace(text.find("\"chain\""), 7, content);
    return seal_payload(message, text, "");
  }
  const std::string_view image_name = tsm::image_member(id);
  const Json encrypted_ta = image_name.empty() ? Json() : tsm::encrypted_ta(aik, image, image_name);
  const Json tbs = tsm::tbs_request(message, {.rid = kRid, .tid = kTid, .dsihash = dsihash}, {},
                                    encrypted_ta, tsm::jwe_encrypt(tee_key, content));
  return seal_payload(message, tbs.dump(), taid_of(content));
}

std::string frame_around(MessageId id, std::string_view content, std::string_view image) {
  return device::build_frame(static_cast<uint32_t>(id), request_around(id, content, image));
}

std::string taid_of(std::string_view content) {
  return text_member(tsm::parse_json(content).value_or(nullptr), "taid");
}

std::string seal_payload(const tsm::Message &message, std::string_view payload,
                         std::string_view taid) {
  const tsm::Identity &tsm = stored_device().tsm;
  Json extra = Json::object();
  if (!tsm::image_member(message.id).empty()) {
    const Json tbs = tsm::parse_json(payload).value_or(nullptr);
    const Json *ids = tsm::find_object(tbs, message.tbs_request);
    extra["signature2"] = signature2_over(ids == nullptr ? Json() : *ids, taid);
  }
  return tsm::seal_text(payload, message.request, tsm.tsmid, tsm.key, extra);
}

}  // namespace fuzz
