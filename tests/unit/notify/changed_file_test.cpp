// SPDX-License-Identifier: GPL-2.0-or-later
// Files that were changed by one of several names.
#include <unistd.h>

#include "tests/unit/notify/gatherer_fixture.h"

namespace fileindexd {
namespace {

// "2 links: t1 t2": what was found of changed files, with an inode, or "gone: t1".
class ChangedFileTest : public GathererTest {
 protected:
  Change Changed(uint32_t what, const std::string& name, const std::string& target) const {
    Change change = File(what, name);
    change.target = target;
    return change;
  }
  Texts Found() {
    (void)All();
    Texts found;
    for (const ChangedFile& file : std::exchange(gatherer.changed, {})) {
      std::string text = file.inode == 0 ? "gone:" : std::to_string(file.links) + " links:";
      for (const std::string& target : file.targets) {
        text += " " + target;
      }
      found.push_back(text);
    }
    return found;
  }
  void Link(const std::string& name, const std::string& other) const {
    ASSERT_EQ(link(Path(name).c_str(), Path(other).c_str()), 0);
  }
};

TEST_F(ChangedFileTest, OneThatWasChangedAndHasOtherNamesIsFound) {
  Make("file");
  Link("file", "other");
  for (const uint32_t what : {MODIFIED | 0U, ATTRIBUTES | 0U, WRITTEN | 0U, CREATED | WRITTEN}) {
    Add(Changed(what, "file", "t"));
    EXPECT_EQ(Found(), Texts{"2 links: t"}) << what;
    Add(File(what, "file"));  // the watch cannot tell
    EXPECT_EQ(Found(), Texts{"2 links:"}) << what;
  }
}

TEST_F(ChangedFileTest, OneWhoseNamesChangedAloneIsNot) {
  Make("file");
  Link("file", "other");
  Add(File(CREATED, "file"));
  Add(File(DELETED, "gone"));
  Add(Rename("before", "other"));
  EXPECT_EQ(Found(), Texts());
}

TEST_F(ChangedFileTest, OneOfASingleNameIsOnlyWhereItsHandleMayTellOfAnother) {
  Make("file");
  MakeDirectory("dir");
  Add(File(WRITTEN, "file"));
  Add(File(WRITTEN, "gone"));
  Add(Directory(ATTRIBUTES, "dir"));
  EXPECT_EQ(Found(), Texts());
  Add(Changed(WRITTEN, "file", "t"));
  Add(Changed(WRITTEN, "gone", "u"));
  EXPECT_EQ(Found(), (Texts{"1 links: t", "gone: u"}));
}

TEST_F(ChangedFileTest, ItsHandleStaysWhenItsNameGoes) {
  Make("new");
  Add(Changed(WRITTEN, "removed", "t"));
  Add(File(DELETED, "removed"));
  EXPECT_EQ(Found(), Texts{"gone: t"});
  Add(Changed(WRITTEN, "old", "t"));
  Add(Rename("old", "new"));
  EXPECT_EQ(Found(), Texts{"1 links: t"});
  Add(Changed(WRITTEN, "old", "t"));
  Add({MOVED_TO, false, folder + "/other/x", Path("old")});
  EXPECT_EQ(Found(), Texts{"gone: t"});
}

TEST_F(ChangedFileTest, OneThingAfterTheOtherAtAPathIsEachFoundOnce) {
  Make("file");
  for (const char* target : {"a", "b", "a", "c", "d", "e", "f", "f"}) {
    Add(Changed(MODIFIED, "file", target));
  }
  EXPECT_EQ(Found(), (Texts{"gone: a", "gone: b", "1 links: c d e f"}));
  EXPECT_EQ(gatherer.Bytes(), 0U);
}

TEST_F(ChangedFileTest, HandlesCountIntoTheBytes) {
  Add(File(MODIFIED, "a"));
  const size_t before = gatherer.Bytes();
  Add(Changed(MODIFIED, "a", std::string(30, 't')));
  Add(Changed(MODIFIED, "a", std::string(30, 't')));
  EXPECT_EQ(gatherer.Bytes(), before + 30);
  Add(Rename("a", "b"));  // both paths are kept
  EXPECT_EQ(gatherer.Bytes(), before + before + 30);
  gatherer.Clear();
  EXPECT_EQ(Found(), Texts());
}

}  // namespace
}  // namespace fileindexd
