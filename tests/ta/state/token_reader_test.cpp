// SPDX-License-Identifier: BSD-2-Clause
#include "state/token_reader.h"

#include <array>
#include <climits>
#include <list>

#include "support/inside_agent.h"

namespace otrp_test {
namespace {

class TokenReader : public InsideAgent {
 protected:
  // Over a copy of exact size, so that a character too far is seen.
  token_object_ptr over(const std::string &text) {
    const jsmn_string slice = {texts_.emplace_back(text).bytes().data(), len_of(text)};
    return token_object_ptr(jsmn_init_object(&slice));
  }

 private:
  std::list<device::Buffer> texts_;
};

std::string lookup(const jsmn_object *object, const char *key) {
  const slice_ptr slice(jsmn_object_get_string(object, key));
  return slice->data == nullptr ? "NULL" : std::string(slice->data, slice->len);
}

TEST_F(TokenReader, TakesTheTokenAfterTheFirstStringThatEqualsTheKey) {
  std::string many;
  for (int i = 0; i < 300; ++i) many += ",1";
  const std::array<std::string, 3> cases[] = {
      {R"({"a":"1","b":"2"})", "b", "2"},
      {R"({"a":"\u0041\n\/"})", "a", R"(\u0041\n\/)"},
      {R"({"a":""})", "a", ""},
      {R"({"a": {"b" : [1, 2]} })", "a", R"({"b" : [1, 2]})"},
      {R"({"a":[1,"x"]})", "a", R"([1,"x"])"},
      {R"({"a":-1.5e3,"b":true})", "a", "-1.5e3"},
      {R"({"a":"1","a":"2"})", "a", "1"},
      {R"({"x":{"y":[{"a":"inner"}]},"a":"outer"})", "a", "inner"},
      {R"({"x":"tsmid","tsmid":"t"})", "tsmid", "tsmid"},
      {R"({"x":"a"})", "a", "NULL"},
      {R"({"ab":"1"})", "a", "NULL"},
      {R"({"\u0061":"1"})", "a", "NULL"},
      {R"({a:"1"})", "a", "NULL"},
      {R"({x"y":"1"})", "y", "NULL"},
      {R"({"x:":":","a":"1"})", "x:", ":"},
      {R"({"x":"y\"a","a":"2"})", "a", "2"},
      {"{}", "a", "NULL"},
      {R"({"":"1"})", "", "1"},
      {std::string("{\"a\":\"1\"}\0\"b\":\"2\"", 17), "b", "NULL"},
      {"{\"a\":[0" + many + "],\"b\":\"2\"}", "b", "2"},
  };
  for (const auto &[text, key, value] : cases) {
    const token_object_ptr object = over(text);
    ASSERT_TRUE(object) << text;
    EXPECT_EQ(lookup(object.get(), key.c_str()), value) << text;
  }
}

TEST_F(TokenReader, RefusesWhatIsNoObject) {
  const std::string cases[] = {"",
                               std::string("\0{}", 3),
                               R"({"a":"\x"})",
                               R"({"a)",
                               R"({"a":1)",
                               R"({"a":1])",
                               std::string("{\"a\":1\0}", 8),
                               std::string("{\"a\":\"\0\"}", 9),
                               R"(x {"a":1})",
                               "[{}]"};
  for (const std::string &text : cases) EXPECT_EQ(over(text).get(), nullptr) << text;
}

TEST_F(TokenReader, InnerObjectsAreObjects) {
  const token_object_ptr object = over(R"({"a":{"b":"1"},"s":"{}","e":"x"})");
  const token_object_ptr inner(jsmn_object_get_object(object.get(), "a"));
  EXPECT_EQ(inner->count, 3u);
  EXPECT_EQ(lookup(inner.get(), "b"), "1");
  EXPECT_EQ(lookup(inner.get(), "s"), "NULL");
  // The characters of a string are tokenized as any others.
  EXPECT_TRUE(token_object_ptr(jsmn_object_get_object(object.get(), "s")));
  EXPECT_EQ(jsmn_object_get_object(object.get(), "e"), nullptr);
  EXPECT_EQ(jsmn_object_get_object(object.get(), "missing"), nullptr);
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

}  // namespace
}  // namespace otrp_test
