// SPDX-License-Identifier: GPL-2.0-or-later
#include <gtest/gtest.h>
#include <json/json.h>

#include <memory>

#include "base/utf8.h"
#include "state/event_codes.h"
#include "state/json_text.h"
#include "state/queue_writer.h"

namespace fileindexd {
namespace {

Json::Value Parse(const std::string& text) {
  const Json::CharReaderBuilder builder;
  const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
  Json::Value value;
  std::string errors;
  EXPECT_TRUE(reader->parse(text.data(), text.data() + text.size(), &value, &errors)) << errors;
  return value;
}

TEST(JsonTextTest, EveryByteComesBackAsItWas) {
  for (int byte = 0; byte < 256; ++byte) {
    const std::string bytes = {'a', static_cast<char>(byte), 'b'};

    const std::string text = JsonText(bytes);

    EXPECT_EQ(Parse("[" + text + "]")[0].asString(), bytes) << byte;
    for (const char c : text) {
      EXPECT_FALSE(static_cast<unsigned char>(c) < 0x20 || c == 0x7f) << byte;
    }
  }
}

TEST(JsonTextTest, EscapesOnlyWhatMustBe) {
  EXPECT_EQ(JsonText("a\"b\\c\n/\x7f\xff\xc3\xa4"), "\"a\\\"b\\\\c\\u000a/\\u007f\xff\xc3\xa4\"");
  EXPECT_EQ(JsonText(""), "\"\"");
}

TEST(EventLineTest, HoldsWhatIsGivenAndNothingElse) {
  EXPECT_EQ(EventLine(8, "/s/a"), R"({"event":8,"path":"/s/a"})");
  EXPECT_EQ(EventLine(256, "/s/b", "/s/a"), R"({"event":256,"path":"/s/b","path_old":"/s/a"})");
  EXPECT_EQ(EventLine(65536, "/s", std::nullopt, "{\"x\":1}"),
            R"({"event":65536,"path":"/s","data":{"x":1}})");
}

TEST(EventLineTest, DataOnSeveralLinesBecomesOne) {
  const std::string line = EventLine(2, "/s", std::nullopt, "{\r\n \"x\": 1\n}");

  EXPECT_EQ(line.find_first_of("\r\n"), std::string::npos);
  EXPECT_EQ(Parse(line)["data"]["x"].asInt(), 1);
}

TEST(EventCodeTest, NamesAndNumbers) {
  EXPECT_EQ(EventCode("QLIB_NOTIFY_CLOSE_WRITE"), 8U);
  EXPECT_EQ(EventCode("CUSTOM_EVENT_REINDEX"), 65536U);
  EXPECT_EQ(EventCode("0x20000"), CUSTOM_EVENT_UPDATE);
  EXPECT_EQ(EventCode("128"), QLIB_NOTIFY_DELETE);
  EXPECT_EQ(EventCode("4294967295"), 4294967295U);
}

TEST(EventCodeTest, AnythingElseIsNone) {
  for (const char* bad : {"", " 8", "8 ", "-8", "+8", "8x", "0x", "0xg", "x8", "1.5", "4294967296",
                          "0x100000000", "close_write", "QLIB_NOTIFY", "QLIB_NOTIFY_MODIFYX"}) {
    EXPECT_EQ(EventCode(bad), std::nullopt) << bad;
  }
}

TEST(Utf8Test, WellFormedTextStaysAsItIs) {
  for (const char* good : {"", "plain", "\xc3\xa4", "\xe2\x82\xac", "\xf0\x9f\x98\x80",
                           "\xed\x9f\xbf", "\xf4\x8f\xbf\xbf"}) {
    EXPECT_TRUE(IsUtf8(good)) << good;
    EXPECT_EQ(ToUtf8(good), good);
  }
  const std::string with_zero("a\0b", 3);
  EXPECT_TRUE(IsUtf8(with_zero));
  EXPECT_EQ(ToUtf8(with_zero), with_zero);
}

TEST(Utf8Test, EachByteThatIsNotPartOfACharacterIsReplaced) {
  const std::string r = "\xef\xbf\xbd";
  const struct {
    std::string bytes;
    std::string text;
  } rows[] = {
      {"\x80", r},
      {"a\xff"
       "b",
       "a" + r + "b"},
      {"\xc0\xaf", r + r},          // overlong
      {"\xe0\x80\xaf", r + r + r},  // overlong
      {"\xf0\x80\x80\xaf", r + r + r + r},
      {"\xed\xa0\x80", r + r + r},          // a surrogate
      {"\xf4\x90\x80\x80", r + r + r + r},  // above the last one
      {"\xf5", r},
      {"\xe2\x82", r + r},  // cut short
      {"\xe2\x82x", r + r + "x"},
      {"\xc3\xa4\xc3", "\xc3\xa4" + r},
  };
  for (const auto& row : rows) {
    EXPECT_FALSE(IsUtf8(row.bytes));
    EXPECT_EQ(ToUtf8(row.bytes), row.text);
  }
}

}  // namespace
}  // namespace fileindexd
