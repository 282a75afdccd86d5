// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/protocol/waiting.h"

#include <algorithm>
#include <vector>

#include "common/error_line.h"

namespace tsm {
namespace {

using tools::UsageError;

std::string text_of(const Json &object, std::string_view name) {
  const std::string *text = find_string(object, name);
  return text == nullptr ? "" : *text;
}

[[noreturn]] void reject_request(const char *why) {
  throw UsageError(std::string("not a request of this TSM: ") + why +
                   ", expected what `otrp-tsm request` wrote");
}

/// The members of the payload, which the TSM's key has signed.
Json signed_members(const Message &message, const Json &envelope, const RsaKey &tsm_key) {
  const std::string payload_text = text_of(envelope, "payload");
  const std::optional<Bytes> signature = base64url_decode(text_of(envelope, "signature"));
  const std::string signing_input = text_of(envelope, "protect") + "." + payload_text;
  if (!signature || !rs256_verify(tsm_key, signing_input, *signature)) {
    reject_request("its signature is another's");
  }
  const std::optional<Bytes> payload = base64url_decode(payload_text);
  const std::optional<Json> tbs = payload ? parse_json(*payload) : std::nullopt;
  const Json *members = tbs ? find_object(*tbs, message.tbs_request) : nullptr;
  if (members == nullptr) reject_request("its payload belongs to another message");
  return *members;
}

bool carries_ids(const Response &response) {
  return find_string(response.members, "rid") != nullptr ||
         find_string(response.members, "tid") != nullptr;
}

/// What an operator can look for.
std::string name_of(const Response &response) {
  const std::string rid = text_of(response.members, "rid");
  return std::string(response.message->command) + (rid.empty() ? "" : " " + rid);
}

}  // namespace

SentRequest read_request(std::string_view text, const RsaKey &tsm_key) {
  const std::optional<Json> root = parse_json(text);
  if (!root || !root->is_object() || root->size() != 1) reject_request("no JSON object");
  const Message *message = find_message_by_request(root->begin().key());
  if (message == nullptr) reject_request("none of the eight messages");
  const Json &envelope = root->front();
  const bool is_signed = !message->tbs_request.empty();
  const Json members = is_signed ? signed_members(*message, envelope, tsm_key) : envelope;
  if (!is_signed) {
    return {.message = message, .spid = text_of(members, "spid"), .taid = text_of(members, "taid")};
  }
  return {.message = message,
          .rid = text_of(members, "rid"),
          .tid = text_of(members, "tid"),
          .dsihash = text_of(members, "dsihash")};
}

Json sent_request_json(const SentRequest &request) {
  Json value = {{"number", request.number}, {"message", request.message->command}};
  const std::pair<const char *, const std::string &> texts[] = {{"rid", request.rid},
                                                                {"tid", request.tid},
                                                                {"spid", request.spid},
                                                                {"taid", request.taid},
                                                                {"dsihash", request.dsihash}};
  for (const auto &[name, text] : texts) {
    if (!text.empty()) value[name] = text;
  }
  return value;
}

std::optional<SentRequest> parse_sent_request(const Json &value) {
  const Message *message = find_message_by_command(text_of(value, "message"));
  const auto number = value.is_object() ? value.find("number") : value.end();
  if (message == nullptr || number == value.end() || !number->is_number_unsigned()) {
    return std::nullopt;
  }
  return SentRequest{.message = message,
                     .rid = text_of(value, "rid"),
                     .tid = text_of(value, "tid"),
                     .spid = text_of(value, "spid"),
                     .taid = text_of(value, "taid"),
                     .dsihash = text_of(value, "dsihash"),
                     .number = number->get<uint64_t>()};
}

bool is_same_request(const SentRequest &one, const SentRequest &other) {
  return one.message == other.message && one.rid == other.rid && one.tid == other.tid &&
         one.spid == other.spid && one.taid == other.taid;
}

std::string_view tie_text(Tie tie) {
  switch (tie) {
    case Tie::kIds:
      return "rid and tid";
    case Tie::kSpAndTa:
      return "SP and TA alone: an earlier answer to the same question looks the same";
    case Tie::kOnlyOne:
      return "its kind alone: it carries no IDs, and an earlier failure looks the same";
    case Tie::kUnchecked:
      break;
  }
  return "nothing: taken as --accept-old says";
}

std::optional<Tie> tie_of(const Response &response, const SentRequest &request) {
  const auto repeats = [&](std::string_view name, const std::string &sent) {
    const std::string *text = find_string(response.members, name);
    return text != nullptr && *text == sent;
  };
  if (response.message != request.message) return std::nullopt;
  if (response.message->id == MessageId::kGetTaInfo) {
    const bool fits = repeats("spid", request.spid) && repeats("taid", request.taid);
    return fits ? std::optional(Tie::kSpAndTa) : std::nullopt;
  }
  if (repeats("rid", request.rid) && repeats("tid", request.tid)) return Tie::kIds;
  const bool is_failure = response.error_code.has_value();
  return is_failure && !carries_ids(response) ? std::optional(Tie::kOnlyOne) : std::nullopt;
}

const SentRequest &find_answered(const Response &response, std::span<const SentRequest> waiting) {
  std::vector<const SentRequest *> fitting;
  for (const SentRequest &request : waiting) {
    if (tie_of(response, request)) fitting.push_back(&request);
  }
  if (fitting.empty()) {
    throw NotVerified("the response (" + name_of(response) +
                      ") answers no request that waits for an answer: name its request with "
                      "--request, or take it unchecked with --accept-old");
  }
  if (fitting.size() > 1 && tie_of(response, *fitting.front()) == Tie::kOnlyOne) {
    throw NotVerified("the response (" + name_of(response) + ") carries no IDs, and " +
                      std::to_string(fitting.size()) +
                      " requests wait that it could answer: name the one with --request");
  }
  return *fitting.front();
}

}  // namespace tsm
