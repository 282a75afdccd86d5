// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/protocol/request.h"

#include "common/error_line.h"
#include "tsm/protocol/dsi.h"
#include "tsm/protocol/jwe.h"
#include "tsm/protocol/trust.h"

namespace tsm {
namespace {

using tools::UsageError;

constexpr size_t kImageKeyLen = 32;
constexpr size_t kImageIvLen = 16;
constexpr size_t kRoomForOthers = 4096;  // what is in a message besides its payload
constexpr std::string_view kProtectedHeader = R"({"alg":"RS256"})";

bool has_image(MessageId id) {
  return !image_member(id).empty();
}

/// The device compares and signs some values as they stand in the text, so a slash is not escaped.
std::string text_of(const Json &value) {
  try {
    return compact(value);
  } catch (const Json::type_error &) {
    throw UsageError("a value is not UTF-8 text: expected names, IDs and PEM texts");
  }
}

const RsaKey &ca_of(const Identity &tsm) {
  if (tsm.ca) return *tsm.ca;
  throw UsageError(
      "a request with an image needs the CA-TSM key's signature, and this TSM does not hold the "
      "CA's private key: expected it in the home directory");
}

RsaKey aik_of(const Json *dsi, const std::string &spid) {
  const std::optional<RsaKey> aik = dsi == nullptr ? std::nullopt : find_aik(*dsi, spid);
  if (aik) return *aik;
  throw UsageError("the device state lists no AIK of service provider \"" + spid +
                   "\": create a security domain for it, or run get-device-state");
}

}  // namespace

std::string random_id() {
  return hex_encode(random_bytes(8));
}

bool quotes_dsi(MessageId id) {
  return id != MessageId::kGetDeviceState && id != MessageId::kGetTaInfo;
}

Json request_content(MessageId id, const RequestOptions &options, std::string_view tsmid) {
  switch (id) {
    case MessageId::kInstallTa:
    case MessageId::kUpdateTa:
      return {{"spid", options.spid},
              {"taid", options.taid},
              {"sdname", options.sdname},
              {"ta_version", options.ta_version}};
    case MessageId::kDeleteTa:
      return {{"tsmid", tsmid}, {"sdname", options.sdname}, {"taid", options.taid}};
    case MessageId::kCreateSd:
      return {{"spid", options.spid},
              {"sdname", options.sdname},
              {"spcert", options.spcert},
              {"tsmid", tsmid},
              {"did", options.did}};
    case MessageId::kUpdateSd: {
      Json changes = Json::object();
      if (options.renew_aik) changes = {{"renewteespaik", "true"}, {"spcert", options.spcert}};
      return {{"tsmid", tsmid},
              {"spid", options.spid},
              {"sdname", options.sdname},
              {"changes", changes}};
    }
    case MessageId::kDeleteSd:
      return {{"tsmid", tsmid}, {"sdname", options.sdname}, {"deleteta", options.deleteta}};
    case MessageId::kGetDeviceState:
    case MessageId::kGetTaInfo:
      break;
  }
  return nullptr;
}

std::string_view image_member(MessageId id) {
  if (id == MessageId::kInstallTa) return "ciphertadata";
  if (id == MessageId::kUpdateTa) return "ciphernewtadata";
  return "";
}

Json encrypted_ta(const RsaKey &aik, std::string_view image, std::string_view image_name,
                  const std::optional<Bytes> &key, const std::optional<Bytes> &iv) {
  const Bytes image_key = key ? *key : random_bytes(kImageKeyLen);
  const Bytes image_iv = iv ? *iv : random_bytes(kImageIvLen);
  const Bytes ciphertext =
      aes_cbc_encrypt(std::string_view(image_key).substr(kImageKeyLen / 2), image_iv, image);
  Json value = {{"key", base64url_encode(rsa1_5_encrypt(aik, image_key))},
                {"iv", base64url_encode(image_iv)}};
  value[std::string(image_name)] = base64url_encode(ciphertext);  // moved: a list would copy it
  return value;
}

Json tbs_request(const Message &message, const RequestOptions &options, Json key_chain,
                 Json encrypted_ta, Json content) {
  Json members = {{"ver", "1.0"}, {"rid", options.rid}, {"tid", options.tid}};
  if (!options.dsihash.empty()) members["dsihash"] = options.dsihash;
  if (!key_chain.is_null()) members["tsm_key_chain"] = std::move(key_chain);
  if (!encrypted_ta.is_null()) members["encrypted_ta"] = std::move(encrypted_ta);
  if (!content.is_null()) members["content"] = std::move(content);
  Json tbs = Json::object();
  tbs[std::string(message.tbs_request)] = std::move(members);
  return tbs;
}

std::string seal(const Json &tbs, std::string_view request_name, std::string_view tsmid,
                 const RsaKey &key, const Json &extra) {
  return seal_text(text_of(tbs), request_name, tsmid, key, extra);
}

std::string seal_text(std::string_view payload, std::string_view request_name,
                      std::string_view tsmid, const RsaKey &key, const Json &extra) {
  // The payload can be long: it is encoded where it is to stand, and signed there.
  std::string text = "{" + text_of(request_name) + ":{\"payload\":\"";
  const size_t payload_at = text.size();
  text.reserve(payload.size() / 3 * 4 + kRoomForOthers);
  base64url_append(payload, &text);
  const std::string protect = base64url_encode(kProtectedHeader);
  const Bytes signature =
      rs256_sign(key, {protect, ".", std::string_view(text).substr(payload_at)});
  Json others = {{"protect", protect},
                 {"signature", base64url_encode(signature)},
                 {"header", {{"tsmid", tsmid}}}};
  others.update(extra);
  text += "\"," + text_of(others).substr(1) + "}";
  return text;
}

Json ta_info_request(std::string_view spid, std::string_view taid) {
  return {
      {std::string(message_of(MessageId::kGetTaInfo).request), {{"spid", spid}, {"taid", taid}}}};
}

std::string make_request(MessageId id, RequestOptions options, const Identity &tsm,
                         const DeviceInfo &device, const Json *dsi) {
  if (id == MessageId::kGetTaInfo) return text_of(ta_info_request(options.spid, options.taid));

  const Message &message = message_of(id);
  if (options.rid.empty()) options.rid = random_id();
  if (options.tid.empty()) options.tid = random_id();
  if (options.did.empty()) options.did = device.device_id;

  Json chain;
  Json image;
  Json content = request_content(id, options, tsm.tsmid);
  Json extra = Json::object();
  if (id == MessageId::kGetDeviceState) chain = tsm.key_chain;
  if (has_image(id)) {
    extra["signature2"] =
        signature2(ca_of(tsm), options.tid, options.rid, device.device_id, options.taid, tsm.tsmid);
    image = encrypted_ta(aik_of(dsi, options.spid), options.image, image_member(id));
  }
  if (!content.is_null()) content = jwe_encrypt(device.tee_key, text_of(content));
  return seal(tbs_request(message, options, std::move(chain), std::move(image), std::move(content)),
              message.request, tsm.tsmid, tsm.key, extra);
}

}  // namespace tsm
