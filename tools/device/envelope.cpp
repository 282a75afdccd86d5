// SPDX-License-Identifier: BSD-2-Clause
#include "device/envelope.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <nlohmann/json.hpp>
#include <optional>
#include <vector>

#include "common/encoding.h"
#include "common/error_line.h"
#include "common/result_names.h"

namespace device {
namespace {

using nlohmann::json;
using tools::Message;

constexpr std::string_view kBlanks = " \t\r\n";
constexpr size_t kMaxShownLen = 60;

/// The texts before colons of the outer object, in their order; nothing for what is no object. The
/// rest is left to the agent, whose reader takes more than a strict one would.
std::optional<std::vector<std::string_view>> outer_members(std::string_view text) {
  const size_t first = text.find_first_not_of(kBlanks);
  const size_t last = text.find_last_not_of(kBlanks);
  if (first == text.npos || text[first] != '{' || text[last] != '}') return std::nullopt;
  std::vector<std::string_view> names;
  std::string_view latest;  // text of the outer object
  size_t depth = 0;
  for (size_t at = first; at <= last; ++at) {
    const char c = text[at];
    if (c == '{' || c == '[') ++depth;
    if (c == '}' || c == ']') --depth;
    if (depth == 0) return at == last ? std::optional(names) : std::nullopt;
    if (c == ':' && depth == 1) names.push_back(latest);
    if (c != '"') continue;
    const size_t begin = at + 1;
    while (++at < last && text[at] != '"') at += text[at] == '\\';
    if (at >= last) return std::nullopt;
    latest = text.substr(begin, at - begin);
  }
  return std::nullopt;
}

const json *member(const json &object, std::string_view name) {
  const auto found = object.is_object() ? object.find(name) : object.end();
  return found == object.end() ? nullptr : &*found;
}

/// The value of the only member of an object, or what stands for nothing.
const json &inside(const json &object) {
  static const json nothing;
  return object.is_object() && object.size() == 1 ? *object.begin() : nothing;
}

json parse(std::string_view text) {
  return json::parse(text, nullptr, false);
}

/// What was signed: the document in "payload", which the envelope around it carries.
json payload_of(const json &envelope) {
  const json *text = member(inside(envelope), "payload");
  if (text == nullptr || !text->is_string()) return nullptr;
  const auto bytes = tools::base64url_decode(text->get_ref<const std::string &>());
  return bytes ? parse(*bytes) : json(nullptr);
}

uint32_t code_of(const json &reason) {
  const json *code = member(reason, "error_code");
  if (code == nullptr) return 0;
  if (code->is_number_integer()) return code->get<uint32_t>();
  const std::string text = code->is_string() ? code->get<std::string>() : "";
  return static_cast<uint32_t>(strtoul(text.c_str(), nullptr, 10));
}

size_t take_block(std::string_view &bytes) {
  constexpr size_t kLengthLen = 4;
  if (bytes.size() < kLengthLen) return 0;
  size_t len = 0;
  for (size_t i = kLengthLen; i-- > 0;) len = len << 8 | static_cast<uint8_t>(bytes[i]);
  bytes.remove_prefix(kLengthLen);
  if (len > bytes.size()) return 0;
  bytes.remove_prefix(len);
  return len;
}

bool is_public_key(const json *key) {
  if (key == nullptr || !key->is_string()) return false;
  const auto bytes = tools::base64url_decode(key->get_ref<const std::string &>());
  std::string_view left = bytes ? std::string_view(*bytes) : std::string_view();
  return take_block(left) > 0 && take_block(left) > 0 && left.empty();
}

bool has_odd_key(const json &request) {
  const json payload = payload_of(request);
  const json *chain = member(inside(payload), "tsm_key_chain");
  const json *list = chain == nullptr ? nullptr : member(*chain, "tsm_list");
  return list != nullptr && list->is_array() && std::ranges::any_of(*list, [](const json &entry) {
           return !is_public_key(member(entry, "tsm_pub_key"));
         });
}

}  // namespace

const Message &message_in(std::string_view request, const Message *expected) {
  const auto names = outer_members(request);
  if (!names) {
    throw tools::UsageError("the request is no JSON object: expected {\"" +
                            std::string(expected ? expected->request : "CreateSDRequest") +
                            "\": {...}}");
  }
  if (expected != nullptr && (names->empty() || std::ranges::count(*names, expected->request))) {
    return *expected;
  }
  if (expected != nullptr) {
    throw tools::UsageError("the request is a \"" +
                            std::string(names->front().substr(0, kMaxShownLen)) +
                            "\": expected \"" + std::string(expected->request) + "\" for " +
                            std::string(expected->command));
  }
  for (const std::string_view name : *names) {
    if (const Message *found = tools::find_message_by_request(name)) return *found;
  }
  throw tools::UsageError(
      "the request's outer member is no message: expected one such as \"CreateSDRequest\"");
}

std::string verdict_of_code(uint32_t code) {
  char text[sizeof("fail 0x00000000 ")];
  snprintf(text, sizeof(text), "fail 0x%08X", code);
  const tools::ResultName *result = tools::find_result(code);
  return result == nullptr ? text : std::string(text) + " " + result->name;
}

std::string verdict_of_response(std::string_view response) {
  const json payload = payload_of(parse(response));
  // The payload of a device state has no name around it.
  const json *status = member(payload, "status");
  const json &content = status == nullptr ? inside(payload) : payload;
  if (status == nullptr) status = member(content, "status");
  if (status == nullptr || *status != "fail") return "pass";
  const json *reason = member(content, "reason");
  return verdict_of_code(reason == nullptr ? 0 : code_of(*reason));
}

std::string installed_ta(std::string_view response) {
  const json document = parse(response);
  const bool has_image =
      member(document, tools::message_of(tools::MessageId::kInstallTa).response) ||
      member(document, tools::message_of(tools::MessageId::kUpdateTa).response);
  const json payload = payload_of(document);
  const json &content = inside(payload);
  const json *status = member(content, "status");
  const json *taid = member(content, "taid");
  const bool passed = status != nullptr && *status == "pass";
  if (!has_image || !passed || taid == nullptr || !taid->is_string()) return "";
  return taid->get<std::string>();
}

std::string flaw_of_request(std::string_view request) {
  const json document = parse(request);
  if (document.is_discarded()) return "the request is no JSON that can be read to its end";
  if (!has_odd_key(document)) return "";
  return "a \"tsm_pub_key\" is not encoded as the device reads it: expected base64url, without "
         "padding, of the modulus and the exponent, each with its length before it "
         "(4 bytes, little-endian)";
}

}  // namespace device
