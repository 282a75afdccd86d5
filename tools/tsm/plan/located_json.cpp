// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/plan/located_json.h"

#include <cstdint>
#include <iterator>
#include <nlohmann/json.hpp>

namespace tsm {
namespace {

constexpr size_t kMaxDepth = 16;

/// Counts the lines that the parser has taken: it takes no more than the token at hand.
class CountingIterator {
 public:
  using difference_type = std::ptrdiff_t;
  using value_type = char;
  using pointer = const char *;
  using reference = const char &;
  using iterator_category = std::input_iterator_tag;

  CountingIterator(const char *at, size_t *line) : at_(at), line_(line) {}
  reference operator*() const { return *at_; }
  CountingIterator &operator++() {
    if (*at_++ == '\n') ++*line_;
    return *this;
  }
  bool operator==(const CountingIterator &other) const { return at_ == other.at_; }

 private:
  const char *at_;
  size_t *line_;
};

/// Builds the tree from what the parser meets.
class Builder : public nlohmann::json_sax<nlohmann::json> {
 public:
  explicit Builder(const size_t *line) : line_(line) {}

  LocatedJson root;
  std::string problem;

  bool null() override { return put(LocatedJson::Kind::kOther); }
  bool boolean(bool) override { return put(LocatedJson::Kind::kOther); }
  bool number_integer(int64_t) override { return put(LocatedJson::Kind::kOther); }
  bool number_unsigned(uint64_t) override { return put(LocatedJson::Kind::kOther); }
  bool number_float(double, const std::string &) override { return put(LocatedJson::Kind::kOther); }
  bool binary(binary_t &) override { return false; }  // JSON has none
  bool string(std::string &value) override { return put(LocatedJson::Kind::kText, value); }
  bool start_object(size_t) override { return open(LocatedJson::Kind::kObject); }
  bool start_array(size_t) override { return open(LocatedJson::Kind::kArray); }
  bool end_object() override { return close(); }
  bool end_array() override { return close(); }
  bool key(std::string &name) override {
    name_ = name;
    return true;
  }
  bool parse_error(size_t, const std::string &, const nlohmann::json::exception &error) override {
    const std::string_view what = error.what();
    problem = "not JSON: " + std::string(what.substr(std::min(what.rfind(" - ") + 3, what.size())));
    return false;
  }

 private:
  bool put(LocatedJson::Kind kind, std::string text = {}) {
    place() = {.kind = kind, .line = *line_, .text = std::move(text)};
    return true;
  }
  bool open(LocatedJson::Kind kind) {
    if (open_.size() == kMaxDepth) {
      problem = "nested deeper than expected";
      return false;
    }
    LocatedJson &value = place();
    value = {.kind = kind, .line = *line_};
    open_.push_back(&value);
    return true;
  }
  bool close() {
    open_.pop_back();
    return true;
  }

  /// Where the next value goes. What is open stays where it is: it is the last of its parent.
  LocatedJson &place() {
    if (open_.empty()) return root;
    LocatedJson &parent = *open_.back();
    if (parent.kind == LocatedJson::Kind::kArray) return parent.elements.emplace_back();
    return parent.members.emplace_back(name_, LocatedJson()).second;
  }

  const size_t *line_;
  std::vector<LocatedJson *> open_;
  std::string name_;
};

}  // namespace

tools::UsageError error_at(const std::string &file, size_t line, const std::string &what) {
  return tools::UsageError(file + ":" + std::to_string(line) + ": " + what);
}

LocatedJson parse_located_json(std::string_view text, const std::string &file) {
  size_t line = 1;
  Builder builder(&line);
  const CountingIterator begin(text.data(), &line);
  const CountingIterator end(text.data() + text.size(), &line);
  if (!nlohmann::json::sax_parse(begin, end, &builder)) {
    throw error_at(file, line, builder.problem);
  }
  return std::move(builder.root);
}

}  // namespace tsm
