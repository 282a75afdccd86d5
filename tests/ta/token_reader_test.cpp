// SPDX-License-Identifier: BSD-2-Clause
#include "state/token_reader.h"

#include <climits>

#include "support/inside_agent.h"
#include "ta/allocation_sweep.h"

namespace otrp_test {
namespace {

class TokenReader : public InsideAgent {
 protected:
  // Over a copy of exact size, so that a character too far is seen.
  jsmn_object *over(const std::string &text) {
    texts_.push_back(std::make_unique<std::vector<char>>(text.begin(), text.end()));
    const jsmn_string slice = {texts_.back()->data(), static_cast<uint32_t>(text.size())};
    return jsmn_init_object(&slice);
  }

 private:
  std::vector<std::unique_ptr<std::vector<char>>> texts_;
};

std::string lookup(const jsmn_object *object, const char *key) {
  const slice_ptr slice(jsmn_object_get_string(object, key));
  if (slice->data == nullptr) return "NULL";
  return std::string(slice->data, slice->len);
}

struct LookupCase {
  const char *name;
  const char *text;
  const char *key;
  const char *value;
};

TEST_F(TokenReader, TakesTheTokenAfterTheFirstStringThatEqualsTheKey) {
  const LookupCase kCases[] = {
      {"String", R"({"a":"1","b":"2"})", "b", "2"},
      {"RawEscapes", R"({"a":"\u0041\n\/"})", "a", R"(\u0041\n\/)"},
      {"Empty", R"({"a":""})", "a", ""},
      {"Object", R"({"a": {"b" : [1, 2]} })", "a", R"({"b" : [1, 2]})"},
      {"Array", R"({"a":[1,"x"]})", "a", R"([1,"x"])"},
      {"Primitive", R"({"a":-1.5e3,"b":true})", "a", "-1.5e3"},
      {"FirstOfTwo", R"({"a":"1","a":"2"})", "a", "1"},
      {"Nested", R"({"x":{"y":[{"a":"deep"}]}})", "a", "deep"},
      {"NestedFirst", R"({"x":{"a":"inner"},"a":"outer"})", "a", "inner"},
      {"ValueLikeAName", R"({"x":"tsmid","tsmid":"t"})", "tsmid", "tsmid"},
      {"LastToken", R"({"x":"a"})", "a", "NULL"},
      {"Missing", R"({"x":"y"})", "a", "NULL"},
      {"Prefix", R"({"ab":"1"})", "a", "NULL"},
      {"EscapedNameIsAnotherName", R"({"\u0061":"1"})", "a", "NULL"},
      {"PrimitiveIsNoKey", R"({a:"1"})", "a", "NULL"},
      {"EmptyObject", "{}", "a", "NULL"},
      {"EmptyKey", R"({"":"1"})", "", "1"},
  };
  for (const auto &c : kCases) {
    SCOPED_TRACE(c.name);
    const token_object_ptr object(over(c.text));
    ASSERT_TRUE(object);
    EXPECT_EQ(lookup(object.get(), c.key), c.value);
  }
}

struct RefusalCase {
  const char *name;
  std::string text;
  const char *line;
};

TEST_F(TokenReader, SaysWhyATextIsNoObject) {
  const RefusalCase kCases[] = {
      {"Empty", "", "compute jsmn_string tokens fail with code: 0"},
      {"NulFirst", std::string("\0{}", 3), "compute jsmn_string tokens fail with code: 0"},
      {"BadEscape", R"({"a":"\x"})", "compute jsmn_string tokens fail with code: -2"},
      {"OpenString", R"({"a)", "compute jsmn_string tokens fail with code: -3"},
      {"OpenObject", R"({"a":1)", "Failed to parse JSON: -3"},
      {"WrongBracket", R"({"a":1])", "Failed to parse JSON: -2"},
      {"CutByANul", std::string("{\"a\":1\0}", 8), "Failed to parse JSON: -3"},
      {"BareWordFirst", R"(x {"a":1})", "Object expected"},
      {"Array", "[{}]", "Object expected"},
  };
  for (const auto &c : kCases) {
    SCOPED_TRACE(c.name);
    log.clear();
    EXPECT_EQ(over(c.text), nullptr);
    EXPECT_EQ(lines_of(log), std::vector<std::string>{std::string("jsmn_init_object: ") + c.line});
  }
}

TEST_F(TokenReader, TextBehindANulIsNotRead) {
  const token_object_ptr object(over(std::string("{\"a\":\"1\"}\0\"b\":\"2\"", 17)));
  ASSERT_TRUE(object);
  EXPECT_EQ(object->count, 3u);
  EXPECT_EQ(lookup(object.get(), "b"), "NULL");
}

TEST_F(TokenReader, InnerObjectsAreObjects) {
  const token_object_ptr object(over(R"({"a":{"b":"1"},"s":"{}","e":"x"})"));
  const token_object_ptr inner(jsmn_object_get_object(object.get(), "a"));
  ASSERT_TRUE(inner);
  EXPECT_EQ(inner->count, 3u);
  EXPECT_EQ(lookup(inner.get(), "b"), "1");
  EXPECT_EQ(lookup(inner.get(), "s"), "NULL");
  EXPECT_TRUE(lines_of(log).empty());
  // The characters of a string are tokenized as any others.
  EXPECT_TRUE(token_object_ptr(jsmn_object_get_object(object.get(), "s")));
  EXPECT_EQ(jsmn_object_get_object(object.get(), "e"), nullptr);
  EXPECT_EQ(jsmn_object_get_object(object.get(), "missing"), nullptr);
  EXPECT_EQ(lines_of(log), (std::vector<std::string>{
                               "jsmn_init_object: Object expected",
                               "jsmn_init_object: compute jsmn_string tokens fail with code: 0"}));
}

TEST_F(TokenReader, ManyTokensAreReadAndRemarkedOn) {
  std::string text = R"({"list":[)";
  for (int i = 0; i < 297; ++i) text += "1,";
  const token_object_ptr enough(over(text.substr(0, 9 + 2 * 252) + "1]}"));
  EXPECT_EQ(enough->count, 256u);
  EXPECT_TRUE(lines_of(log).empty());
  const token_object_ptr object(over(text + R"("end"]})"));
  ASSERT_TRUE(object);
  EXPECT_EQ(object->count, 301u);
  EXPECT_EQ(lines_of(log), std::vector<std::string>{"jsmn_init_object: json object too big"});
}

TEST_F(TokenReader, NullAndTooLong) {
  EXPECT_EQ(jsmn_init_object(nullptr), nullptr);
  const jsmn_string no_text = {nullptr, 7};
  EXPECT_EQ(jsmn_init_object(&no_text), nullptr);
  const jsmn_string too_long = {"{}", static_cast<uint32_t>(INT_MAX) + 1};  // refused unread
  EXPECT_EQ(jsmn_init_object(&too_long), nullptr);
  EXPECT_EQ(lookup(nullptr, "a"), "NULL");
  EXPECT_EQ(jsmn_object_get_object(nullptr, "a"), nullptr);
  EXPECT_EQ(jsmn_string_dup(nullptr, 0), nullptr);
  EXPECT_EQ(jsmn_string_dup("x", UINT32_MAX), nullptr);
  EXPECT_STREQ(tee_ptr<char>(jsmn_string_dup("abc", 2)).get(), "ab");
}

TEST(TokenReaderSweep, LeavesNothingBehind) {
  fail_each_allocation([] {
    const jsmn_string slice = {R"({"a":{"b":"1"}})", 15};
    const token_object_ptr object(jsmn_init_object(&slice));
    const token_object_ptr inner(jsmn_object_get_object(object.get(), "a"));
    const slice_ptr value(jsmn_object_get_string(inner.get(), "b"));
    return object && inner && value && value->len == 1;
  });
}

}  // namespace
}  // namespace otrp_test
