// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/protocol/json.h"

#include <cmath>
#include <cstdio>

template class nlohmann::basic_json<nlohmann::ordered_map>;

namespace tsm {
namespace {

constexpr int kMaxDepth = 64;

/// The text with the control characters of its strings escaped; nothing when it is nested too deep
/// for the parser, which recurses without a bound of its own.
std::optional<std::string> prepare(std::string_view text) {
  std::string prepared;
  prepared.reserve(text.size());
  int depth = 0;
  bool in_string = false;
  bool after_backslash = false;
  for (const char c : text) {
    const auto byte = static_cast<unsigned char>(c);
    if (in_string && byte < 0x20) {
      char escape[sizeof("\\u0000")];
      snprintf(escape, sizeof(escape), "\\u%04x", byte);
      prepared += escape;
    } else {
      prepared += c;
    }
    if (!in_string && (c == '{' || c == '[') && ++depth > kMaxDepth) return std::nullopt;
    if (!in_string && (c == '}' || c == ']')) --depth;
    if (c == '"' && !after_backslash) in_string = !in_string;
    after_backslash = in_string && c == '\\' && !after_backslash;
  }
  return prepared;
}

char short_escape(char c) {
  switch (c) {
    case '"':
    case '\\':
    case '/':
      return c;
    case '\b':
      return 'b';
    case '\f':
      return 'f';
    case '\n':
      return 'n';
    case '\r':
      return 'r';
    case '\t':
      return 't';
    default:
      return 0;
  }
}

void put_string(const std::string &value, std::string *out) {
  *out += '"';
  for (const char c : value) {
    const char escape = short_escape(c);
    if (escape != 0) *out += '\\';
    *out += escape != 0 ? escape : c;
  }
  *out += '"';
}

void put_real(double value, std::string *out) {
  constexpr double kTwoTo63 = 9223372036854775808.0;
  char text[512];  // %f of the largest double has 316 characters
  if (std::fabs(value) < kTwoTo63 && std::trunc(value) == value) {
    snprintf(text, sizeof(text), "%lld", static_cast<long long>(value));
  } else {
    snprintf(text, sizeof(text), "%f", value);
  }
  *out += text;
}

void put_value(const Json &value, std::string *out) {
  const char *separator = "";
  if (value.is_object()) {
    *out += '{';
    for (const auto &[name, member] : value.items()) {
      *out += separator;
      put_string(name, out);
      *out += ':';
      put_value(member, out);
      separator = ",";
    }
    *out += '}';
  } else if (value.is_array()) {
    *out += '[';
    for (const Json &element : value) {
      *out += separator;
      put_value(element, out);
      separator = ",";
    }
    *out += ']';
  } else if (value.is_string()) {
    put_string(value.get_ref<const std::string &>(), out);
  } else if (value.is_number_float()) {
    put_real(value.get<double>(), out);
  } else {
    *out += value.dump();  // integers and literals
  }
}

const Json *find_member(const Json &value, std::string_view name) {
  if (!value.is_object()) return nullptr;
  const auto member = value.find(std::string(name));
  return member == value.end() ? nullptr : &*member;
}

}  // namespace

std::optional<Json> parse_json(std::string_view text) {
  const std::optional<std::string> prepared = prepare(text);
  if (!prepared) return std::nullopt;
  Json value = Json::parse(*prepared, nullptr, false);
  if (value.is_discarded()) return std::nullopt;
  return value;
}

std::string json_problem(std::string_view text) {
  const std::optional<std::string> prepared = prepare(text);
  if (!prepared) return "nested deeper than " + std::to_string(kMaxDepth) + " levels";
  try {
    const Json value = Json::parse(*prepared);
    return "";
  } catch (const Json::exception &error) {
    const std::string_view what = error.what();
    const size_t end_of_number = what.find("] ");
    return std::string(what.substr(end_of_number == what.npos ? 0 : end_of_number + 2));
  }
}

std::string serialize_as_device(const Json &value) {
  std::string text;
  put_value(value, &text);
  return text;
}

const Json *find_object(const Json &value, std::string_view name) {
  const Json *member = find_member(value, name);
  return member != nullptr && member->is_object() ? member : nullptr;
}

const Json *find_array(const Json &value, std::string_view name) {
  const Json *member = find_member(value, name);
  return member != nullptr && member->is_array() ? member : nullptr;
}

const std::string *find_string(const Json &value, std::string_view name) {
  const Json *member = find_member(value, name);
  return member != nullptr && member->is_string() ? member->get_ptr<const std::string *>()
                                                  : nullptr;
}

}  // namespace tsm
