// SPDX-License-Identifier: BSD-2-Clause
// The token reader: it has the tokens that the tokenizer finds alone, every slice lies inside the
// text, and is what a second reader of the same text finds.
//
//     key, up to a line feed | text
#include <algorithm>
#include <span>
#include <vector>

#include "state/token_reader.h"

#define JSMN_STATIC
#include <jsmn.h>

#include "support/inside.h"
#include "tsm/protocol/json.h"

namespace fuzz {

using tsm::Json;

// Empty when the text is no object.
static std::vector<jsmntok_t> tokens_of(std::string_view text) {
  jsmn_parser parser;
  jsmn_init(&parser);
  const int count = jsmn_parse(&parser, text.data(), text.size(), nullptr, 0);
  if (count < 1) return {};
  std::vector<jsmntok_t> tokens(static_cast<size_t>(count));
  jsmn_init(&parser);
  const int used = jsmn_parse(&parser, text.data(), text.size(), tokens.data(),
                              static_cast<unsigned>(tokens.size()));
  tokens.resize(static_cast<size_t>(std::max(used, 0)));
  if (tokens.empty() || tokens[0].type != JSMN_OBJECT) return {};
  return tokens;
}

static bool is_same(const jsmntok_t &one, const jsmntok_t &other) {
  return one.type == other.type && one.start == other.start && one.end == other.end &&
         one.size == other.size;
}

static void check_tokens(const jsmn_object *object, std::string_view text) {
  const std::vector<jsmntok_t> expected = tokens_of(text);
  const std::span<const jsmntok_t> found(
      object != nullptr ? reinterpret_cast<const jsmntok_t *>(object->tokens) : nullptr,
      object != nullptr ? object->count : 0);
  require(std::ranges::equal(found, expected, is_same), "the tokens are the tokenizer's");
}

static std::optional<std::string_view> look_up(const jsmn_object *object, const char *key,
                                               std::string_view text) {
  const slice_ptr slice(jsmn_object_get_string(object, key));
  require(bool(slice), "there is memory for a slice");
  if (slice->data == nullptr) return std::nullopt;
  require(slice->data >= text.data() && slice->len <= text.size() &&
              slice->data - text.data() + slice->len <= static_cast<ptrdiff_t>(text.size()),
          "a slice lies inside the text");
  return std::string_view(slice->data, slice->len);
}

// In strict JSON the first member's name leads to its value.
static void check_first_member(const jsmn_object *object, std::string_view text) {
  if (text.find('\\') != std::string_view::npos) return;  // escapes are not undone
  const std::optional<Json> document = tsm::parse_json(text);
  if (!document || document->empty()) return;
  const std::string name = document->begin().key();
  const std::string quoted = '"' + name + '"';
  if (text.find(quoted) != text.rfind(quoted)) return;  // of two the first is taken

  const auto found = look_up(object, name.c_str(), text);
  require(found.has_value(), "a member is found by its name");
  const Json &value = *document->begin();
  const std::string quote = value.is_string() ? "\"" : "";
  require(tsm::parse_json(quote + std::string(*found) + quote) == value, "a member has its value");
}

void check(std::string_view input) {
  const Inside inside;
  const std::string_view key_line = input.substr(0, input.find('\n'));
  const ExactText key(key_line);
  const device::Buffer exact(input.substr(std::min(input.size(), key_line.size() + 1)));
  const std::string_view text = exact.bytes();
  const jsmn_string slice = {text.data(), static_cast<uint32_t>(text.size())};
  const token_object_ptr object(jsmn_init_object(&slice));
  check_tokens(object.get(), text);
  if (!object) return;
  for (const char *name : {key.get(), "header", "tsmid", "payload", ""}) {
    const auto value = look_up(object.get(), name, text);
    const token_object_ptr inner(jsmn_object_get_object(object.get(), name));
    if (inner) look_up(inner.get(), key.get(), *value);
  }
  check_first_member(object.get(), text);
}

}  // namespace fuzz
