// SPDX-License-Identifier: GPL-2.0-or-later
// Words of contents: made anew from what is stored, and counted.
#include <unistd.h>

#include <algorithm>
#include <ctime>

#include "index/contents_reader.h"
#include "index/contents_schema.h"
#include "state/layout.h"
#include "state/sqlite.h"
#include "tests/unit/index/contents_fixture.h"

namespace fileindexd {

class ContentsWordsTest : public ContentsTest {
 protected:
  ContentCounts Counts() {
    ContentsReader reader;
    EXPECT_EQ(reader.Open("s"), IndexError::NONE);
    ContentCounts counts;
    EXPECT_TRUE(reader.Count(counts));
    return counts;
  }
  // Of words that are made anew; empty where none are.
  static std::string Progress(const char* language) {
    ContentsReader reader;
    std::optional<WordsProgress> words;
    EXPECT_EQ(reader.Open("s"), IndexError::NONE);
    EXPECT_TRUE(reader.FindWordsProgress(language, words));
    return !words ? ""
                  : words->language + " " + words->wanted + " " + std::to_string(words->done) +
                        " of " + std::to_string(words->total);
  }
  // With the contents closed.
  void Change(const char* sql) {
    contents.reset();
    IndexDatabase database;
    ASSERT_EQ(database.OpenForWriting(ContentsPath("s"), false, CONTENTS_FORM), IndexError::NONE);
    ASSERT_EQ(sqlite3_exec(database.db, sql, nullptr, nullptr, nullptr), SQLITE_OK)
        << sqlite3_errmsg(database.db);
  }
};

TEST_F(ContentsWordsTest, LanguageChangesSliceBySliceAndAllIsFoundMeanwhile) {
  std::string text;
  while (text.size() < 700000) {
    text += "houses ";
  }
  for (const char* name : {"a.txt", "b.txt", "c.txt", "d.txt"}) {
    File(name);
    Jobs();
    Finish(name, text + name);
  }
  ASSERT_TRUE(store->SetShareLanguage("s", "german")) << store->Error();
  OpenContents();
  EXPECT_EQ(Holding("houses"), 4);
  EXPECT_EQ(Progress("german"), "english german 0 of 4");

  bool more = false;
  ASSERT_TRUE(contents->TakeIn(100, more));
  ASSERT_TRUE(contents->Commit());
  EXPECT_TRUE(more);
  EXPECT_EQ(Holding("houses"), 4);
  EXPECT_EQ(Holding("house"), 4) << "as in the old language";
  EXPECT_EQ(Progress("german"), "english german 2 of 4");
  EXPECT_EQ(Progress("french"), "english french 0 of 4") << "what is done is of no use to it";
  WriteFile(At("new.txt"), "bytes");
  WriteFile(At("d.txt"), "other bytes");
  Add("new.txt");
  Add("d.txt");
  Commit();
  ASSERT_TRUE(contents->TakeIn(100, more));
  Jobs();
  Finish("new.txt", "fresh");
  EXPECT_EQ(Holding("fresh"), 1);
  Finish("d.txt", "anew");

  EXPECT_EQ(Holding("houses"), 3);
  TakeIn();
  EXPECT_EQ(Progress("german"), "");
  EXPECT_EQ(Holding("houses"), 3);
  EXPECT_EQ(Number("SELECT language = 'german' FROM meta"), 1);
  EXPECT_EQ(Holding("fresh"), 1);
  EXPECT_EQ(Holding("anew"), 1);
  EXPECT_EQ(Number("SELECT count(*) FROM texts"), 5);
  File("new.txt", "gone");
  EXPECT_EQ(Holding("fresh"), 0);
}

// They made them in the place of the old ones.
TEST_F(ContentsWordsTest, WordsThatOlderVersionsLeftInTheMakingAreMadeAndNothingIsLost) {
  for (const char* name : {"a.txt", "b.txt", "c.txt"}) {
    File(name);
    Jobs();
    Finish(name, "houses");
  }
  Change("INSERT INTO words(words) VALUES('delete-all'); UPDATE meta SET reworded = 0");
  for (int round = 0; round < 2; ++round) {  // and ended again
    OpenContents();
    File("a.txt", "bytes " + std::to_string(round));
    Jobs();
    Finish("a.txt", "huts");
    EXPECT_EQ(Number("SELECT count(*) FROM files WHERE text <> 0"), 3) << round;
  }
  TakeIn();

  EXPECT_EQ(Holding("houses"), 2);
  EXPECT_EQ(Holding("huts"), 1);
}

TEST_F(ContentsWordsTest, ALanguageThatIsTakenBackLeavesTheWordsAsTheyWere) {
  const std::string text(700000, ' ');
  for (const char* name : {"a.txt", "b.txt", "c.txt"}) {
    File(name);
    Jobs();
    Finish(name, "houses" + text + name);
  }
  for (const char* language : {"german", "french", "english"}) {
    bool more = false;
    ASSERT_TRUE(store->SetShareLanguage("s", language)) << store->Error();
    OpenContents();
    ASSERT_TRUE(contents->TakeIn(100, more));
    ASSERT_TRUE(contents->Commit());
    EXPECT_EQ(Holding("house"), 3) << language;
    File("b.txt", language);
    Jobs();
    Finish("b.txt", "houses");
  }
  TakeIn();

  EXPECT_EQ(Holding("house"), 3);
  EXPECT_EQ(Number("SELECT count(*) FROM sqlite_master WHERE name LIKE 'new_words%'"), 0);
  EXPECT_EQ(Number("SELECT count(*) FROM sqlite_master WHERE name LIKE 'old_words%'"), 0);
  EXPECT_EQ(Progress("english"), "");
}

TEST_F(ContentsWordsTest, WordsAreMadeAnewOnceForALanguageThatIsNotKnown) {
  File("a.txt");
  Read();
  for (const char* sql : {"UPDATE meta SET words_version = 'another'",
                          "UPDATE meta SET reworded = 0", "UPDATE meta SET language = 'klingon'"}) {
    Change(sql);
    OpenContents();
    TakeIn();
    EXPECT_EQ(Holding("txt"), 1) << sql;
  }

  ASSERT_TRUE(store->SetShareLanguage("s", "klingon")) << store->Error();
  OpenContents();
  TakeIn();
  OpenContents();
  EXPECT_EQ(Number("SELECT reworded = 9223372036854775807 FROM meta"), 1);
  EXPECT_EQ(Holding("txt"), 1);
}

TEST_F(ContentsWordsTest, ATableOfALanguageThatIsNotKnownIsMadeAnewFromTheTexts) {
  File("a.txt");
  Read();
  Change(
      "PRAGMA writable_schema = 1;"
      "UPDATE sqlite_master SET sql = replace(sql, 'english', 'klingon') WHERE name = 'words';"
      "UPDATE meta SET language = 'klingon'");

  for (int i = 0; i < 2; ++i) {
    OpenContents();
    TakeIn();
    EXPECT_EQ(Holding("txt"), 1);
    EXPECT_EQ(Jobs(), Names());
  }
  EXPECT_NE(access((ContentsPath("s") + ".damaged").c_str(), F_OK), 0);
  EXPECT_EQ(Number("SELECT count(*) FROM sqlite_master WHERE name = 'old_words'"), 0);
}

TEST_F(ContentsWordsTest, ContentsWithoutWordsAreDamaged) {
  File("a.txt");
  Read();
  Change("DROP TABLE words");

  OpenContents();
  TakeIn();

  EXPECT_EQ(Jobs(), Names({"a.txt"}));
  EXPECT_EQ(access((ContentsPath("s") + ".damaged").c_str(), F_OK), 0);
}

TEST_F(ContentsWordsTest, PlacesInATextTakeLessRoomThanThoseInAField) {
  constexpr int WORDS = 2000;
  std::string text;
  for (int word = 0; word < WORDS; ++word) {
    text += "w" + std::to_string(word) + " ";
  }
  File("field.pdf");
  File("text.pdf");
  Jobs();
  Content titled;
  titled.texts = {{ContentField::TITLE, text}};
  const auto size = [this] { return Number("SELECT sum(length(block)) FROM words_data"); };
  const int64_t none = size();
  ASSERT_TRUE(contents->Finish(JobOf("field.pdf").file, titled));
  ASSERT_TRUE(contents->Commit());
  const int64_t field = size() - none;

  Finish("text.pdf", text);

  EXPECT_LE(size() - none - field, field - 2 * WORDS);
}

TEST_F(ContentsWordsTest, OldWordsAreTakenAwaySliceBySlice) {
  std::string text;
  for (int word = 0; text.size() < 900000; ++word) {
    text += "w" + std::to_string(word * 7919) + " ";
  }
  for (const char* name : {"a.txt", "b.txt", "c.txt"}) {
    File(name);
    Jobs();
    Finish(name, text + name);
  }
  ASSERT_TRUE(store->SetShareLanguage("s", "german")) << store->Error();

  OpenContents();
  bool more = true;
  while (Number("SELECT count(*) FROM sqlite_master WHERE name = 'old_words'") == 0) {
    ASSERT_TRUE(contents->TakeIn(100, more)) << IndexErrorText(contents->Error());
    ASSERT_TRUE(contents->Commit());
    ASSERT_TRUE(more);
  }
  int64_t left = Number("SELECT count(*) FROM old_words_data");
  EXPECT_GT(left, 600);
  while (more) {
    ASSERT_TRUE(contents->TakeIn(100, more)) << IndexErrorText(contents->Error());
    ASSERT_TRUE(contents->Commit());
    const int64_t now = Number("SELECT count(*) FROM sqlite_master WHERE name = 'old_words'") == 0
                            ? 0
                            : Number("SELECT count(*) FROM old_words_data");
    EXPECT_GE(now, left - 512);
    left = std::max<int64_t>(now, 10);
  }
  EXPECT_EQ(Number("SELECT count(*) FROM sqlite_master WHERE name LIKE 'old_words%'"), 0);
  EXPECT_EQ(Holding("txt"), 3);
}

TEST_F(ContentsWordsTest, EachTableThatIsWantedNoMoreIsTakenAwayInSlices) {
  const auto left = [this] {
    return Number(
        "SELECT count(*) FROM sqlite_master WHERE name LIKE 'old_words%' AND sql LIKE "
        "'CREATE VIRTUAL%'");
  };
  File("a.txt");
  Read();
  for (const char* language : {"german", "english", "german", "french", "english"}) {
    ASSERT_TRUE(store->SetShareLanguage("s", language)) << store->Error();
    OpenContents();
  }
  EXPECT_EQ(left(), 3) << "none was dropped at once";

  bool more = true;
  for (int64_t before = 3; more; before = left()) {
    ASSERT_TRUE(contents->TakeIn(100, more)) << IndexErrorText(contents->Error());
    ASSERT_TRUE(contents->Commit());
    EXPECT_GE(left(), before - 1);
  }
  EXPECT_EQ(Number("SELECT count(*) FROM sqlite_master WHERE name LIKE 'old_words%'"), 0);
  EXPECT_EQ(Holding("txt"), 1);
}

TEST_F(ContentsWordsTest, ManyNewWordsAreMergedStepByStepIntoLessRoom) {
  std::string text;
  for (int word = 0; word < 600; ++word) {
    text += "w" + std::to_string(word * 7919) + " ";
  }
  const auto pieces = [this] {
    return Number("SELECT count(DISTINCT id >> 37) FROM words_data WHERE id > 10");
  };
  const auto used = [this] { return Number("SELECT sum(length(block)) FROM words_data"); };
  bool more = true;
  for (int file = 0; file < 300; ++file) {
    const std::string name = "f" + std::to_string(file) + ".txt";
    WriteFile(At(name), "bytes");
    Add(name);
    if (file == 250) {
      ASSERT_TRUE(contents->Merge(more));
      EXPECT_FALSE(more) << "too little is new";
    }
    if (file % 30 == 29) {
      Commit();
      TakeIn();
      for (const std::string& one : Jobs()) {
        ASSERT_TRUE(contents->Finish(JobOf(one).file, TextContent(text + one)));
      }
      ASSERT_TRUE(contents->Commit());
    }
  }
  EXPECT_GT(pieces(), 5);
  const int64_t before = used();

  int steps = 0;
  for (more = true; more; ++steps) {
    ASSERT_TRUE(contents->Merge(more)) << IndexErrorText(contents->Error());
    ASSERT_TRUE(contents->Commit());
  }
  EXPECT_GT(steps, 2);
  EXPECT_EQ(pieces(), 1);
  EXPECT_LT(used(), before);
  EXPECT_LE(Number("SELECT freelist_count FROM pragma_freelist_count"), 256);
  EXPECT_EQ(Holding("txt"), 300);
  EXPECT_EQ(Number("SELECT merged = last_text FROM meta"), 1);
}

TEST_F(ContentsWordsTest, YearAndTrackAreWords) {
  File("a.mp3");
  File("b.mp3");
  Jobs();
  for (const char* name : {"a.mp3", "b.mp3"}) {
    Content song = TextContent("");
    song.kind = Kind::AUDIO;
    song.texts = {{ContentField::TITLE, name}};
    song.numbers = {
        {ContentField::YEAR, 1999}, {ContentField::TRACK, 17}, {ContentField::DURATION, 3}};
    ASSERT_TRUE(contents->Finish(JobOf(name).file, song));
  }
  ASSERT_TRUE(contents->Commit());
  EXPECT_EQ(Holding("1999"), 2);
  EXPECT_EQ(Holding("17"), 2);
  EXPECT_EQ(Holding("3"), 0);

  StoredContent stored;
  ContentsReader reader;
  ASSERT_EQ(reader.Open("s"), IndexError::NONE);
  ASSERT_EQ(reader.Find(ContentsTest::Find("a.mp3"), stored), IndexError::NONE);
  EXPECT_EQ(stored.content.numbers.size(), 3U);
  EXPECT_EQ(stored.content.texts.size(), 1U);

  File("a.mp3", "other bytes");
  EXPECT_EQ(Holding("1999"), 1) << "words go as they came";
}

TEST_F(ContentsWordsTest, WhatIsNotTakenInWaitsAndWhatIsGoneHasNotFailed) {
  File("a.txt");
  File("b.txt");
  Read();
  File("c.txt");
  Jobs();
  ASSERT_TRUE(contents->Fail(JobOf("c.txt").file, "damaged", {}, false));
  ASSERT_TRUE(contents->Commit());
  EXPECT_EQ(Counts().all.failed, 1U);
  EXPECT_EQ(Counts().all.waiting, 0U);
  EXPECT_EQ(Number("SELECT tries FROM files WHERE state = 2"), 1);

  ASSERT_EQ(rename(At("a.txt").c_str(), At("e.txt").c_str()), 0);
  ASSERT_EQ(unlink(At("c.txt").c_str()), 0);
  WriteFile(At("d.mp3"), "bytes");
  for (const char* name : {"a.txt", "c.txt"}) {
    Delete(name);
  }
  Add("e.txt");
  Add("d.mp3");
  Commit();

  const ContentCounts counts = Counts();
  EXPECT_EQ(counts.all.failed, 0U);
  EXPECT_EQ(counts.all.waiting, 1U) << "what was renamed is known";
  EXPECT_EQ(counts.kinds[static_cast<size_t>(Kind::AUDIO)].waiting, 1U);
  TakeIn();
  EXPECT_EQ(Counts().all.waiting, 1U);
}

}  // namespace fileindexd
