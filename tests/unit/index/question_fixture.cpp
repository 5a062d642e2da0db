// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/index/question_fixture.h"

#include <algorithm>

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

Names QuestionTest::Hits(const std::string& text) {
  question.text = text;
  question.shares = {"s"};
  std::string error;
  if (!Ask(question, answer, error)) {
    return {"error: " + error};
  }
  EXPECT_EQ(answer.failures, Names()) << text;
  Names names;
  for (const Hit& hit : answer.hits) {
    names.push_back(hit.entry.path == root ? "" : hit.entry.path.substr(root.size() + 1));
  }
  return names;
}

Names QuestionTest::Sorted(const std::string& text) {
  Names names = Hits(text);
  std::sort(names.begin(), names.end());
  return names;
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
