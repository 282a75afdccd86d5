// SPDX-License-Identifier: BSD-2-Clause
#include "state/json.h"

#include <iterator>
#include <random>
#include <sstream>
#include <vector>

#include "support/inside_agent.h"

namespace otrp_test {
namespace {

class Json : public InsideAgent {};

json_ptr parse(const std::string &text) {
  return json_ptr(json_parse_string(ExactText(text.c_str()).get()));
}

std::string compact(const JSON_Value *value) {
  const json_text text(json_serialize_to_string(value));
  return text ? text.get() : "NULL";
}

// What comes out of a text that went in; "NULL" when it does not parse.
std::string through(const std::string &text) {
  return compact(parse(text).get());
}

// Cases that hold no blanks, in one text.
std::vector<std::string> words(const std::string &text) {
  std::istringstream in(text);
  return {std::istream_iterator<std::string>(in), {}};
}

TEST_F(Json, ParsesValues) {
  const struct {
    const char *name;
    std::string text;
    std::string compact;
  } cases[] = {
      {"WhiteSpace", " \t\n\v\f\r{ \"a\" : [ ] , \"b\" : { } } ", R"({"a":[],"b":{}})"},
      {"TextAfterIsIgnored", "{} /* x */", "{}"},
      {"LiteralByItsFirstCharacters", "trueish", "true"},
      {"Escapes", R"("\"\\\/\b\f\n\r\tz")", R"("\"\\\/\b\f\n\r\tz")"},
      {"UnicodeEscapes", R"("\u0041\u00e9\u20AC\uD83D\uDE00")", "\"A\u00e9\u20ac\U0001F600\""},
      {"EscapedNulEndsTheString", R"(["a\u0000b\n",1])", R"(["a",1])"},
      {"EscapedControlCharacterIsWrittenRaw", R"("\u0001")", "\"\x01\""},
      {"BytesAreNotChecked", "\"\xC0\xFF\x7F\"", "\"\xC0\xFF\x7F\""},
      {"SameNameElsewhere", R"([{"a":1},{"a":{"a":2}}])", R"([{"a":1},{"a":{"a":2}}])"},
  };
  for (const auto &c : cases) EXPECT_EQ(through(c.text), c.compact) << c.name;
}

TEST_F(Json, RefusesWhatIsNoDocument) {
  std::vector<std::string> texts = words(
      R"({"a":1,"b":2,"a":3} {"a":1,"\u0061":2} "\x41" "\U0041" "\u004" "\uDC00" "\uD800" )"
      R"("\uD800\uD800" "\uD800\n" "\u0000\q" {"a":"b {"a":1 [1,[2] {"a":[1}} } [1,] {"a":1,} )"
      R"([,1] {"a"1} {"a":} {1:2} {'a':1} [/**/1] nul True "a\ "\)");
  for (const char *text :
       {"", " \n", "[1 2]", "\"a\x1F\"", "\"0123456789abcdef\n\"", "\xC2\xA0{}"}) {
    texts.push_back(text);
  }
  for (const std::string &text : texts) {
    EXPECT_EQ(through(text), "NULL") << text;
    EXPECT_EQ(through("[" + text), "NULL") << text;
  }
  EXPECT_EQ(json_parse_string(nullptr), nullptr);
}

// A list that stays its text is written like the tree that is read from it.
TEST_F(Json, KeepsTexts) {
  const std::string deep = std::string(20, '[') + std::string(20, ']');
  for (const std::string &text :
       {std::string("[]"), std::string(R"([1,"a,b",{"c":[2,3]}])"), deep, "[" + deep + "]",
        std::string("[0.000000]"), std::string("[\"\x01\"]"), std::string("[1"),
        std::string("{}")}) {
    const json_ptr kept(json_value_init_verbatim(text.c_str(), json_look_through(text.c_str()))),
        read = parse(text);
    EXPECT_EQ(compact(kept.get()), compact(read.get())) << text;
    EXPECT_EQ(json_value_count_elements(kept.get()), json_value_count_elements(read.get()));
    EXPECT_EQ(compact(json_ptr(json_value_deep_copy(kept.get())).get()), compact(read.get()));
  }
}

TEST_F(Json, ASliceAnswersAsTheElementThatItIs) {
  const std::string text =
      R"(["a",{"a":"x"},{"b":{"a":"x"},"a":"\/\"\\\n"},{"b":"a","c":[{"a":"x"}]},{"a":["x"]},{}])";
  const json_ptr kept(json_value_init_slices(text.c_str(), json_look_through(text.c_str()))),
      read = parse(text);
  for (const char *wanted : {"x", "/\"\\\n", "xy", "", static_cast<const char *>(nullptr)}) {
    for (size_t i = 0; i < 6; ++i) {
      EXPECT_EQ(json_array_match(json_value_get_array(kept.get()), i, "a", wanted),
                json_array_match(json_value_get_array(read.get()), i, "a", wanted))
          << i << (wanted ? wanted : " NULL");
    }
  }
  EXPECT_EQ(json_array_match(json_value_get_array(kept.get()), 2, "a", "/\"\\\n"), kJsonSameText);
  EXPECT_EQ(json_array_match(json_value_get_array(kept.get()), 3, "a", "x"), kJsonNoText);
}

TEST_F(Json, ParsesNumbers) {
  for (const std::string &c :
       words("0=0 -0=0 3735879681=3735879681 -12=-12 0.5=0.500000 -.5=-0.500000 1.=1 1e2=100 "
             "25E-1=2.500000 1.5e+3=1500 123456789012.125=123456789012.125000 1e-400=0 "
             "0.00000000000000000000000000001e30=10 "
             "10000000000000000000000=10000000000000000000000.000000 "
             "0.1e-99999999999999999999=0 1e23=99999999999999991611392.000000 "
             "9007199254740993=9007199254740992 9007199254740993.0000000001=9007199254740994")) {
    const std::string text = c.substr(0, c.find('='));
    EXPECT_EQ(through("[" + text + "]"), "[" + c.substr(text.size() + 1) + "]") << text;
  }
  for (const std::string &text :
       words("01 -01 0e5 0x10 -0X1 1x - -inf -nan +1 .5 1e 1.2.3 1e309 1e99999999999999999999")) {
    EXPECT_EQ(through("[" + text + "]"), "NULL") << text;
  }
}

// printf is the second opinion.
TEST_F(Json, WritesNumbersAsPrintfDoes) {
  std::vector<double> numbers = {
      0x1p63, -0x1p63, 0x1p64,    1e22,      1e300,  1.7976931348623157e308,
      0.5,    -0.5,    1.0000005, 0.9999995, 5e-324, 0.9999996,
      2.5e-7, 5e-7,    1.5e-6,    -1e-9,     1e-300, 4503599627370495.5};
  std::mt19937_64 random(2);
  for (int i = 0; i < 2000; ++i) {
    const double mantissa = static_cast<double>(random()) - 0x1p63;
    numbers.push_back(std::ldexp(mantissa, -static_cast<int>(random() % 100)));
  }
  const json_ptr value(json_value_init_object());
  for (const double number : numbers) {
    char expected[400];
    const bool integral = std::trunc(number) == number && number >= -0x1p63 && number < 0x1p63;
    snprintf(expected, sizeof expected, integral ? "{\"n\":%.0f}" : "{\"n\":%f}", number);
    ASSERT_EQ(json_object_set_number(json_value_get_object(value.get()), "n", number), JSONSuccess);
    EXPECT_EQ(compact(value.get()), expected);
  }
}

TEST_F(Json, PrettyPutsOneMemberOnALine) {
  const json_ptr value = parse(R"({"a":{},"b":[1,[],["x/"]],"c":{"d":"e"}})");
  EXPECT_STREQ(
      json_text(json_serialize_to_string_pretty(value.get())).get(),
      "{\n    \"a\": {},\n    \"b\": [\n        1,\n        [],\n        [\n"
      "            \"x\\/\"\n        ]\n    ],\n    \"c\": {\n        \"d\": \"e\"\n    }\n}");
}

TEST_F(Json, Limits) {
  const auto nested = [](size_t n) { return std::string(n, '[') + std::string(n, ']'); };
  EXPECT_EQ(through(nested(20)), nested(20));
  EXPECT_EQ(through(nested(21)), "NULL");
  EXPECT_EQ(through(std::string(20, '[') + "1" + std::string(20, ']')), "NULL");

  std::string members = "{\"0\":0";
  for (int i = 1; i < 960; ++i) members += ",\"" + std::to_string(i) + "\":0";
  EXPECT_EQ(through(members + ",\"x\":0}"), "NULL");
  const json_ptr full_object = parse(members + "}");
  JSON_Object *object = json_value_get_object(full_object.get());
  EXPECT_EQ(json_object_set_number(object, "x", 1), JSONFailure);
  EXPECT_EQ(json_object_set_number(object, "959", 0), JSONSuccess);
  EXPECT_EQ(compact(full_object.get()), members + "}");

  const tee::test::InsideTa roomy(device, {.data_size = 32u << 20});  // for so many elements
  std::string elements = "[0";
  for (int i = 1; i < 122880; ++i) elements += ",0";
  EXPECT_EQ(through(elements + ",0]"), "NULL");
  const json_ptr full_array = parse(elements + "]");
  JSON_Array *array = json_value_get_array(full_array.get());
  EXPECT_EQ(json_array_append_string(array, "x"), JSONFailure);
  EXPECT_EQ(json_array_append_value(array, full_object.get()), JSONFailure);
  EXPECT_EQ(json_array_remove(array, 0), JSONSuccess);
  EXPECT_EQ(json_array_append_string(array, "x"), JSONSuccess);
}

TEST_F(Json, ReplacedMembersKeepTheirPlace) {
  const json_ptr value = parse(R"({"b":"text","a":2,"c":[]})");
  JSON_Object *object = json_value_get_object(value.get());
  EXPECT_EQ(json_object_set_string(object, "b", json_object_get_string(object, "b")),
            JSONSuccess);  // a value replaced by its own text
  EXPECT_EQ(json_object_set_string(object, "c", "\x01/"), JSONSuccess);
  EXPECT_EQ(compact(value.get()), "{\"b\":\"text\",\"a\":2,\"c\":\"\x01\\/\"}");
  for (const char *name : {"b", "a", "d"}) {
    json_ptr list = parse("[{}]");
    EXPECT_EQ(json_object_set_value(object, name, list.get()), JSONSuccess);
    EXPECT_EQ(json_object_get_value(object, name), list.release());
  }
  EXPECT_EQ(compact(value.get()), "{\"b\":[{}],\"a\":[{}],\"c\":\"\x01\\/\",\"d\":[{}]}");
}

TEST_F(Json, LastElementTakesThePlaceOfARemovedOne) {
  const char *const kAfter[] = {"[3,1,2,\"T\"]", "[0,3,2,\"T\"]", "[0,1,3,\"T\"]", "[0,1,2,\"T\"]"};
  for (size_t index = 0; index < 4; ++index) {
    const json_ptr value = parse("[0,1,2,3]");
    JSON_Array *array = json_value_get_array(value.get());
    (void)json_array_get_string(array, 3);  // the walk must not end in what is removed
    EXPECT_EQ(json_array_remove(array, index), JSONSuccess);
    EXPECT_EQ(json_array_remove(array, 3), JSONFailure);
    EXPECT_EQ(json_array_append_string(array, "T"), JSONSuccess);
    EXPECT_EQ(compact(value.get()), kAfter[index]);
    EXPECT_STREQ(json_array_get_string(array, 3), "T");
    EXPECT_EQ(json_array_get_string(array, 4), nullptr);
  }
}

TEST_F(Json, ViewsAreNullForAnotherTypeAndForNull) {
  const json_ptr value = parse(R"({"s":"","n":1,"o":{},"a":["x",{}]})");
  JSON_Object *object = json_value_get_object(value.get());
  JSON_Array *array = json_object_get_array(object, "a");
  EXPECT_STREQ(json_object_get_string(object, "s"), "");
  for (const char *name : {"n", "o", "a", "missing", ""}) {
    EXPECT_EQ(json_object_get_string(object, name), nullptr) << name;
  }
  EXPECT_EQ(json_object_get_object(object, "a"), nullptr);
  EXPECT_EQ(json_object_get_array(object, "o"), nullptr);
  EXPECT_EQ(json_value_get_array(value.get()), nullptr);
  EXPECT_NE(json_array_get_object(array, 1), nullptr);
  EXPECT_EQ(json_array_get_object(array, 0), nullptr);
  EXPECT_EQ(json_array_get_string(array, 1), nullptr);
  EXPECT_EQ(json_value_get_object(nullptr), nullptr);
  EXPECT_EQ(json_object_get_value(nullptr, "a"), nullptr);
  EXPECT_EQ(json_array_get_count(nullptr), 0u);
  EXPECT_EQ(json_array_get_object(nullptr, 0), nullptr);
}

TEST_F(Json, EditsRefuseWhatIsNoValue) {
  const json_ptr value(json_value_init_object());
  JSON_Object *object = json_value_get_object(value.get());
  EXPECT_EQ(json_object_set_string(nullptr, "a", "b"), JSONFailure);
  EXPECT_EQ(json_object_set_string(object, nullptr, "b"), JSONFailure);
  EXPECT_EQ(json_object_set_string(object, "a", nullptr), JSONFailure);
  EXPECT_EQ(json_object_set_string(object, "a", "\xFF"), JSONFailure);
  EXPECT_EQ(json_object_set_value(object, "a", nullptr), JSONFailure);
  EXPECT_EQ(json_object_set_number(object, "a", std::nan("")), JSONFailure);
  EXPECT_EQ(json_object_set_number(object, "a", -HUGE_VAL), JSONFailure);
  EXPECT_EQ(json_array_append_value(nullptr, value.get()), JSONFailure);
  EXPECT_EQ(compact(value.get()), "{}");
}

TEST_F(Json, StringsThatAreSetMustBeUtf8) {
  const json_ptr list(json_value_init_array());
  const auto append = [array = json_value_get_array(list.get())](const std::string &text) {
    return json_array_append_string(array, text.c_str());
  };
  // The first and the last of each length.
  for (const std::string &text : words("longer_than_eight \x01\x7F \xC2\x80\xDF\xBF "
                                       "\xE0\xA0\x80\xED\x9F\xBF\xEE\x80\x80\xEF\xBF\xBF "
                                       "\xF0\x90\x80\x80\xF4\x8F\xBF\xBF")) {
    EXPECT_EQ(append(text), JSONSuccess) << text;
  }
  const std::string before = compact(list.get());
  // Stray, overlong, surrogates, beyond U+10FFFF, cut.
  for (const std::string &text : words("\x80 12345678\xC1\xBF \xE0\x9F\xBF \xF0\x8F\xBF\xBF "
                                       "\xED\xA0\x80 \xF4\x90\x80\x80 \xF5\x80\x80\x80 "
                                       "\xC2 \xE2\x82 \xF0\x9F\x98 \xE2\x28\xA1")) {
    EXPECT_EQ(append(text), JSONFailure) << text;
  }
  EXPECT_EQ(compact(list.get()), before);
}

TEST_F(Json, ValueBelongsToOneDocumentAndKeepsItsAddress) {
  const json_ptr root(json_value_init_array());
  JSON_Array *list = json_value_get_array(root.get());
  JSON_Value *value = parse(R"({"a":["x"]})").release();
  JSON_Object *object = json_value_get_object(value);
  EXPECT_EQ(json_array_append_value(list, json_object_get_value(object, "a")), JSONFailure);
  ASSERT_EQ(json_array_append_value(list, value), JSONSuccess);
  EXPECT_EQ(json_array_append_value(list, value), JSONFailure);
  EXPECT_EQ(json_array_get_object(list, 0), object);
  json_value_free(value);  // a part of a document is freed only with it

  // No tree is hung into itself, however deep.
  EXPECT_EQ(json_array_append_value(list, root.get()), JSONFailure);
  EXPECT_EQ(json_object_set_value(object, "self", root.get()), JSONFailure);
  EXPECT_EQ(compact(root.get()), R"([{"a":["x"]}])");
}

TEST_F(Json, CopiesAPartAsADocumentOfItsOwn) {
  json_ptr value = parse(R"({"a":{"\u0061\u0062":[1,true,"\u0041\u0042",{"c":[]}],"n":-0.5}})");
  const json_ptr copy(
      json_value_deep_copy(json_object_get_value(json_value_get_object(value.get()), "a")));
  value.reset();
  EXPECT_EQ(compact(copy.get()), R"({"ab":[1,true,"AB",{"c":[]}],"n":-0.500000})");
}

TEST_F(Json, StringThatCannotMoveWhenItShrinksIsRefused) {
  device.fail({}, tee::test::Fault::kAllocation, 2);
  EXPECT_EQ(through(R"(["\u0041\u0042"])"), "NULL");
  EXPECT_TRUE(device.fault_report().fired);
}

}  // namespace
}  // namespace otrp_test
