// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/contents_reader.h"

#include <gmock/gmock.h>
#include <unistd.h>

#include <tuple>

#include "index/content_terms.h"
#include "index/contents_schema.h"
#include "index/suspicion.h"
#include "index/text_tokenizer.h"
#include "state/layout.h"
#include "state/sqlite.h"
#include "tests/unit/index/contents_fixture.h"

namespace fileindexd {
namespace {

using testing::ElementsAre;

class ContentsReaderTest : public ContentsTest {
 protected:
  static bool IsSuspected(const std::string& folder) {
    return access((folder + "/" + SUSPICION_NOTE).c_str(), F_OK) == 0;
  }
};

TEST_F(ContentsReaderTest, BeforeThereAreWordsThereAreNoContents) {
  contents.reset();
  RemoveTree(ContentsPath("s"));
  {
    IndexDatabase database;  // as its writer makes it, before it knows the language
    ASSERT_EQ(database.OpenForWriting(ContentsPath("s"), true, CONTENTS_FORM), IndexError::NONE);
  }

  ContentsReader reader;
  EXPECT_EQ(reader.Open("s"), IndexError::PATH_NOT_FOUND);
}

TEST_F(ContentsReaderTest, TellsTheLanguageOfItsWords) {
  File("a.txt");
  ASSERT_EQ(Read(), Names({"a.txt"}));
  ContentsReader reader;
  StoredContent stored;

  ASSERT_EQ(reader.Open("s"), IndexError::NONE);
  ASSERT_EQ(reader.Find(ContentsTest::Find("a.txt"), stored), IndexError::NONE);
  EXPECT_EQ(stored.state, "done");
  EXPECT_EQ(stored.language, DEFAULT_LANGUAGE);
}

TEST_F(ContentsReaderTest, WhatIsNotReadOrNotWantedWaits) {
  File("a.txt");
  File("b.txt");
  ASSERT_EQ(Read().size(), 2U);
  const Entry old = ContentsTest::Find("a.txt");
  Entry unwanted = ContentsTest::Find("b.txt");
  unwanted.content_wanted = false;
  File("a.txt", "other bytes");
  ContentsReader reader;
  ASSERT_EQ(reader.Open("s"), IndexError::NONE);

  for (const Entry& entry : {old, unwanted, ContentsTest::Find("a.txt")}) {
    StoredContent stored;
    stored.state = "done";
    EXPECT_EQ(reader.Find(entry, stored), IndexError::NONE);
    EXPECT_EQ(stored.state, "waiting") << entry.path;
  }
}

TEST_F(ContentsReaderTest, WhatHoldsNothingToKeepIsNoneThatWasRead) {
  ASSERT_TRUE(store->SetFolder(root, {.document = true}));
  UseSettings();
  for (const char* name : {"paper.txt", "prose", "noise", "photo", "torn"}) {
    File(name);
  }
  ASSERT_EQ(Jobs().size(), 5U);
  Finish("paper.txt", "words");
  Finish("prose", "words");
  Content photo;
  photo.kind = Kind::PHOTO;
  ASSERT_TRUE(contents->Finish(JobOf("noise").file, Content()));
  ASSERT_TRUE(contents->Finish(JobOf("photo").file, photo));
  ASSERT_TRUE(contents->Fail(JobOf("torn").file, "damaged", photo, false));
  ASSERT_TRUE(contents->Commit());

  ContentsReader reader;
  ContentCounts counts;
  ASSERT_EQ(reader.Open("s"), IndexError::NONE);
  ASSERT_TRUE(reader.Count(counts));
  EXPECT_EQ(counts.all.done, 2U);
  EXPECT_EQ(counts.all.failed, 0U);
  EXPECT_EQ(counts.all.waiting, 0U);
  EXPECT_EQ(counts.not_kept, 3U);
  EXPECT_EQ(counts.done_last_minute, 2U);
  EXPECT_EQ(counts.kinds[static_cast<size_t>(Kind::DOCUMENT)].done, 2U);
  EXPECT_THAT(Listed(), testing::IsEmpty());
}

TEST_F(ContentsReaderTest, WhatWasCountedInAnotherWayIsCountedAnew) {
  File("paper.txt");
  File("noise");
  File("next.txt");
  ASSERT_EQ(Jobs().size(), 3U);
  Finish("paper.txt", "words");
  ASSERT_TRUE(contents->Finish(JobOf("noise").file, Content()));
  ASSERT_TRUE(contents->Commit());
  contents->Close();
  Run("sqlite3 " + ContentsPath("s") +
      "/contents.db 'DROP TABLE later; DROP INDEX files_to_read; DELETE FROM counts WHERE kind = 5;"
      " UPDATE counts SET done = 1 WHERE kind = 0'");

  OpenContents();

  ContentsReader reader;
  ContentCounts counts;
  ASSERT_EQ(reader.Open("s"), IndexError::NONE);
  ASSERT_TRUE(reader.Count(counts));
  EXPECT_EQ(counts.all.done, 1U);
  EXPECT_EQ(counts.all.waiting, 1U);
  EXPECT_EQ(counts.not_kept, 1U);
}

TEST_F(ContentsReaderTest, WhatCannotBeReadIsNoContent) {
  File("a.txt");
  ASSERT_EQ(Read(), Names({"a.txt"}));
  const Entry entry = ContentsTest::Find("a.txt");
  contents.reset();
  DamageTable(ContentsPath("s") + "/" + CONTENTS_FORM.file, "texts");
  ContentsReader reader;
  StoredContent stored;

  ASSERT_EQ(reader.Open("s"), IndexError::NONE);
  EXPECT_EQ(reader.Find(entry, stored), IndexError::DAMAGED);
  EXPECT_TRUE(IsSuspected(ContentsPath("s")));
  EXPECT_FALSE(IsSuspected(IndexPath("s"))) << "no entry was read";
}

TEST_F(ContentsReaderTest, WhatIsReadBesideTheEntriesMayBeTheirDamage) {
  File("a.txt");
  ASSERT_EQ(Jobs(), Names({"a.txt"}));
  ASSERT_TRUE(contents->Fail(JobOf("a.txt").file, "damaged", {}, false));
  ASSERT_TRUE(contents->Commit());
  contents.reset();
  DamageTable(ContentsPath("s") + "/" + CONTENTS_FORM.file, "files");
  ContentsReader reader;

  ASSERT_EQ(reader.Open("s"), IndexError::NONE);
  EXPECT_FALSE(reader.ForEachFailed([](const FailedContent&) { return true; }));
  EXPECT_TRUE(IsSuspected(ContentsPath("s")));
  EXPECT_TRUE(IsSuspected(IndexPath("s")));
}

// Beside the entries they are found as wrong as they are alone, and the entries stay usable.
TEST_F(ContentsReaderTest, WhatIsWrongWithThemIsTold) {
  File("a.txt");
  contents.reset();
  const std::string file = "f=" + ContentsPath("s") + "/contents.db; ";
  const std::tuple<const char*, const char*, IndexError> cases[] = {
      {"without tables", "sqlite3 $f 'DROP TABLE meta'", IndexError::DAMAGED},
      {"another version", "sqlite3 $f 'PRAGMA user_version = 99'", IndexError::PATH_NOT_FOUND},
      {"another's", "rm $f*; sqlite3 $f 'CREATE TABLE t(a)'", IndexError::PATH_NOT_FOUND},
      {"of another encoding",
       "rm $f*; sqlite3 $f 'PRAGMA encoding = \"UTF-16\"; CREATE TABLE t(a)'",
       IndexError::PATH_NOT_FOUND},
      {"no database", "(seq 3000 >$f)", IndexError::DAMAGED},
      {"empty", "truncate -s 0 $f", IndexError::PATH_NOT_FOUND},
      {"a folder", "rm $f; mkdir $f", IndexError::PATH_NOT_FOUND},
      {"nowhere", "rmdir $f", IndexError::PATH_NOT_FOUND},
  };

  for (const auto& [name, damage, expected] : cases) {
    Run(file + damage);
    ContentsReader reader;
    EXPECT_EQ(reader.Open("s"), expected) << name;

    Statement attached;
    ASSERT_EQ(attached.Prepare(reader.entries.db, "SELECT count(*) FROM pragma_database_list"),
              SQLITE_OK);
    ASSERT_EQ(attached.Step(), SQLITE_ROW);
    EXPECT_EQ(attached.Int(0), 1) << name;
    Statement entries;
    ASSERT_EQ(entries.Prepare(reader.entries.db, "SELECT count(*) FROM entries"), SQLITE_OK);
    ASSERT_EQ(entries.Step(), SQLITE_ROW);
    EXPECT_GT(entries.Int(0), 0) << name;
  }
}

std::vector<std::string> TermTexts(const Content& content, const std::string& language) {
  std::vector<std::string> texts;
  for (const ContentTerm& term : TermsOf(content, language)) {
    texts.push_back(term.term + " " + std::to_string(term.count));
  }
  return texts;
}

TEST(ContentTermsTest, AreInByteOrderWithTheirNumbers) {
  Content content = TextContent("two One two");
  content.texts.push_back({ContentField::TITLE, "One"});
  content.texts.push_back({ContentField::AUTHOR, "three"});

  EXPECT_THAT(TermTexts(content, NO_LANGUAGE), ElementsAre("one 2", "three 1", "two 2"));
  EXPECT_THAT(TermTexts({}, NO_LANGUAGE), ElementsAre());
}

TEST(ContentTermsTest, StemsStandBesideTheirWords) {
  const std::vector<std::string> terms = TermTexts(TextContent("lighthouses"), "english");

  EXPECT_GE(terms.size(), 2u);
  EXPECT_THAT(terms, testing::Contains("lighthouses 1"));
}

}  // namespace
}  // namespace fileindexd
