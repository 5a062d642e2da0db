// SPDX-License-Identifier: GPL-2.0-or-later
// What was packed and cut before the writer gets it.
#include "index/prepared_content.h"

#include "tests/unit/index/contents_fixture.h"

namespace fileindexd {

class PreparedContentTest : public ContentsTest {
 protected:
  static PreparedContent Prepared(const std::string& text, const std::string& language = "") {
    Content content = TextContent(text);
    content.texts = {{ContentField::TITLE, "a title"}};
    content.numbers = {{ContentField::YEAR, 1987}};
    PreparedContent prepared = content;
    ContentPreparer(language).Prepare(prepared);
    return prepared;
  }
  void FinishPrepared(const std::string& name, const PreparedContent& prepared) {
    ASSERT_TRUE(contents->Finish(JobOf(name).file, prepared));
    ASSERT_TRUE(contents->Commit());
  }
};

TEST_F(PreparedContentTest, ItIsKeptAsWhatTheWriterPreparesItself) {
  const std::string text = "two connections of fooBar_1";
  PreparedContent plain = Prepared(text);
  const PreparedContent prepared = plain;
  EXPECT_FALSE(prepared.cut_text.empty());
  plain = PreparedContent(plain.content);
  File("a.txt");
  File("b.txt");
  Jobs();

  FinishPrepared("a.txt", prepared);
  FinishPrepared("b.txt", plain);

  for (const char* word : {"two", "connections", "connection", "foobar", "bar", "title", "1987"}) {
    EXPECT_EQ(Holding(word), 2) << word;
  }
  EXPECT_EQ(Holding("two connections of"), 2);
  EXPECT_EQ(Number("SELECT count(DISTINCT packed) FROM texts"), 1);
  EXPECT_EQ(Number("SELECT count(DISTINCT length) FROM files"), 1);
}

TEST_F(PreparedContentTest, AllItsWordsGoWithIt) {
  File("a.txt");
  Jobs();
  FinishPrepared("a.txt", Prepared("two connections of fooBar_1"));

  File("a.txt", "other bytes");

  for (const char* word : {"two", "connections", "connection", "foobar", "bar", "title", "1987"}) {
    EXPECT_EQ(Holding(word), 0) << word;
  }
}

TEST_F(PreparedContentTest, WordsThatWereCutForAnotherLanguageAreCutAnew) {
  File("a.txt");
  Jobs();
  FinishPrepared("a.txt", Prepared("walking", "german"));

  EXPECT_EQ(Holding("walked"), 1);
}

TEST_F(PreparedContentTest, WhatIsPreparedIsNotMadeAgain) {
  PreparedContent prepared = Prepared("a few words that were prepared");
  prepared.content.text = "others";
  File("a.txt");
  Jobs();
  FinishPrepared("a.txt", prepared);

  EXPECT_EQ(Holding("prepared"), 1);
  EXPECT_EQ(Holding("others"), 0);
  EXPECT_EQ(Number("SELECT length(packed) FROM texts"),
            static_cast<int64_t>(prepared.packed.size()));
}

TEST_F(PreparedContentTest, NothingIsMadeOfNothing) {
  PreparedContent prepared;
  ContentPreparer("").Prepare(prepared);

  EXPECT_TRUE(prepared.packed.empty());
  EXPECT_TRUE(prepared.cut_text.empty());
}

}  // namespace fileindexd
