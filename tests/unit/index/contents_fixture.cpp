// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/index/contents_fixture.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>

#include "index/contents_schema.h"
#include "state/layout.h"
#include "state/sqlite.h"

namespace fileindexd {

Content TextContent(const std::string& text) {
  Content content;
  content.kind = Kind::DOCUMENT;
  content.text = text;
  return content;
}

void ContentsTest::SetUp() {
  IndexTest::SetUp();
  wanted = {true, true, true, true};
  if (store != nullptr) {
    ASSERT_TRUE(store->SetFolder(root, wanted));
    Commit();
    OpenContents();
  }
}

Share ContentsTest::TheShare() {
  std::shared_ptr<const Settings> in_force;
  EXPECT_TRUE(store->GetSettings(in_force));
  return *in_force->ShareByName("s");
}

void ContentsTest::OpenContents(int64_t extractor) {
  handed.clear();
  contents.reset();
  contents = std::make_unique<ContentsWriter>();
  const IndexError error = contents->Open(TheShare(), extractor);
  ASSERT_EQ(error, IndexError::NONE) << IndexErrorText(error);
}

void ContentsTest::UseSettings() {
  std::shared_ptr<const Settings> in_force;
  ASSERT_TRUE(store->GetSettings(in_force));
  contents->UseSettings(in_force);
}

void ContentsTest::TakeIn() {
  bool more = true;
  while (more) {
    ASSERT_TRUE(contents->TakeIn(3, more)) << IndexErrorText(contents->Error());
  }
  ASSERT_TRUE(contents->Commit()) << IndexErrorText(contents->Error());
}

void ContentsTest::Sweep(int64_t now) {
  bool more = true;
  while (more) {
    ASSERT_TRUE(contents->Sweep(now, 3, more)) << IndexErrorText(contents->Error());
  }
  ASSERT_TRUE(contents->Commit()) << IndexErrorText(contents->Error());
}

Names ContentsTest::NewJobs(size_t limit) {
  std::vector<ContentJob> jobs;
  EXPECT_TRUE(contents->NextJobs(limit, jobs, more_jobs)) << IndexErrorText(contents->Error());
  return Handed(jobs);
}

Names ContentsTest::Jobs(size_t limit) {
  Names names = NewJobs(limit);
  if (names.size() < limit) {
    std::vector<ContentJob> jobs;
    bool more_again = false;
    EXPECT_TRUE(contents->NextAgain(clock, limit - names.size(), jobs, more_again))
        << IndexErrorText(contents->Error());
    more_jobs = more_jobs || more_again;
    const Names others = Handed(jobs);
    names.insert(names.end(), others.begin(), others.end());
  }
  return names;
}

Names ContentsTest::Handed(const std::vector<ContentJob>& jobs) {
  Names names;
  for (const ContentJob& job : jobs) {
    EXPECT_FALSE(job.paths.empty());
    names.push_back(job.paths.front().substr(root.size() + 1));
    handed[names.back()] = job;
  }
  return names;
}

ContentJob ContentsTest::JobOf(const std::string& name) {
  EXPECT_TRUE(handed.contains(name)) << name;
  return handed[name];
}

void ContentsTest::File(const std::string& name, const std::string& bytes) {
  WriteFile(At(name), bytes);
  Add(name);
  Commit();
  TakeIn();
}

void ContentsTest::OldFile(const std::string& name, time_t mtime, const std::string& bytes) {
  WriteFile(At(name), bytes);
  SetTime(At(name), mtime);
  Add(name);
  Commit();
}

void ContentsTest::SetTime(const std::string& path, time_t mtime) {
  const timespec times[2] = {{mtime, 0}, {mtime, 0}};
  ASSERT_EQ(utimensat(AT_FDCWD, path.c_str(), times, 0), 0);
}

void ContentsTest::WriteHidden(const std::string& name) {
  WriteFile(At(name), "bytea");
  SetTime(At(name), 1000);
  Add(name);
}

void ContentsTest::Finish(const std::string& name, const std::string& text) {
  EXPECT_TRUE(contents->Finish(JobOf(name).file, TextContent(text)))
      << IndexErrorText(contents->Error());
  EXPECT_TRUE(contents->Commit()) << IndexErrorText(contents->Error());
}

void ContentsTest::ReadOldFile(const std::string& name, time_t mtime, const std::string& bytes) {
  OldFile(name, mtime, bytes);
  TakeIn();
  ASSERT_EQ(Jobs(), Names({name}));
  Finish(name, "old" + name);
}

Names ContentsTest::Read() {
  const Names names = Jobs();
  for (const std::string& name : names) {
    Finish(name, name);
  }
  return names;
}

Names ContentsTest::Paths(const std::string& text) {
  question.text = text;
  std::string error;
  if (!Ask(question, answer, error)) {
    return {"error: " + error};
  }
  Names paths;
  for (const Hit& hit : answer.hits) {
    paths.push_back(hit.entry.path);
  }
  return paths;
}

Names ContentsTest::Hits(const std::string& text) {
  question.shares = {"s"};
  answer.failures.clear();
  Names names = Paths(text);
  EXPECT_EQ(answer.failures, Names()) << text;
  for (std::string& name : names) {
    if (Covers(root, name)) {
      name.erase(0, name == root ? root.size() : root.size() + 1);
    }
  }
  return names;
}

Names ContentsTest::Sorted(const std::string& text) {
  Names names = Hits(text);
  std::sort(names.begin(), names.end());
  return names;
}

std::vector<FailedContent> ContentsTest::Listed() {
  std::vector<FailedContent> listed;
  ContentsReader reader;
  EXPECT_EQ(reader.Open("s"), IndexError::NONE);
  EXPECT_TRUE(reader.ForEachFailed([&](const FailedContent& failed) {
    listed.push_back(failed);
    return true;
  }));
  return listed;
}

int64_t ContentsTest::Number(const std::string& sql) {
  IndexDatabase database;
  EXPECT_EQ(database.OpenForReading(ContentsPath("s"), CONTENTS_FORM), IndexError::NONE);
  Statement statement;
  EXPECT_EQ(statement.Prepare(database.db, sql.c_str()), SQLITE_OK)
      << sql << ": " << sqlite3_errmsg(database.db);
  EXPECT_EQ(statement.Step(), SQLITE_ROW) << sql << ": " << sqlite3_errmsg(database.db);
  return statement.Int(0);
}

int64_t ContentsTest::Holding(const std::string& word) {
  return Number("SELECT count(*) FROM words WHERE words MATCH '\"" + word + "\"'");
}

}  // namespace fileindexd
