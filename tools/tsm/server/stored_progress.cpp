// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/server/stored_progress.h"

namespace tsm {
namespace {

std::string text_of(const Json &object, const char *name) {
  const std::string *text = find_string(object, name);
  return text == nullptr ? "" : *text;
}

bool is_true(const Json &object, const char *name) {
  const auto member = object.find(name);
  return member != object.end() && member->is_boolean() && member->get<bool>();
}

/// What each order is told apart by, and what is learned of it.
constexpr std::pair<const char *, std::string RequestOptions::*> kOrderTexts[] = {
    {"sd", &RequestOptions::sdname},         {"sp", &RequestOptions::spid},
    {"taid", &RequestOptions::taid},         {"version", &RequestOptions::ta_version},
    {"deleteta", &RequestOptions::deleteta},
};

}  // namespace

Progress stored_progress(const StoredDevice &row) {
  const std::optional<Json> value = parse_json(row.progress);
  const Json *lasting = value ? find_object(*value, "lasting") : nullptr;
  const Json *session = value ? find_object(*value, "session") : nullptr;
  Progress progress;
  if (lasting != nullptr) progress = parse_progress(*lasting);
  if (session == nullptr) return progress;
  progress.has_changed = is_true(*session, "has_changed");
  progress.last_refusal = text_of(*session, "last_refusal");
  if (const Json *attempts = find_object(*session, "attempts")) {
    for (const auto &[key, number] : attempts->items()) {
      if (number.is_number_integer()) progress.attempts[key] = number.get<int>();
    }
  }
  return progress;
}

std::string progress_text(const Progress &progress) {
  Json session = {{"has_changed", progress.has_changed}};
  if (!progress.attempts.empty()) session["attempts"] = progress.attempts;
  if (!progress.last_refusal.empty()) session["last_refusal"] = progress.last_refusal;
  return compact({{"lasting", progress_json(progress)}, {"session", std::move(session)}});
}

std::string open_request_text(const Order &order, const SentRequest &sent) {
  Json value = Json::object();
  if (order.options.renew_aik) value["renew_aik"] = true;
  for (const auto &[name, member] : kOrderTexts) {
    const std::string &text = order.options.*member;
    if (!text.empty()) value[name] = text;
  }
  return compact({{"sent", sent_request_json(sent)}, {"order", std::move(value)}});
}

OpenRequest parse_open_request(const std::string &text) {
  const std::optional<Json> value = parse_json(text);
  const Json *order = value ? find_object(*value, "order") : nullptr;
  const Json *sent_value = value ? find_object(*value, "sent") : nullptr;
  const std::optional<SentRequest> sent =
      sent_value ? parse_sent_request(*sent_value) : std::nullopt;
  if (order == nullptr || !sent) throw std::runtime_error("a stored request is damaged");
  OpenRequest request = {.order = {sent->message->id, {}}, .sent = *sent};
  request.order.options.renew_aik = is_true(*order, "renew_aik");
  for (const auto &[name, member] : kOrderTexts) {
    request.order.options.*member = text_of(*order, name);
  }
  return request;
}

}  // namespace tsm
