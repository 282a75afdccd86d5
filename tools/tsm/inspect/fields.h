// SPDX-License-Identifier: BSD-2-Clause
/// Members of JSON objects, as an inspector meets them: what is missing, has another type or
/// another encoding than it should is a failure in the report, and gives nothing.
#ifndef TSM_INSPECT_FIELDS_H
#define TSM_INSPECT_FIELDS_H

#include <initializer_list>
#include <optional>
#include <string>
#include <string_view>

#include "tsm/inspect/report.h"
#include "tsm/protocol/crypto.h"
#include "tsm/protocol/json.h"

namespace tsm {

/// `256 bytes`.
std::string bytes_text(size_t len);

const Json *object_field(const Json &object, std::string_view name, Report *report);
const Json *array_field(const Json &object, std::string_view name, Report *report);
const std::string *text_field(const Json &object, std::string_view name, Report *report);
/// The same, and reported with its value.
const std::string *shown_field(const Json &object, std::string_view name, Report *report);
/// A base64url text, decoded.
std::optional<Bytes> bytes_field(const Json &object, std::string_view name, Report *report);
/// The same of a certain length (any when 0), which is reported.
std::optional<Bytes> sized_field(const Json &object, std::string_view name, size_t len,
                                 Report *report);
/// A JSON object from its text.
std::optional<Json> parse_field(std::string_view text, std::string_view name, Report *report);

/// Reports the members that are not among `names`.
void report_others(const Json &object, std::initializer_list<std::string_view> names,
                   Report *report);

}  // namespace tsm

#endif
