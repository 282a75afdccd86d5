// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/protocol/response.h"

#include "common/error_line.h"
#include "common/result_names.h"
#include "tsm/protocol/dsi.h"
#include "tsm/protocol/jwe.h"

namespace tsm {
namespace {

[[noreturn]] void reject(const std::string &why) {
  throw NotVerified("the response does not verify: " + why);
}

const std::string &require_string(const Json &object, std::string_view name) {
  const std::string *text = find_string(object, name);
  if (text == nullptr) reject("it has no \"" + std::string(name) + "\"");
  return *text;
}

Bytes require_bytes(const Json &object, std::string_view name) {
  const std::optional<Bytes> bytes = base64url_decode(require_string(object, name));
  if (!bytes) reject("its \"" + std::string(name) + "\" is not base64url");
  return *bytes;
}

void require_rs256(std::string_view protected_header) {
  const std::optional<Json> header = parse_json(protected_header);
  const std::string *alg = header ? find_string(*header, "alg") : nullptr;
  if (alg == nullptr || *alg != "RS256") reject("its signature is not RS256");
}

/// The payload's members, below its outer name where the message has one.
const Json &members_of(const Message &message, const Json &payload) {
  const Json *members =
      message.tbs_response.empty() ? &payload : find_object(payload, message.tbs_response);
  if (members == nullptr || !members->is_object()) reject("its payload belongs to another message");
  return *members;
}

Json take_members(const Message &message, Json payload) {
  (void)members_of(message, payload);
  return message.tbs_response.empty() ? std::move(payload)
                                      : std::move(payload[std::string(message.tbs_response)]);
}

RsaKey key_for(const Envelope &envelope, const ResponseKeys &keys) {
  if (envelope.message->id != MessageId::kGetTaInfo) return keys.tee_key;
  if (keys.dsi == nullptr) {
    throw tools::UsageError(
        "a GetTAInfo response is signed by the SP, whose key the device state lists, and that is "
        "not known yet: send get-device-state first");
  }
  const std::string &spid = require_string(members_of(*envelope.message, envelope.payload), "spid");
  const std::optional<RsaKey> aik = find_aik(*keys.dsi, spid);
  if (!aik) reject("the known device state lists no AIK for its SP; run get-device-state");
  return *aik;
}

void decrypt_member(std::string_view name, const ResponseKeys &keys, Response *response) {
  const Json *jwe = find_object(response->members, name);
  if (jwe == nullptr) reject("it has no \"" + std::string(name) + "\"");
  response->content_text = jwe_decrypt(keys.tsm_key, *jwe);
  if (!response->content_text) reject("its content does not decrypt with this TSM's key");
  std::optional<Json> content = parse_json(*response->content_text);
  if (!content || !content->is_object()) reject("its content is not a JSON object");
  response->content = std::move(*content);
}

/// An "edsi" is the document itself; a content holds the document's one member.
void take_dsi(Response *response) {
  const Json *dsi = find_object(response->content, "dsi");
  if (dsi == nullptr) reject("its content has no device state");
  if (!is_dsi_document(response->content)) reject("its device state has no lists of SDs and AIKs");
  const bool is_whole_document = response->message->id == MessageId::kGetDeviceState;
  response->dsi_text =
      is_whole_document ? *response->content_text : "{\"dsi\":" + serialize_as_device(*dsi) + "}";
}

void take_reason(Response *response) {
  const Json *reason = find_object(response->members, "reason");
  const auto code = reason == nullptr ? Json::const_iterator() : reason->find("error_code");
  if (reason == nullptr || code == reason->end() || !code->is_number_unsigned() ||
      code->get<uint64_t>() > UINT32_MAX) {
    reject("it gives no reason for its failure");
  }
  response->error_code = code->get<uint32_t>();
}

}  // namespace

Envelope parse_envelope(std::string_view text) {
  const std::optional<Json> root = parse_json(text);
  if (!root || !root->is_object() || root->size() != 1) reject("it is not one JSON object");
  const Message *message = find_message_by_response(root->begin().key());
  if (message == nullptr) reject("it answers none of the eight messages");

  const Json &envelope = root->front();
  require_rs256(require_bytes(envelope, "protect"));
  std::string payload_text = require_bytes(envelope, "payload");
  std::optional<Json> payload = parse_json(payload_text);
  if (!payload) reject("its payload is not JSON");
  const Json *header = find_object(envelope, "header");
  return {.message = message,
          .signing_input =
              require_string(envelope, "protect") + "." + require_string(envelope, "payload"),
          .signature = require_bytes(envelope, "signature"),
          .payload_text = std::move(payload_text),
          .payload = std::move(*payload),
          .header = header == nullptr ? Json::object() : *header};
}

bool signature_verifies(const Envelope &envelope, const RsaKey &key) {
  return rs256_verify(key, envelope.signing_input, envelope.signature);
}

Response open_response(std::string_view text, const ResponseKeys &keys) {
  return open_response(parse_envelope(text), keys);
}

Response open_response(Envelope envelope, const ResponseKeys &keys) {
  if (!signature_verifies(envelope, key_for(envelope, keys))) {
    reject("its signature is not that of the device's key");
  }

  Response response = {.message = envelope.message,
                       .payload_text = std::move(envelope.payload_text),
                       .header = std::move(envelope.header),
                       .members = take_members(*envelope.message, std::move(envelope.payload))};
  if (response.message->id == MessageId::kGetTaInfo) return response;
  if (response.message->id == MessageId::kGetDeviceState) {
    decrypt_member("edsi", keys, &response);
    take_dsi(&response);
    return response;
  }

  response.status = require_string(response.members, "status");
  if (response.status == "pass") {
    decrypt_member("content", keys, &response);
    take_dsi(&response);
  } else if (response.status == "fail") {
    take_reason(&response);
  } else {
    reject("its status is neither pass nor fail");
  }
  return response;
}

std::string refusal_of(const Response &response) {
  if (!response.error_code) return "";
  return "the device refused " + std::string(response.message->command) + ": " +
         tools::describe_result(*response.error_code);
}

}  // namespace tsm
