// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/info_content.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <string_view>

#include "index/contents_schema.h"
#include "index/query_fields.h"
#include "state/layout.h"
#include "state/sqlite.h"
#include "tests/unit/index/contents_fixture.h"

namespace fileindexd {
namespace {

// A file's row takes another identity just before a statement reads it: as when the file is taken
// in anew in the midst.
class InfoContentTest : public ContentsTest {
 protected:
  void SetUp() override {
    ContentsTest::SetUp();
    OldFile("a.txt", 1'700'000'000);
    TakeIn();
    ASSERT_EQ(Read(), Names({"a.txt"}));
    contents.reset();
    other = std::make_unique<IndexDatabase>();
    ASSERT_EQ(other->OpenForWriting(ContentsPath("s"), false, CONTENTS_FORM), IndexError::NONE);
    current = this;
  }

  void TearDown() override {
    (void)sqlite3_reset_auto_extension();
    other.reset();
    ContentsTest::TearDown();
  }

  void MoveInodes(int by) {
    const std::string sql = "UPDATE files SET inode = inode + " + std::to_string(by);
    ASSERT_EQ(sqlite3_exec(other->db, sql.c_str(), nullptr, nullptr, nullptr), SQLITE_OK);
  }

  // From now on, in connections that are opened then.
  static void MoveAtStatement(int number) {
    current->statements = 0;
    current->moves_at = number;
    (void)sqlite3_auto_extension(reinterpret_cast<void (*)()>(Follow));
  }

  static int Follow(sqlite3* db, char** /*error*/, const sqlite3_api_routines* /*routines*/) {
    return sqlite3_trace_v2(db, SQLITE_TRACE_STMT, AtStatement, nullptr);
  }

  static int AtStatement(unsigned /*event*/, void* /*context*/, void* statement, void* /*sql*/) {
    const std::string_view sql = sqlite3_sql(static_cast<sqlite3_stmt*>(statement));
    if (sql.find("contents.files") != std::string_view::npos &&
        ++current->statements == current->moves_at) {
      current->MoveInodes(1000);
    }
    return 0;
  }

  static InfoContentTest* current;
  std::unique_ptr<IndexDatabase> other;
  int statements = 0;  // that read files
  int moves_at = 0;
};

InfoContentTest* InfoContentTest::current = nullptr;

TEST(ContentLinesTest, WhatHoldsSeveralHasALineForEach) {
  EntryContent content;
  content.is_known = true;
  content.stored.state = "done";
  content.stored.content.texts = {{ContentField::TITLE, "One"},
                                  {ContentField::MEMBERS, "a\nb\nc\nd"}};
  const auto shown = [&content](size_t most) {
    std::string lines;
    for (const auto& [name, text] : ContentLines(content, most)) {
      lines += name + "=" + text + ";";
    }
    return lines;
  };

  EXPECT_EQ(shown(4), "state=done;kind=other;title=One;member=a;=b;=c;=d;text=0 bytes;");
  EXPECT_EQ(shown(2), "state=done;kind=other;title=One;member=a;=b;=... and 2 more;text=0 bytes;");
}

TEST_F(InfoContentTest, AChangeBetweenStatementsIsNoProblem) {
  const Entry entry = ContentsTest::Find("a.txt");
  ASSERT_EQ(ContentOf(TheShare(), entry).stored.state, "done");

  int number = 0;
  do {
    MoveAtStatement(++number);
    const EntryContent content = ContentOf(TheShare(), entry);
    (void)sqlite3_reset_auto_extension();
    EXPECT_EQ(content.problem, "") << number;
    EXPECT_TRUE(content.is_known) << number;
    if (statements >= number) {
      MoveInodes(-1000);
    }
  } while (statements >= number);
  EXPECT_GT(number, 1);
}

TEST(ContentObjectTest, FieldsAreCalledAsInQuestions) {
  EntryContent content;
  content.is_known = true;
  for (int field = 1; field <= static_cast<int>(TEXT_FIELD_COUNT); ++field) {
    content.stored.content.texts.push_back({static_cast<ContentField>(field), "a"});
  }
  const auto last = static_cast<int>(ContentField::RATING);
  for (int field = static_cast<int>(FIRST_NUMBER_FIELD); field <= last; ++field) {
    content.stored.content.numbers.push_back({static_cast<ContentField>(field), 1});
  }

  const Json::Value fields = ContentObject(content)["fields"];

  EXPECT_EQ(fields.size(), 32U);
  for (const std::string& name : fields.getMemberNames()) {
    const bool is_own = name == "duration_ms" || name == "latitude" || name == "longitude";
    EXPECT_NE(FindField(name) != nullptr, is_own) << name;
  }
}

}  // namespace
}  // namespace fileindexd
