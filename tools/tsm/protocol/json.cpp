// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/protocol/json.h"

#include <simdjson.h>

#include <cmath>
#include <cstdint>
#include <cstdio>

template class nlohmann::basic_json<nlohmann::ordered_map>;

namespace tsm {
namespace {

constexpr int kMaxDepth = 64;

/// Printable ASCII that needs no escape. All of it is looked at, which goes faster than stopping,
/// and kept in a byte: so as many are looked at at once as the machine can.
bool is_plain(std::string_view text) {
  uint8_t others = 0;
  for (const char c : text) others |= c < ' ' || c > '~' || c == '"' || c == '\\' ? 1 : 0;
  return others == 0;
}

bool put_tree(const simdjson::dom::element &element, int max_depth, Json *value);

bool put_object(const simdjson::dom::object &object, int max_depth, Json *value) {
  *value = Json::object();
  auto &members = value->get_ref<Json::object_t &>();
  members.reserve(object.size());
  for (const simdjson::dom::key_value_pair &member : object) {
    if (!put_tree(member.value, max_depth, &members[std::string(member.key)])) return false;
  }
  return true;
}

bool put_array(const simdjson::dom::array &array, int max_depth, Json *value) {
  *value = Json::array();
  auto &elements = value->get_ref<Json::array_t &>();
  elements.reserve(array.size());
  for (const simdjson::dom::element element : array) {
    if (!put_tree(element, max_depth, &elements.emplace_back())) return false;
  }
  return true;
}

/// Whole numbers are unsigned unless they are negative, as the parser has them.
Json number_of(int64_t number) {
  return number < 0 ? Json(number) : Json(static_cast<uint64_t>(number));
}

/// False where it is deeper than `max_depth`.
bool put_tree(const simdjson::dom::element &element, int max_depth, Json *value) {
  using Type = simdjson::dom::element_type;
  switch (element.type()) {
    case Type::OBJECT:
      return max_depth > 0 && put_object(element.get_object(), max_depth - 1, value);
    case Type::ARRAY:
      return max_depth > 0 && put_array(element.get_array(), max_depth - 1, value);
    case Type::STRING:
      *value = std::string(element.get_string().value_unsafe());
      return true;
    case Type::INT64:
      *value = number_of(element.get_int64());
      return true;
    case Type::UINT64:
      *value = element.get_uint64().value_unsafe();
      return true;
    case Type::DOUBLE:
      *value = element.get_double().value_unsafe();
      return true;
    case Type::BOOL:
      *value = element.get_bool().value_unsafe();
      return true;
    case Type::NULL_VALUE:
      *value = nullptr;
      return true;
  }
  return false;
}

/// Reads long texts many bytes at once, which nearly all of an answer is. What it refuses, for
/// whatever reason, is left to the parser that has always been asked.
std::optional<Json> parse_quickly(std::string_view text) {
  constexpr size_t kMaxLen = 256 << 10;  // each thread keeps its room
  if (text.size() > kMaxLen || text.find("\\u") != text.npos) return std::nullopt;
  static thread_local std::string padded;
  static thread_local simdjson::dom::parser parser;
  padded.reserve(text.size() + simdjson::SIMDJSON_PADDING);
  padded.assign(text);
  simdjson::dom::element root;
  if (parser.parse(padded.data(), text.size(), false).get(root) != simdjson::SUCCESS) {
    return std::nullopt;
  }
  Json value;
  return put_tree(root, kMaxDepth, &value) ? std::optional(std::move(value)) : std::nullopt;
}

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

struct DeviceForm {
  static void put_text(const std::string &value, std::string *out) { put_string(value, out); }
  static void put_number(const Json &value, std::string *out) {
    if (value.is_number_float()) return put_real(value.get<double>(), out);
    *out += value.dump();
  }
};

/// Most strings are long and in base64: what needs no escape is found out and copied at once.
struct CompactForm {
  static constexpr size_t kRoom = 4096;  // for what follows a long string
  static void put_text(const std::string &value, std::string *out) {
    if (is_plain(value)) {
      out->reserve(out->size() + value.size() + kRoom);
      *out += '"';
      *out += value;
      *out += '"';
    } else {
      *out += Json(value).dump();
    }
  }
  static void put_number(const Json &value, std::string *out) { *out += value.dump(); }
};

/// A number, or a literal, is put as one.
template <class Form>
void put_value(const Json &value, std::string *out) {
  const char *separator = "";
  if (value.is_object()) {
    *out += '{';
    for (const auto &[name, member] : value.get_ref<const Json::object_t &>()) {
      *out += separator;
      Form::put_text(name, out);
      *out += ':';
      put_value<Form>(member, out);
      separator = ",";
    }
    *out += '}';
  } else if (value.is_array()) {
    *out += '[';
    for (const Json &element : value) {
      *out += separator;
      put_value<Form>(element, out);
      separator = ",";
    }
    *out += ']';
  } else if (value.is_string()) {
    Form::put_text(value.get_ref<const std::string &>(), out);
  } else {
    Form::put_number(value, out);
  }
}

const Json *find_member(const Json &value, std::string_view name) {
  if (!value.is_object()) return nullptr;
  const auto member = value.find(std::string(name));
  return member == value.end() ? nullptr : &*member;
}

}  // namespace

std::optional<Json> parse_json(std::string_view text) {
  if (std::optional<Json> value = parse_quickly(text)) return value;
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
  put_value<DeviceForm>(value, &text);
  return text;
}

std::string compact(const Json &value) {
  std::string text;
  put_value<CompactForm>(value, &text);
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
