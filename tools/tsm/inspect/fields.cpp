// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/inspect/fields.h"

#include <algorithm>

namespace tsm {
namespace {

constexpr size_t kMaxShown = 60;

std::string shown(const Json &value) {
  std::string text = value.dump(-1, ' ', false, Json::error_handler_t::replace);
  if (text.size() > kMaxShown) text = text.substr(0, kMaxShown) + "...";
  return text;
}

const Json *field(const Json &object, std::string_view name, Json::value_t type,
                  std::string_view type_name, Report *report) {
  const auto found = object.is_object() ? object.find(std::string(name)) : object.end();
  if (!object.is_object() || found == object.end()) {
    report->failed(name, "missing: expected " + std::string(type_name));
    return nullptr;
  }
  if (found->type() == type) return &*found;
  report->failed(name, "is " + shown(*found) + ": expected " + std::string(type_name));
  return nullptr;
}

std::string base64url_problem(std::string_view text) {
  if (text.find('=') != text.npos) return "has padding: expected base64url without it";
  if (text.find_first_of("+/") != text.npos) {
    return "has the standard alphabet (+ and /): expected base64url (- and _)";
  }
  return "is no base64url text: a character or its length cannot be";
}

}  // namespace

std::string bytes_text(size_t len) {
  return std::to_string(len) + (len == 1 ? " byte" : " bytes");
}

const Json *object_field(const Json &object, std::string_view name, Report *report) {
  return field(object, name, Json::value_t::object, "an object", report);
}

const Json *array_field(const Json &object, std::string_view name, Report *report) {
  return field(object, name, Json::value_t::array, "an array", report);
}

const std::string *text_field(const Json &object, std::string_view name, Report *report) {
  const Json *value = field(object, name, Json::value_t::string, "a string", report);
  return value == nullptr ? nullptr : value->get_ptr<const std::string *>();
}

const std::string *shown_field(const Json &object, std::string_view name, Report *report) {
  const std::string *text = text_field(object, name, report);
  if (text != nullptr) report->fact(name, *text);
  return text;
}

std::optional<Bytes> bytes_field(const Json &object, std::string_view name, Report *report) {
  const std::string *text = text_field(object, name, report);
  if (text == nullptr) return std::nullopt;
  std::optional<Bytes> bytes = base64url_decode(*text);
  if (!bytes) report->failed(name, base64url_problem(*text));
  return bytes;
}

std::optional<Bytes> sized_field(const Json &object, std::string_view name, size_t len,
                                 Report *report) {
  std::optional<Bytes> bytes = bytes_field(object, name, report);
  if (!bytes) return std::nullopt;
  if (len == 0 || bytes->size() == len) {
    report->fact(name, bytes_text(bytes->size()));
  } else {
    report->failed(name, bytes_text(bytes->size()) + ": expected " + std::to_string(len));
  }
  return bytes;
}

std::optional<Json> parse_field(std::string_view text, std::string_view name, Report *report) {
  std::optional<Json> value = parse_json(text);
  if (value && value->is_object()) return value;
  report->failed(name, value ? "is no JSON object" : "is no JSON: " + json_problem(text));
  return std::nullopt;
}

void report_others(const Json &object, std::initializer_list<std::string_view> names,
                   Report *report) {
  if (!object.is_object()) return;
  for (const auto &[name, value] : object.items()) {
    if (std::ranges::find(names, name) != names.end()) continue;
    report->fact(name, shown(value) + ", which is not read");
  }
}

}  // namespace tsm
