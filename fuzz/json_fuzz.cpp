// SPDX-License-Identifier: BSD-2-Clause
// The document model: what it writes it reads back as the same document, and after any edit it
// holds what an independent model of JSON holds.
//
//     text, up to a NUL | edits, a few bytes each
#include <cmath>
#include <cstring>

#include "state/json.h"
#include "support/inside.h"
#include "tsm/json.h"

namespace {

using fuzz::require;
using tsm::Json;

constexpr int kMaxDepth = 19;           // containers that a value may lie in, to be parsed
constexpr size_t kMaxCopied = 1 << 12;  // bytes of text; so edits do not fill the heap
constexpr int kMaxEdits = 16;
constexpr size_t kExactDigits = 15;  // of a number that a double holds

std::string serialized(const JSON_Value *value) {
  return fuzz::take_text(json_serialize_to_string(value));
}

json_ptr parsed(std::string_view text) {
  return json_ptr(json_parse_string(fuzz::ExactText(text).get()));
}

int depth_of(const Json &value) {
  if (!value.is_structured()) return 0;
  int deepest = 0;
  for (const Json &child : value) deepest = std::max(deepest, 1 + depth_of(child));
  return deepest;
}

// Control characters are written as they are, but not read.
bool can_be_read_back(std::string_view text, int depth) {
  for (const char c : text) {
    if (static_cast<uint8_t>(c) < 0x20) return false;
  }
  return depth <= kMaxDepth;
}

// A fraction is written with six digits; where they are all zeros it comes back as an integer. Of a
// number with more digits than a double tells apart the last ones may come back as others.
bool has_inexact_number(std::string_view text) {
  size_t num_digits = 0;
  for (const char c : text) {
    num_digits = c >= '0' && c <= '9' ? num_digits + 1 : c == '.' ? num_digits : 0;
    if (num_digits > kExactDigits) return true;
  }
  return text.find(".000000") != std::string_view::npos;
}

void require_same(const JSON_Value *value, const std::string &text) {
  require(has_inexact_number(text) || serialized(value) == text,
          "what is written is read as the same document");
}

// Numbers are doubles to within some units of their last digit, and written with six digits behind
// the point.
bool same_number(double a, double b) {
  return std::fabs(a - b) <= std::max(6e-7, 1e-14 * std::fabs(a));
}

bool same(const Json &a, const Json &b) {
  if (a.is_number() && b.is_number()) return same_number(a.get<double>(), b.get<double>());
  if (!a.is_structured() || a.type() != b.type() || a.size() != b.size()) return a == b;
  for (auto x = a.begin(), y = b.begin(); x != a.end(); ++x, ++y) {
    if (a.is_object() && x.key() != y.key()) return false;
    if (!same(*x, *y)) return false;
  }
  return true;
}

// `depth` is negative when it is not known.
void check_document(const JSON_Value *value, const std::string &text, int depth) {
  const json_ptr copy(json_value_deep_copy(value));
  require(copy && serialized(copy.get()) == text, "a copy is the same document");
  const json_ptr again = parsed(text);
  if (again) require_same(again.get(), text);
  if (depth >= 0) {
    require((again != nullptr) == can_be_read_back(text, depth), "a written document is read");
  }
  const json_ptr spread = parsed(fuzz::take_text(json_serialize_to_string_pretty(value)));
  require((spread != nullptr) == (again != nullptr), "white space makes no difference");
  if (spread) require_same(spread.get(), text);
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
    if (left_.empty()) return 0;
    const auto byte = static_cast<uint8_t>(left_.front());
    left_.remove_prefix(1);
    return byte;
  }

  std::string take_string() {
    const std::string text(left_.substr(0, take() % 16));
    left_.remove_prefix(text.size());
    return text.substr(0, text.find('\0'));
  }

  std::string take_name() {
    const std::string name = take_string();
    return is_utf8(name) ? name : "name";
  }

  double take_number() {
    char bytes[sizeof(double)] = {};
    left_.remove_prefix(left_.copy(bytes, sizeof bytes));
    double number = 0;
    std::memcpy(&number, bytes, sizeof number);
    return number;
  }

  // A new value, where memory is sure to be enough for it; the same in both worlds.
  json_ptr take_value(Json *same) {
    if (take() % 2 == 0 && serialized(document_).size() < kMaxCopied &&
        depth_of(*model_) <= kMaxDepth) {
      *same = *model_;
      return json_ptr(json_value_deep_copy(document_));
    }
    const bool is_array = take() % 2 == 0;
    *same = is_array ? Json::array() : Json::object();
    return json_ptr(is_array ? json_value_init_array() : json_value_init_object());
  }

  // To a child that is a container, where the chosen one is that.
  void descend() {
    if (!place_->is_structured() || place_->empty()) return;
    const size_t index = take() % place_->size();
    if (place_->is_object()) {
      auto member = place_->begin();
      std::advance(member, index);
      if (!member->is_structured()) return;
      node_ = json_object_get_value(json_value_get_object(node_), member.key().c_str());
      place_ = &*member;
    } else if ((*place_)[index].is_object()) {
      // A view of a value is the value itself.
      node_ =
          reinterpret_cast<JSON_Value *>(json_array_get_object(json_value_get_array(node_), index));
      place_ = &(*place_)[index];
    }
    require(node_ != nullptr, "what the document holds is found in it");
  }

  static bool is_utf8(const std::string &text) {
    try {
      return !Json(text).dump().empty();
    } catch (const Json::type_error &) {
      return false;
    }
  }

  void edit_object() {
    JSON_Object *object = json_value_get_object(node_);
    const uint8_t what = take();
    const bool replaces = what % 2 == 0 && !place_->empty();
    const std::string name = replaces ? std::string(place_->begin().key()) : take_name();
    JSON_Status status = JSONSuccess;
    Json value;
    bool allowed = true;
    if (what % 8 < 3) {
      value = take_string();
      allowed = is_utf8(value.get<std::string>());
      const std::string text = value.get<std::string>();
      status = json_object_set_string(object, name.c_str(), text.c_str());
    } else if (what % 8 < 5) {
      const double number = take_number();
      value = number;
      allowed = std::isfinite(number);
      status = json_object_set_number(object, name.c_str(), number);
    } else if (what % 8 == 5) {
      status = json_object_set_value(object, name.c_str(), document_);
      allowed = false;  // it holds the object
    } else {
      json_ptr fresh = take_value(&value);
      status = json_object_set_value(object, name.c_str(), fresh.get());
      if (status == JSONSuccess) (void)fresh.release();
    }
    require((status == JSONSuccess) == allowed, "a member is set if it may be");
    if (allowed) (*place_)[name] = value;
  }

  void edit_array() {
    JSON_Array *array = json_value_get_array(node_);
    require(json_array_get_count(array) == place_->size(), "an array has its elements");
    const uint8_t what = take();
    if (what % 4 == 0) {
      const std::string text = take_string();
      const bool allowed = is_utf8(text);
      const JSON_Status status = json_array_append_string(array, text.c_str());
      require((status == JSONSuccess) == allowed, "a string is appended if it may be");
      if (allowed) place_->push_back(text);
    } else if (what % 4 < 3) {
      const size_t index = take() % (place_->size() + 1);
      const JSON_Status status = json_array_remove(array, index);
      require((status == JSONSuccess) == (index < place_->size()),
              "an element is removed if it is there");
      if (index == place_->size()) return;
      (*place_)[index] = Json(place_->back());
      place_->erase(place_->size() - 1);
    } else {
      Json value;
      json_ptr fresh = take_value(&value);
      require(json_array_append_value(array, fresh.get()) == JSONSuccess, "a value is appended");
      (void)fresh.release();
      place_->push_back(value);
    }
  }

  std::string_view left_;
  JSON_Value *document_;
  Json *model_;
  JSON_Value *node_ = nullptr;
  Json *place_ = nullptr;
};

void check(std::string_view text, std::string_view script) {
  const json_ptr document = parsed(text);
  if (!document) return;
  std::string written = serialized(document.get());
  // The model reads strict JSON only; the writer writes that unless there were other bytes.
  std::optional<Json> model = tsm::parse_json(written);
  check_document(document.get(), written, model ? depth_of(*model) : -1);
  if (!model) return;
  // An escaped NUL ends a string of the agent's.
  const bool ends_early = text.find("\\u0000") != std::string_view::npos;
  if (const std::optional<Json> strict = tsm::parse_json(text); strict && !ends_early) {
    require(same(*strict, *model), "both read the same from the text");
  }

  Edits edits(script, document.get(), &*model);
  for (int i = 0; i < kMaxEdits && edits.more(); ++i) {
    edits.make_one();
    written = serialized(document.get());
    const std::optional<Json> now = tsm::parse_json(written);
    require(now && same(*now, *model), "an edit changes what it should, and nothing else");
  }
  check_document(document.get(), written, depth_of(*model));
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  fuzz::Inside &inside = fuzz::Inside::instance();
  const std::string_view input = fuzz::as_view(data, size);
  const std::string_view text = input.substr(0, input.find('\0'));
  check(text, input.substr(std::min(input.size(), text.size() + 1)));
  inside.require_clean();
  return 0;
}
