// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/inspect/content.h"
#include "tsm/inspect/envelope.h"
#include "tsm/inspect/fields.h"
#include "tsm/inspect/jwe.h"
#include "tsm/inspect/message.h"

namespace tsm {
namespace {

void inspect_version(const Json &members, Report *report) {
  const std::string *version = text_field(members, "ver", report);
  if (version == nullptr) return;
  if (*version == "1.0") return report->fact("ver", *version);
  report->failed("ver", *version + ": expected 1.0");
}

class RequestInspector {
 public:
  RequestInspector(const Message &message, const Json &envelope, const AtHand &at_hand,
                   Report *report);
  std::optional<Transaction> run();

 private:
  bool is_ca(const KeyAtHand &key) const;
  bool is_tee(const KeyAtHand &key) const;
  Chance chance_as_tsm(const KeyAtHand &key) const;
  Chance chance_as_tee(const KeyAtHand &key) const;

  void inspect_signature() const;
  void inspect_members() const;
  std::optional<Json> open_content() const;
  void inspect_image(const std::optional<Json> &opened) const;

  const Message &message_;
  const Json &envelope_;
  AtHand at_hand_;
  Report *report_;
  Signed parts_;
  const Json *members_;
  const Json *chain_ = nullptr;
  const Json *content_ = nullptr;
};

RequestInspector::RequestInspector(const Message &message, const Json &envelope,
                                   const AtHand &at_hand, Report *report)
    : message_(message),
      envelope_(envelope),
      at_hand_(at_hand),
      report_(report),
      parts_(read_signed(envelope, "tsmid", report)),
      members_(members_of(parts_, message.tbs_request, report)) {
  // What the home's TSM lends is meant to fit the requests that it sent.
  for (KeyAtHand &key : at_hand_.keys) {
    if (!key.tsmid.empty() && key.tsmid == parts_.sender) key.was_named = true;
  }
  if (members_ == nullptr) return;
  chain_ = find_object(*members_, "tsm_key_chain");
  content_ = find_object(*members_, "content");
  if (chain_ != nullptr) add_chain_key(*chain_, parts_.sender, &at_hand_.keys);
}

std::optional<Transaction> RequestInspector::run() {
  report_others(envelope_, {"payload", "protect", "signature", "header", "signature2"}, report_);
  if (parts_.signature) inspect_signature();
  if (members_ == nullptr) return std::nullopt;
  inspect_members();
  const std::string *rid = find_string(*members_, "rid");
  const std::string *tid = find_string(*members_, "tid");
  if (rid == nullptr || tid == nullptr) return std::nullopt;
  return Transaction{*rid, *tid};
}

// ---- Whose a key may be

bool RequestInspector::is_ca(const KeyAtHand &key) const {
  const std::string *hash = chain_ == nullptr ? nullptr : find_string(*chain_, "ca_tsm_hash");
  return key.party == Party::kCa || (hash != nullptr && *hash == ca_tsm_hash(key.key));
}

bool RequestInspector::is_tee(const KeyAtHand &key) const {
  return key.party == Party::kDevice || (content_ != nullptr && unwraps(key.key, *content_));
}

/// A key that has no other part in the message is meant to have signed it.
Chance RequestInspector::chance_as_tsm(const KeyAtHand &key) const {
  const bool is_other = !key.tsmid.empty() && key.tsmid != parts_.sender;
  const bool has_other_part = is_ca(key) || is_tee(key) || key.party == Party::kProvider;
  return is_other || has_other_part ? Chance::kNone : Chance::kMustFit;
}

Chance RequestInspector::chance_as_tee(const KeyAtHand &key) const {
  if (parts_.is_by(key.key) || is_ca(key)) return Chance::kNone;
  return chance_as(Party::kDevice, key) == Chance::kNone ? Chance::kNone : Chance::kMustFit;
}

// ---- Its parts

void RequestInspector::inspect_signature() const {
  const KeySearch search = find_key(
      at_hand_.keys, [&](const KeyAtHand &key) { return chance_as_tsm(key); },
      [&](const KeyAtHand &key) { return parts_.is_by(key.key); });
  report_signature(search, "the TSM's key (--key, or its --home)", report_);
}

void RequestInspector::inspect_members() const {
  report_->begin(std::string(message_.tbs_request));
  inspect_version(*members_, report_);
  for (const char *name : {"rid", "tid"}) shown_field(*members_, name, report_);
  if (message_.id == MessageId::kGetDeviceState) {
    report_others(*members_, {"ver", "rid", "tid", "tsm_key_chain"}, report_);
    const Json *chain = object_field(*members_, "tsm_key_chain", report_);
    if (chain != nullptr) inspect_key_chain(*chain, parts_.sender, at_hand_, report_);
    return;
  }
  report_others(*members_, {"ver", "rid", "tid", "dsihash", "content", "encrypted_ta"}, report_);
  const std::string *hash = text_field(*members_, "dsihash", report_);
  if (hash != nullptr) inspect_dsihash(*hash, at_hand_.states, report_);
  const std::optional<Json> opened = open_content();
  if (!image_member(message_.id).empty()) inspect_image(opened);
}

std::optional<Json> RequestInspector::open_content() const {
  const Json *content = object_field(*members_, "content", report_);
  if (content == nullptr) return std::nullopt;
  report_->begin("content, for the device's TEE key");
  const std::optional<Bytes> plain = inspect_jwe(
      *content, at_hand_.keys, [&](const KeyAtHand &key) { return chance_as_tee(key); },
      "the device's TEE key, private (--key)", report_);
  return plain ? inspect_content(message_.id, *plain, report_) : std::nullopt;
}

void RequestInspector::inspect_image(const std::optional<Json> &opened) const {
  const Json *image = object_field(*members_, "encrypted_ta", report_);
  if (image != nullptr) inspect_encrypted_ta(message_.id, *image, at_hand_, report_);
  const std::string *taid = opened ? find_string(*opened, "taid") : nullptr;
  inspect_signature2(envelope_, *members_, taid, parts_.sender, at_hand_, report_);
}

}  // namespace

std::optional<Transaction> inspect_request(const Message &message, const Json &envelope,
                                           const AtHand &at_hand, Report *report) {
  report->begin(std::string(message.request) + ": request, message " +
                std::to_string(static_cast<uint32_t>(message.id)));
  if (message.id != MessageId::kGetTaInfo) {
    return RequestInspector(message, envelope, at_hand, report).run();
  }
  for (const char *name : {"spid", "taid"}) shown_field(envelope, name, report);
  report_others(envelope, {"spid", "taid"}, report);
  report->fact("signature", "none: this request is not signed");
  return std::nullopt;
}

}  // namespace tsm
