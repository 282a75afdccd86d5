// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/inspect/envelope.h"

#include "tsm/inspect/fields.h"

namespace tsm {
namespace {

void inspect_protect(const Json &envelope, Report *report) {
  const std::optional<Bytes> text = bytes_field(envelope, "protect", report);
  const std::optional<Json> header = text ? parse_field(*text, "protect", report) : std::nullopt;
  if (!header) return;
  const std::string *alg = find_string(*header, "alg");
  if (alg != nullptr && *alg == "RS256") {
    report->fact("protect", *text);
  } else {
    report->failed("protect", *text + R"(: expected {"alg":"RS256"})");
  }
}

}  // namespace

Signed read_signed(const Json &envelope, std::string_view sender, Report *report) {
  Signed parts;
  const Json *header = object_field(envelope, "header", report);
  const std::string *name = header == nullptr ? nullptr : shown_field(*header, sender, report);
  if (name != nullptr) parts.sender = *name;
  inspect_protect(envelope, report);
  const std::optional<Bytes> payload = bytes_field(envelope, "payload", report);
  if (payload) parts.payload = parse_field(*payload, "payload", report);
  parts.signature = bytes_field(envelope, "signature", report);
  const std::string *first = find_string(envelope, "protect");
  const std::string *second = find_string(envelope, "payload");
  if (first != nullptr && second != nullptr) parts.input = *first + "." + *second;
  return parts;
}

void report_signature(const KeySearch &search, std::string_view needed, Report *report) {
  report_search(search, "signature", "RS256 over \"protect\", a dot and \"payload\"", needed,
                report);
}

const Json *members_of(const Signed &parts, std::string_view outer_name, Report *report) {
  if (!parts.payload) return nullptr;
  if (outer_name.empty()) return &*parts.payload;
  const Json *members = find_object(*parts.payload, outer_name);
  if (members == nullptr || parts.payload->size() != 1) {
    report->failed("payload", "is not one \"" + std::string(outer_name) + "\" object");
  }
  return members;
}

}  // namespace tsm
