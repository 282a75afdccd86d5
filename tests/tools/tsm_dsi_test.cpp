// SPDX-License-Identifier: BSD-2-Clause
#include <gtest/gtest.h>

#include "tsm/protocol/dsi.h"
#include "tsm_fake_device.h"

namespace tsm {
namespace {

TEST(DeviceJson, IsWrittenAsTheDeviceWritesIt) {
  const std::pair<const char *, const char *> kCases[] = {
      {R"({ "b":1, "a":[ ], "c":{ } })", R"({"b":1,"a":[],"c":{}})"},
      {R"("a/b\"\\\b\f\n\r\t")", R"("a\/b\"\\\b\f\n\r\t")"},
      {"\"\x01\\u001f\"", "\"\x01\x1f\""},
      {R"("\u00e9\ud83d\ude00")", "\"\xC3\xA9\xF0\x9F\x98\x80\""},
      {R"({"a/b":null})", R"({"a\/b":null})"},
      {"[3735879681,0,-1,3.0,0.5,true]", "[3735879681,0,-1,3,0.500000,true]"},
      {"[18446744073709551615,1e2,12E1]", "[18446744073709551615,100,120]"},
      {"\t{ \"a\" : 1 , \"b\":\n2,\"a\":[false]}\r", R"({"a":[false],"b":2})"},
  };
  for (const auto &[in, out] : kCases) {
    const std::optional<Json> value = parse_json(in);
    ASSERT_TRUE(value) << in;
    EXPECT_EQ(serialize_as_device(*value), out);
    EXPECT_EQ(parse_json(out), value);
  }
  for (const std::string &text :
       {std::string("{"), std::string("{}x"), std::string(), std::string("\"\xFF\""),
        std::string(100000, '['), "[" + std::string(64, '[') + std::string(65, ']'),
        std::string("[1,]"), std::string("[,1]"), std::string("[1 2]"), std::string("[01]"),
        std::string("[truefalse]"), std::string("{,}"), std::string(R"({"a":1,})"),
        std::string(R"({"a" 1})"), std::string("{1:1}"), std::string("\v1")}) {
    EXPECT_FALSE(parse_json(text)) << text.substr(0, 10);
  }
}

TEST(DeviceJson, IsWrittenAsTheLibraryWritesIt) {
  for (const char *text : {R"({"a":[1,-2,1.5,null,true,{}],"b":[]})", R"(["","x\"y\\","\n\u0001"])",
                           "[\"\xC3\xA9~\x7F\"]"}) {
    EXPECT_EQ(compact(Json::parse(text)), text);
  }
  EXPECT_THROW((void)compact("\xFF"), Json::type_error);
}

TEST(DsiTree, ListsDomainsBelowTheirProviders) {
  Json document = test_dsi();
  document["dsi"]["tee"]["sdlist"]["sd"] = {
      {{"name", "one"}, {"spid", "sp"}, {"talist", {{{"taid", "t1"}}, {{"taid", "t\n2"}}}}},
      {{"name", "two"}, {"spid", "sp2"}, {"talist", Json::array()}},
      {{"name", "three"}, {"spid", "sp"}, {"talist", 7}}};
  EXPECT_EQ(dsi_tree(document), "|-- SP sp  AIK " + key_of(kAik).fingerprint() +
                                    "\n|   |-- SD one\n|   |   |-- TA t1\n|   |   `-- TA t\\x0a2\n"
                                    "|   `-- SD three\n`-- SP sp2  no AIK\n    `-- SD two\n");
  document["dsi"]["tee"]["sdlist"]["sd"] = document["dsi"]["tee"]["teeaiklist"] = Json::array();
  EXPECT_EQ(dsi_tree(document), "`-- no service providers\n");
}

}  // namespace
}  // namespace tsm
