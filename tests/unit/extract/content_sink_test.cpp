// SPDX-License-Identifier: GPL-2.0-or-later
#include <gtest/gtest.h>

#include <string>

#include "extract/format.h"

namespace fileindexd {

namespace {

std::string Taken(std::string_view bytes, size_t cap = 1000) {
  ContentSink sink(cap);
  sink.AddText(bytes);
  return sink.content.text;
}

std::string TextOf(const ContentSink& sink, ContentField field) {
  for (const TextField& text : sink.content.texts) {
    if (text.field == field) {
      return text.text;
    }
  }
  return "";
}

TEST(ContentSinkTest, BlanksOfEverySortBecomeOneSpace) {
  EXPECT_EQ(Taken("  a\t\r\n b\xC2\xA0\xE3\x80\x80"
                  "c \x01\x7F d  "),
            "a b c d");
  EXPECT_EQ(Taken(""), "");
  EXPECT_EQ(Taken(" \n "), "");
}

TEST(ContentSinkTest, BytesThatAreNoUtf8BecomeBlanks) {
  EXPECT_EQ(Taken("a\xFF\xFE"
                  "b\xED\xA0\x80"
                  "c\xC0\xAF"
                  "d"),
            "a b c d");
}

TEST(ContentSinkTest, WordsGoOnFromOneCallToTheNext) {
  ContentSink sink(100);
  for (const char* part : {"gr", "\xC3", "\xBC", "n ", " ", "blau", "\xE2", "\x82", "z"}) {
    sink.AddText(part);
  }
  EXPECT_EQ(sink.content.text, "gr\xC3\xBCn blau z");
}

TEST(ContentSinkTest, TheWordThatTheCapCutsIsLeftOut) {
  EXPECT_EQ(Taken("one two three", 9), "one two");
  EXPECT_EQ(Taken("one two three", 7), "one two");
  EXPECT_EQ(Taken("one two three", 13), "one two three");
}

TEST(ContentSinkTest, AWordWithoutEndIsCutBetweenCharacters) {
  std::string endless;
  while (endless.size() < 900) {
    endless += "\xE4\xB8\xAD";
  }
  EXPECT_EQ(Taken("a " + endless, 600), "a " + endless.substr(0, 597));
}

TEST(ContentSinkTest, ItIsFullOnlyWhenSomethingWasLeftOut) {
  ContentSink sink(3);
  sink.AddText("abc  \n");
  EXPECT_FALSE(sink.IsFull());
  sink.AddText("d");
  EXPECT_TRUE(sink.IsFull());
  sink.AddText(" e");
  EXPECT_EQ(sink.content.text, "abc");
}

// Whatever was tried in between, it goes on as if it had not been.
TEST(ContentSinkTest, WhatWasTriedInVainIsForgotten) {
  for (const char* before :
       {"", "one two", "one two ", "one tw\xC3", "one two three four five six"}) {
    for (const char* tried :
         {"", "o", " other words", "\xC3", "longer than the cap takes by far"}) {
      ContentSink plain(24);
      ContentSink sink(24);
      for (ContentSink* each : {&plain, &sink}) {
        each->SetKind(Kind::DOCUMENT);
        each->Set(ContentField::KEYWORDS, "sea");
        each->AddText(before);
      }
      ContentSink::Mark mark = sink.Here();
      sink.SetKind(Kind::PHOTO);
      sink.Set(ContentField::KEYWORDS, "side");
      sink.Set(ContentField::TITLE, "a title");
      sink.Set(ContentField::YEAR, 1970);
      sink.AddText(tried);
      sink.converter = "catdoc";
      sink.ReturnTo(std::move(mark));
      for (ContentSink* each : {&plain, &sink}) {
        each->AddText("\xA9 end");
      }
      EXPECT_EQ(sink.content.text, plain.content.text) << before << "|" << tried;
      EXPECT_EQ(sink.IsFull(), plain.IsFull()) << before << "|" << tried;
      EXPECT_EQ(sink.content.kind, Kind::DOCUMENT);
      EXPECT_EQ(TextOf(sink, ContentField::KEYWORDS), "sea");
      EXPECT_EQ(sink.content.texts.size(), 1u);
      EXPECT_TRUE(sink.content.numbers.empty());
      EXPECT_EQ(sink.converter, "");
    }
  }
}

TEST(ContentSinkTest, TheFirstValueOfAFieldStays) {
  ContentSink sink(10);
  sink.Set(ContentField::TITLE, "  \n ");
  sink.Set(ContentField::TITLE, " The\r\n title\xFF ");
  sink.Set(ContentField::TITLE, "another");
  sink.Set(ContentField::YEAR, 0);
  sink.Set(ContentField::YEAR, 1969);
  sink.Set(ContentField::YEAR, 1970);
  EXPECT_EQ(TextOf(sink, ContentField::TITLE), "The title");
  ASSERT_EQ(sink.content.numbers.size(), 1u);
  EXPECT_EQ(sink.content.numbers[0].number, 1969);
}

TEST(ContentSinkTest, ListsGatherWhatTheyDoNotHold) {
  ContentSink sink(10);
  for (const char* word : {"sea", "seaside", "sea", "a", "side"}) {
    sink.Set(ContentField::KEYWORDS, word);
    sink.Set(ContentField::MEMBERS, word);
  }
  EXPECT_EQ(TextOf(sink, ContentField::KEYWORDS), "sea, seaside, a, side");
  EXPECT_EQ(TextOf(sink, ContentField::MEMBERS), "sea\nseaside\na\nside");
}

TEST(ContentSinkTest, FieldsAreBounded) {
  ContentSink sink(10);
  sink.Set(ContentField::SUBJECT, std::string(ContentSink::MAX_FIELD + 10, 'x'));
  for (int member = 0; member < 20'000; ++member) {
    sink.Set(ContentField::MEMBERS, "member" + std::to_string(member));
  }
  EXPECT_EQ(TextOf(sink, ContentField::SUBJECT).size(), ContentSink::MAX_FIELD);
  EXPECT_LE(TextOf(sink, ContentField::MEMBERS).size(), ContentSink::MAX_FIELD);
  EXPECT_GT(TextOf(sink, ContentField::MEMBERS).size(), ContentSink::MAX_FIELD - 100);
}

}  // namespace

}  // namespace fileindexd
