// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/json.h"

#include <gtest/gtest.h>

namespace fileindexd {
namespace {

using std::string_literals::operator""s;

std::string Nested(size_t depth) {
  return std::string(depth, '[') + std::string(depth, ']');
}

// What a text reads as, written out again; "refused" otherwise.
std::string Read(const std::string& text) {
  Json::Value value;
  return value.fromString(text) ? value.toString() : "refused";
}

TEST(JsonReaderTest, ReadsOneValueOfAnyKindWithWhiteSpaceAround) {
  const struct {
    std::string text;
    std::string read;
  } TABLE[] = {
      {"{}", "{}"},
      {" \t\r\n{}\r\n ", "{}"},
      {"[1,true,null]", "[1,true,null]"},
      {"\"text\"", "\"text\""},
      {"null", "null"},
      {"true", "true"},
      {"-0", "0"},
      {"1e5", "100000.0"},
      {"-10.50E+01", "-105.0"},
      {"[0,-1,0.5,5e-1,0]", "[0,-1,0.5,0.5,0]"},
      {"\"01 +1 1. -\"", "\"01 +1 1. -\""},
      {"18446744073709551615", "18446744073709551615"},
      {"{\"a\":1,\"a\":2}", "{\"a\":2}"},
      {"\"\\u0041\\/\"", "\"A/\""},
      {"{\"a\":\"\xff\"}", "{\"a\":\"\xff\"}"},
      {"\"\xc3\xa4\"", "\"\xc3\xa4\""},
      {"{\"type\":\"resume\",\"data\":{}}", "{\"data\":{},\"type\":\"resume\"}"},
      {Nested(1000), Nested(1000)},
  };
  for (const auto& row : TABLE) {
    EXPECT_EQ(Read(row.text), row.read) << row.text.substr(0, 40);
  }
}

TEST(JsonReaderTest, TakesSomeTextsThatAreNoJson) {
  const struct {
    std::string text;
    std::string read;
  } TABLE[] = {
      {"\"a\nb\"", "\"a\\nb\""},
      {"\"a\tb\"", "\"a\\tb\""},
      {"\"a\0b\""s, "\"a\\u0000b\""},
      {"18446744073709551616", "1.8446744073709552e+19"},
  };
  for (const auto& row : TABLE) {
    EXPECT_EQ(Read(row.text), row.read) << row.text;
  }
}

TEST(JsonReaderTest, RefusesAllElseAndKeepsTheValue) {
  const std::string TEXTS[] = {
      "",
      "  ",
      "{}x",
      "{} {}",
      "{}}",
      "{},",
      "{}#",
      "[1]]",
      "\0{}"s,
      "{}\0"s,
      "{}\0x"s,
      "\v{}",
      "\f{}",
      "\xef\xbb\xbf{}",
      "// c\n{}",
      "/**/{}",
      "{/*c*/}",
      "{\"event\":64/*c*/}",
      "[1/*c*/]",
      "{\"a\":1 //c\n}",
      "{\"\":1,}",
      "{}//c",
      "{\"a\":1,}",
      "[1,]",
      "[,]",
      "[1,,2]",
      "[1 2]",
      "{,}",
      "{\"a\" 1}",
      "{\"a\":}",
      "{\"a\"",
      "{\"a\":1 \"b\":2}",
      "{\"a\":1;}",
      "{a:1}",
      "{'a':1}",
      "{1:2}",
      "[",
      "]",
      "{",
      "}",
      ".5",
      "--1",
      "1e",
      "1e+",
      "1e999",
      "1.5.5",
      "1-2",
      "0x10",
      "1_000",
      "01",
      "-01",
      "00",
      "+1",
      "-",
      "1.",
      "1.e5",
      "-.5",
      "1+2",
      "[01]",
      "[1.,2]",
      "{\"event\":08}",
      "NaN",
      "Infinity",
      "-Infinity",
      "{\"a\":NaN}",
      "nul",
      "True",
      "tru e",
      "'a'",
      "\"a",
      "\"a\"\"b\"",
      "\"\\x41\"",
      "\"\\a\"",
      "\"\\u12\"",
      "\"\\ud800\"",
      Nested(1001),
      Nested(100000),
      std::string(100000, '['),
  };
  for (const std::string& text : TEXTS) {
    Json::Value value("before");
    EXPECT_FALSE(value.fromString(text)) << text.substr(0, 40);
    EXPECT_EQ(value.toString(), "\"before\"") << text.substr(0, 40);
  }
}

TEST(JsonReaderTest, AFailureLeavesNothingForTheNextText) {
  Json::Value value;
  EXPECT_FALSE(value.fromString("{\"a\":[1,"));
  EXPECT_TRUE(value.fromString("{\"b\":2}"));
  EXPECT_EQ(value.toString(), "{\"b\":2}");
}

TEST(JsonWriterTest, WritesOneLineWithoutNewline) {
  Json::Value value(Json::objectValue);
  value["b"] = "line\nline";
  value["a"] = Json::Value(Json::nullValue);

  EXPECT_EQ(value.toString(), "{\"a\":null,\"b\":\"line\\nline\"}");
}

TEST(JsonValueTest, ReadersThrowWhereAMemberIsNoneOfTheirKind) {
  Json::Value object;
  ASSERT_TRUE(object.fromString(R"({"o":{},"a":[],"s":"text","n":-1})"));

  EXPECT_THROW((void)object["o"].asString(), std::exception);
  EXPECT_THROW((void)object["a"].asString(), std::exception);
  EXPECT_THROW((void)object["s"].asInt64(), std::exception);
  EXPECT_THROW((void)object["n"].asUInt(), std::exception);
  EXPECT_THROW((void)object["s"].isMember("x"), std::exception);
  EXPECT_THROW((void)object["a"].get("x", 0), std::exception);
  EXPECT_EQ(object["n"].asString(), "-1");
  EXPECT_EQ(object.get("missing", "default").asString(), "default");
}

}  // namespace
}  // namespace fileindexd
