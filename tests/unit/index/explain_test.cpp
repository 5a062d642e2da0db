// SPDX-License-Identifier: GPL-2.0-or-later
#include <fcntl.h>
#include <sys/stat.h>

#include <cstdlib>
#include <ctime>

#include "index/schema.h"
#include "state/layout.h"
#include "tests/unit/index/question_fixture.h"

namespace fileindexd {
namespace {

class ExplainTest : public QuestionTest {};

TEST_F(ExplainTest, AnIndexThatCannotBeReadIsSaid) {
  Empty({"a.txt"});
  ASSERT_EQ(Reasons("a.txt", "a"), Names({"a: name"}));
  writer.reset();
  contents.reset();
  DamageTable(IndexPath("s") + "/" + ENTRIES_FILE, "sqlite_autoindex_entries_1");

  EXPECT_EQ(Reasons("a.txt", "a"), Names({"error: the index is damaged"}));
}

TEST_F(ExplainTest, PartsInBracketsAreToldWithTheirField) {
  Empty({"a.txt"});
  EXPECT_EQ(
      Reasons("a.txt", "name:(a OR b) name:(txt -\"c\") (a)"),
      Names({"name:(a): name", "no name:(b): ", "name:(txt): name", "name:(-\"c\"): ", "a: name"}));
}

TEST_F(ExplainTest, TimesBeforeTheEpochAreRoundedDown) {
  setenv("TZ", "UTC", 1);
  tzset();
  const timespec before{-2, 500'000'000};
  const timespec times[2] = {before, before};
  WriteFile(At("a.txt"), "");
  ASSERT_EQ(utimensat(AT_FDCWD, At("a.txt").c_str(), times, 0), 0);
  Add("a.txt");
  Commit();

  EXPECT_EQ(Reasons("a.txt", "modified:<1970"), Names({"modified:<1970: 1969-12-31 23:59:58"}));
  unsetenv("TZ");
  tzset();
}

}  // namespace
}  // namespace fileindexd
