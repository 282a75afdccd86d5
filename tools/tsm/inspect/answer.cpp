// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/inspect/content.h"
#include "tsm/inspect/envelope.h"
#include "tsm/inspect/fields.h"
#include "tsm/inspect/jwe.h"
#include "tsm/inspect/message.h"
#include "tsm/protocol/dsi.h"

namespace tsm {
namespace {

void inspect_echo(const Json &members, std::string_view name, const std::string *sent,
                  bool may_lack_it, Report *report) {
  if (members.find(std::string(name)) == members.end() && may_lack_it) return;
  const std::string *echo = text_field(members, name, report);
  if (echo == nullptr) return;
  if (sent == nullptr) return report->fact(name, *echo);
  if (*echo == *sent) return report->verified(name, *echo + ", the request's");
  report->failed(name, *echo + ": the request has " + *sent);
}

void inspect_new_state(const Json &content, Report *report) {
  const Json *dsi = object_field(content, "dsi", report);
  if (dsi == nullptr) return;
  const Json document = {{"dsi", *dsi}};
  if (!is_dsi_document(document)) return report->failed("dsi", "has no lists of SDs and AIKs");
  report->begin("device state");
  report->fact("dsihash", dsi_hash(document) + ", for the next request");
  const std::string tree = dsi_tree(document);
  for (size_t at = 0; at < tree.size();) {
    const size_t end = tree.find('\n', at);
    report->fact("", tree.substr(at, end - at));
    at = end + 1;
  }
}

void inspect_answer_content(const Json &members, std::string_view name, const Signed &parts,
                            const AtHand &at_hand, Report *report) {
  const Json *jwe = object_field(members, name, report);
  if (jwe == nullptr) return;
  report->begin(std::string(name) + ", for the TSM's key");
  const auto chance = [&](const KeyAtHand &key) {
    if (parts.is_by(key.key)) return Chance::kNone;
    return chance_as(Party::kTsm, key) == Chance::kNone ? Chance::kNone : Chance::kMustFit;
  };
  const std::optional<Bytes> plain = inspect_jwe(
      *jwe, at_hand.keys, chance, "the TSM's key, private (--key, or its --home)", report);
  const std::optional<Json> content = plain ? parse_field(*plain, name, report) : std::nullopt;
  if (!content) return;
  for (const auto &[member, value] : content->items()) {
    const std::string *text = find_string(*content, member);
    if (text != nullptr && !text->empty()) report->fact(member, key_or_text(*text));
  }
  inspect_new_state(*content, report);
}

void inspect_reason(const Json &members, Report *report) {
  const Json *reason = object_field(members, "reason", report);
  if (reason == nullptr) return;
  const auto code = reason->find("error_code");
  const bool is_code =
      code != reason->end() && code->is_number_unsigned() && code->get<uint64_t>() <= UINT32_MAX;
  if (!is_code) return report->failed("error_code", "missing or no number: expected a result code");
  report_code(code->get<uint32_t>(), "error_code", report);
}

void inspect_status(const Json &members, const Signed &parts, const AtHand &at_hand,
                    Report *report) {
  const std::string *status = text_field(members, "status", report);
  if (status == nullptr) return;
  if (*status == "pass") {
    report->fact("status", *status);
    inspect_answer_content(members, "content", parts, at_hand, report);
  } else if (*status == "fail") {
    report->fact("status", *status);
    inspect_reason(members, report);
  } else {
    report->failed("status", *status + ": expected pass or fail");
  }
}

/// The TEE key, or one of the AIKs that the states at hand list.
KeySearch find_device_key(const Message &message, const Signed &parts, const AtHand &at_hand,
                          const std::string *spid) {
  std::vector<KeyAtHand> keys = at_hand.keys;
  const bool is_ta_info = message.id == MessageId::kGetTaInfo;
  for (const StateAtHand &state : at_hand.states) {
    const std::optional<Json> document = is_ta_info ? parse_json(state.text) : std::nullopt;
    const std::optional<RsaKey> aik =
        document && spid != nullptr ? find_aik(*document, *spid) : std::nullopt;
    if (!aik) continue;
    keys.push_back({"the AIK in " + state.name, *aik, Party::kProvider, {}, state.was_named});
  }
  const Party signer = is_ta_info ? Party::kProvider : Party::kDevice;
  return find_key(
      keys, [&](const KeyAtHand &key) { return chance_as(signer, key); },
      [&](const KeyAtHand &key) { return parts.is_by(key.key); });
}

void inspect_answer_members(const Message &message, const Signed &parts, const Json &members,
                            const AtHand &at_hand, const std::optional<Transaction> &request,
                            Report *report) {
  if (!message.tbs_response.empty()) report->begin(std::string(message.tbs_response));
  if (message.id == MessageId::kGetTaInfo) {
    for (const char *name : {"taid", "spid", "tsmid", "ta_version", "signercert"}) {
      shown_field(members, name, report);
    }
    return;
  }
  const std::string *status = find_string(members, "status");
  const bool may_lack_ids = status != nullptr && *status == "fail";
  inspect_echo(members, "rid", request ? &request->rid : nullptr, may_lack_ids, report);
  inspect_echo(members, "tid", request ? &request->tid : nullptr, may_lack_ids, report);
  if (find_string(members, "taid") != nullptr) shown_field(members, "taid", report);
  if (message.id == MessageId::kGetDeviceState) {
    return inspect_answer_content(members, "edsi", parts, at_hand, report);
  }
  inspect_status(members, parts, at_hand, report);
}

}  // namespace

void inspect_answer(const Message &message, const Json &envelope, const AtHand &at_hand,
                    const std::optional<Transaction> &request, Report *report) {
  report->begin(std::string(message.response) + ": answer, message " +
                std::to_string(static_cast<uint32_t>(message.id)));
  const Signed parts = read_signed(envelope, "deviceId", report);
  report_others(envelope, {"payload", "protect", "signature", "header"}, report);
  const Json *members = members_of(parts, message.tbs_response, report);
  const std::string *spid = members == nullptr ? nullptr : find_string(*members, "spid");
  if (parts.signature) {
    const char *needed = message.id == MessageId::kGetTaInfo
                             ? "the state that lists the SP's AIK (--dsi, or the TSM's --home)"
                             : "the device's TEE key (--device)";
    report_signature(find_device_key(message, parts, at_hand, spid), needed, report);
  }
  if (members == nullptr) return;
  inspect_answer_members(message, parts, *members, at_hand, request, report);
}

}  // namespace tsm
