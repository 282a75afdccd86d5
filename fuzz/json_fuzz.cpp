// SPDX-License-Identifier: BSD-2-Clause
// The document model: what it writes it reads back as the same document, and after any edit it
// holds what an independent model of JSON holds.
//
//     text, up to a NUL | edits, a few bytes each
#include <cmath>

#include "state/json.h"
#include "support/inside.h"
#include "tsm/json.h"

namespace fuzz {

using tsm::Json;

constexpr int kMaxDepth = 19;           // containers that a value may lie in, to be parsed
constexpr size_t kMaxCopied = 1 << 12;  // bytes of text; so edits do not fill the heap
constexpr int kMaxEdits = 16;
constexpr size_t kExactDigits = 15;  // of a number that a double holds

static std::string serialized(const JSON_Value *value) {
  return take_text(json_serialize_to_string(value));
}

static json_ptr parsed(std::string_view text) {
  return json_ptr(json_parse_string(ExactText(text).get()));
}

static int depth_of(const Json &value) {
  if (!value.is_structured()) return 0;
  int deepest = 0;
  for (const Json &child : value) deepest = std::max(deepest, 1 + depth_of(child));
  return deepest;
}

// Control characters are written as they are, but not read.
static bool can_be_read_back(std::string_view text, int depth) {
  const auto is_control = [](char c) { return static_cast<uint8_t>(c) < 0x20; };
  return depth <= kMaxDepth && std::ranges::none_of(text, is_control);
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

static void check_document(const JSON_Value *value, const std::string &text, const Json *model) {
  const json_ptr copy(json_value_deep_copy(value));
  require(copy && serialized(copy.get()) == text, "a copy is the same document");
  const json_ptr again = parsed(text);
  if (again) require_same(again.get(), text);
  require(!model || (again != nullptr) == can_be_read_back(text, depth_of(*model)),
          "a written document is read");
  const json_ptr spread = parsed(take_text(json_serialize_to_string_pretty(value)));
  require((spread != nullptr) == (again != nullptr), "white space makes no difference");
  if (spread) require_same(spread.get(), text);
}

static bool is_utf8(const std::string &text) {
  return Json::parse(Json(text).dump(-1, ' ', false, Json::error_handler_t::ignore)) == text;
}

// ---- Edits, made to the document and to the model

class Edits {
 public:
  Edits(std::string_view script, JSON_Value *document, Json *model)
      : left_(script), document_(document), model_(model) {}

  bool more() const { return !left_.empty(); }

  void make_one() {
    node_ = document_;
    place_ = model_;
    for (size_t steps = take() % 4; steps > 0; --steps) descend();
    if (place_->is_object()) edit_object();
    if (place_->is_array()) edit_array();
  }

 private:
  uint8_t take() {
    const uint8_t byte = left_.empty() ? 0 : u8(left_)[0];
    left_.remove_prefix(std::min<size_t>(left_.size(), 1));
    return byte;
  }

  std::string take_string() {
    const std::string text(left_.substr(0, take() % 16));
    left_.remove_prefix(text.size());
    return text.substr(0, text.find('\0'));
  }

  double take_number() {
    double number = 0;
    left_.remove_prefix(left_.copy(reinterpret_cast<char *>(&number), sizeof number));
    return number;
  }

  // A new value, where memory is sure to be enough for it; the same in both worlds.
  json_ptr take_value(Json *same) {
    const uint8_t what = take() % 4;
    if (what < 2 && serialized(document_).size() < kMaxCopied && depth_of(*model_) <= kMaxDepth) {
      *same = *model_;
      return json_ptr(json_value_deep_copy(document_));
    }
    *same = what % 2 == 0 ? Json::array() : Json::object();
    return json_ptr(what % 2 == 0 ? json_value_init_array() : json_value_init_object());
  }

  // To a child that is a container, where the chosen one is that.
  void descend() {
    if (!place_->is_structured() || place_->empty()) return;
    const size_t index = take() % place_->size();
    const auto child = std::next(place_->begin(), static_cast<ptrdiff_t>(index));
    if (place_->is_object() && child->is_structured()) {
      node_ = json_object_get_value(json_value_get_object(node_), child.key().c_str());
    } else if (place_->is_array() && child->is_object()) {
      // A view of a value is the value itself.
      node_ =
          reinterpret_cast<JSON_Value *>(json_array_get_object(json_value_get_array(node_), index));
    } else {
      return;
    }
    require(node_ != nullptr, "what the document holds is found in it");
    place_ = &*child;
  }

  void edit_object() {
    JSON_Object *object = json_value_get_object(node_);
    const uint8_t what = take();
    std::string name = take_string();
    if (!is_utf8(name)) name = "name";
    if (what % 2 == 0 && !place_->empty()) name = place_->begin().key();
    JSON_Status status = JSONSuccess;
    bool allowed = true;
    Json value;
    if (what % 8 < 3) {
      const std::string text = take_string();
      value = text;
      allowed = is_utf8(text);
      status = json_object_set_string(object, name.c_str(), text.c_str());
    } else if (what % 8 < 5) {
      const double number = take_number();
      value = number;
      allowed = std::isfinite(number);
      status = json_object_set_number(object, name.c_str(), number);
    } else if (what % 8 == 5) {
      allowed = false;  // it holds the object
      status = json_object_set_value(object, name.c_str(), document_);
    } else {
      json_ptr fresh = take_value(&value);
      status = json_object_set_value(object, name.c_str(), fresh.release());
    }
    require((status == JSONSuccess) == allowed, "a member is set if it may be");
    if (allowed) (*place_)[name] = value;
  }

  void edit_array() {
    JSON_Array *array = json_value_get_array(node_);
    require(json_array_get_count(array) == place_->size(), "an array has its elements");
    const uint8_t what = take() % 4;
    if (what == 0) {
      const std::string text = take_string();
      require((json_array_append_string(array, text.c_str()) == JSONSuccess) == is_utf8(text),
              "a string is appended if it may be");
      if (is_utf8(text)) place_->push_back(text);
    } else if (what == 1) {
      Json value;
      json_ptr fresh = take_value(&value);
      require(json_array_append_value(array, fresh.release()) == JSONSuccess,
              "a value is appended");
      place_->push_back(value);
    } else {
      const size_t index = take() % (place_->size() + 1);
      require((json_array_remove(array, index) == JSONSuccess) == (index < place_->size()),
              "an element is removed if it is there");
      if (index == place_->size()) return;
      (*place_)[index] = Json(place_->back());
      place_->erase(place_->size() - 1);
    }
  }

  std::string_view left_;
  JSON_Value *document_;
  Json *model_;
  JSON_Value *node_ = nullptr;
  Json *place_ = nullptr;
};

void check(std::string_view input) {
  const Inside inside;
  const std::string_view text = input.substr(0, input.find('\0'));
  const json_ptr document = parsed(text);
  if (!document) return;
  std::string written = serialized(document.get());
  // The model reads strict JSON only; the writer writes that unless there were other bytes.
  std::optional<Json> model = tsm::parse_json(written);
  check_document(document.get(), written, model ? &*model : nullptr);
  if (!model) return;
  // An escaped NUL ends a string of the agent's.
  const bool ends_early = text.find("\\u0000") != std::string_view::npos;
  const std::optional<Json> strict = tsm::parse_json(text);
  require(!strict || ends_early || same(*strict, *model), "both read the same from the text");

  Edits edits(input.substr(std::min(input.size(), text.size() + 1)), document.get(), &*model);
  for (int i = 0; i < kMaxEdits && edits.more(); ++i) {
    edits.make_one();
    written = serialized(document.get());
    const std::optional<Json> now = tsm::parse_json(written);
    require(now && same(*now, *model), "an edit changes what it should, and nothing else");
  }
  check_document(document.get(), written, &*model);
}

}  // namespace fuzz
