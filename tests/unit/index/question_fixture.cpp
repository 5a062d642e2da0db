// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/index/question_fixture.h"

#include "index/entry_table.h"
#include "state/layout.h"

namespace fileindexd {

void QuestionTest::Store(const std::map<std::string, Content>& files) {
  for (const auto& [name, content] : files) {
    WriteFile(At(name), name);
    Add(name);
  }
  Commit();
  TakeIn();
  Jobs();
  for (const auto& [name, content] : files) {
    EXPECT_TRUE(contents->Finish(JobOf(name).file, content)) << name;
  }
  EXPECT_TRUE(contents->Commit());
}

void QuestionTest::StoreOne(const std::string& name, const Content& content,
                            const std::string& bytes) {
  File(name, bytes);
  Jobs();
  EXPECT_TRUE(contents->Finish(JobOf(name).file, content)) << name;
  EXPECT_TRUE(contents->Commit());
}

void QuestionTest::Empty(const Names& names) {
  for (const std::string& name : names) {
    WriteFile(At(name), "");
    Add(name);
  }
  Commit();
}

bool QuestionTest::TryToFill(const std::string& share, const Names& names) {
  std::string error;
  IndexDatabase database;
  EntryTable table;
  bool done = MakeShareFolder(share, error) &&
              database.OpenForWriting(IndexPath(share), true) == IndexError::NONE &&
              table.Prepare(database.db) == SQLITE_OK && table.Begin() == SQLITE_OK;
  for (size_t i = 0; i < names.size() && done; ++i) {
    Entry entry;
    entry.path = "/" + share + "/" + names[i];
    entry.thing = Thing::FILE;
    done = table.Insert(entry) == SQLITE_OK;
  }
  return done && table.Commit(1) == SQLITE_OK;
}

void QuestionTest::Fill(const std::string& share, const Names& names) {
  ASSERT_TRUE(TryToFill(share, names));
}

std::string QuestionTest::Suggested(const std::string& text) {
  EXPECT_EQ(Hits(text), Names());
  return answer.suggestion;
}

std::string QuestionTest::Marked(const std::string& text) {
  std::string marked;
  (void)Hits(text);
  for (const Hit& hit : answer.hits) {
    for (const Snippet::Mark& mark : hit.marks) {
      marked +=
          (marked.empty() ? "" : "|") + hit.entry.path.substr(mark.start, mark.end - mark.start);
    }
  }
  return marked;
}

Names QuestionTest::Reasons(const std::string& name, const std::string& text) {
  question.text = text;
  question.shares = {"s"};
  std::string error;
  const IndexError explained = Explain(question, At(name), explanation, error);
  if (explained != IndexError::NONE) {
    return {"error: " + error};
  }
  Names reasons;
  for (const Reason& reason : explanation.reasons) {
    reasons.push_back((reason.matches ? "" : "no ") + reason.part + ": " + reason.where);
  }
  return reasons;
}

Content Tagged(ContentField field, const std::string& text) {
  Content content;
  content.texts = {{field, text}};
  return content;
}

Content Numbered(const std::vector<NumberField>& numbers, Kind kind) {
  Content content;
  content.kind = kind;
  content.numbers = numbers;
  return content;
}

}  // namespace fileindexd
