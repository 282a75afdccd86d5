// SPDX-License-Identifier: BSD-2-Clause
// The document model: what it writes it reads back as the same document, and it reads what an
// independent reader of JSON reads.
//
//     text, up to a NUL
#include <cmath>

#include "state/json.h"
#include "support/inside.h"
#include "tsm/protocol/json.h"

namespace fuzz {

using tsm::Json;

constexpr size_t kExactDigits = 15;  // of a number that a double holds

static std::string serialized(const JSON_Value *value) {
  return take_text(json_serialize_to_string(value));
}

static json_ptr parsed(std::string_view text) {
  return json_ptr(json_parse_string(ExactText(text).get()));
}

// Control characters are written as they are, but not read.
static bool can_be_read_back(std::string_view text) {
  return std::ranges::none_of(text, [](char c) { return static_cast<uint8_t>(c) < 0x20; });
}

// A fraction is written with six digits; where they are all zeros it comes back as an integer. Of a
// number with more digits than a double tells apart the last ones may come back as others.
static bool has_inexact_number(std::string_view text) {
  size_t num_digits = 0;
  for (const char c : text) {
    num_digits = c >= '0' && c <= '9' ? num_digits + 1 : c == '.' ? num_digits : 0;
    if (num_digits > kExactDigits) return true;
  }
  return text.find(".000000") != std::string_view::npos;
}

static void require_same(const JSON_Value *value, const std::string &text) {
  require(has_inexact_number(text) || serialized(value) == text,
          "what is written is read as the same document");
}

// Numbers are doubles to within some units of their last digit, and written with six digits behind
// the point.
static bool same(const Json &a, const Json &b) {
  if (a.is_number() && b.is_number()) {
    const double x = a.get<double>(), y = b.get<double>();
    return std::fabs(x - y) <= std::max(6e-7, 1e-14 * std::fabs(x));
  }
  if (!a.is_structured() || a.type() != b.type() || a.size() != b.size()) return a == b;
  for (auto x = a.begin(), y = b.begin(); x != a.end(); ++x, ++y) {
    if (a.is_object() && x.key() != y.key()) return false;
    if (!same(*x, *y)) return false;
  }
  return true;
}

// An array by its slices, and the tree that the same text is.
static void check_slices(const ExactText &text, const JSON_Value *tree) {
  const json_ptr sliced(json_value_init_slices(text.get(), json_look_through(text.get())));
  require(bool(sliced) == (tree != nullptr), "an array can be taken apart if it can be read");
  JSON_Array *slices = json_value_get_array(sliced.get());
  constexpr size_t kMaxCount = 50;
  if (slices == nullptr || json_array_get_count(slices) > kMaxCount) return;
  const json_ptr copy(json_value_deep_copy(tree));
  JSON_Array *elements = json_value_get_array(copy.get());
  require(serialized(sliced.get()) == serialized(tree), "its slices are its elements");
  while (const size_t count = json_array_get_count(slices)) {
    for (const char *name : {"name", "spid", "a"}) {
      const char *member = json_object_get_string(json_array_get_object(elements, count / 2), name);
      for (const char *wanted : {member, "a", static_cast<const char *>(nullptr)}) {
        require(json_array_match(slices, count / 2, name, wanted) ==
                    json_array_match(elements, count / 2, name, wanted),
                "a slice has the same members");
      }
    }
    require(json_array_remove(slices, count / 2) == json_array_remove(elements, count / 2) &&
                serialized(sliced.get()) == serialized(copy.get()),
            "without one the rest is the same");
  }
}

static void check_rewriting(const JSON_Value *value, const std::string &text) {
  const json_ptr copy(json_value_deep_copy(value));
  require(copy && serialized(copy.get()) == text, "a copy is the same document");
  const json_ptr again = parsed(text);
  if (again) require_same(again.get(), text);
  const ExactText kept_text(text);
  const json_ptr kept(
      json_value_init_verbatim(kept_text.get(), json_look_through(kept_text.get())));
  require(bool(kept) == bool(again) && (!kept || serialized(kept.get()) == serialized(again.get())),
          "an array that stays its text is written as what is read from it");
  require(json_value_count_elements(kept.get()) ==
              json_array_get_count(json_value_get_array(again.get())),
          "it has as many elements");
  check_slices(kept_text, again.get());
  const json_ptr spread = parsed(take_text(json_serialize_to_string_pretty(value)));
  require(bool(spread) == bool(again), "white space makes no difference");
  if (spread) require_same(spread.get(), text);
  // The TSM reads strict JSON only; the writer writes that unless there were other bytes.
  require(!tsm::parse_json(text) || bool(again) == can_be_read_back(text),
          "a written document is read");
}

void check(std::string_view input) {
  const Inside inside;
  const std::string_view text = input.substr(0, input.find('\0'));
  const json_ptr document = parsed(text);
  if (!document) return;
  const std::string written = serialized(document.get());
  check_rewriting(document.get(), written);
  // An escaped NUL ends a string of the agent's.
  if (text.find("\\u0000") != std::string_view::npos) return;
  const std::optional<Json> strict = tsm::parse_json(text), rewritten = tsm::parse_json(written);
  require(!strict || !rewritten || same(*strict, *rewritten), "both read the same from the text");
}

}  // namespace fuzz
