// SPDX-License-Identifier: GPL-2.0-or-later
// The contents' log may grow where there is plenty of room, and is kept short where there is not.
#include <algorithm>
#include <filesystem>

#include "state/layout.h"
#include "tests/unit/index/contents_fixture.h"

namespace fileindexd {

class ContentsLogTest : public ContentsTest, public testing::WithParamInterface<const char*> {
 protected:
  void MountRoot() override {
    MakeFolder(state_root);
    Run(std::string("mount -t tmpfs -o size=") + GetParam() + " none " + state_root);
    mounted.push_back(state_root);
  }

  uintmax_t LogSize() const {
    return std::filesystem::file_size(ContentsPath("s") + "/contents.db-wal");
  }

  // In commits of some hundred pages. The longest log in between.
  uintmax_t WriteTexts() {
    uintmax_t longest = 0;
    for (int i = 0; i < FILES; ++i) {
      const std::string name = "f" + std::to_string(i) + ".txt";
      File(name);
      EXPECT_EQ(Jobs(), Names({name}));
      std::string text;
      for (int word = 0; word < 30'000; ++word) {
        text += "w" + std::to_string(i) + "x" + std::to_string(word) + " ";
      }
      Finish(name, text);
      EXPECT_TRUE(contents->Commit());
      longest = std::max(longest, LogSize());
    }
    return longest;
  }

  static constexpr int FILES = 24;
  static constexpr uintmax_t SHORT = uintmax_t{6} << 20;  // a thousand pages, and one commit
};

class ContentsLogWithRoomTest : public ContentsLogTest {};
class ContentsLogInNarrownessTest : public ContentsLogTest {};
INSTANTIATE_TEST_SUITE_P(Disks, ContentsLogWithRoomTest, testing::Values("2G"));
INSTANTIATE_TEST_SUITE_P(Disks, ContentsLogInNarrownessTest, testing::Values("300M"));

TEST_P(ContentsLogWithRoomTest, ItGrowsAndIsCutWhenThereIsNothingToDo) {
  EXPECT_GT(WriteTexts(), SHORT);
  contents->CutLog();
  EXPECT_EQ(LogSize(), 0U);
}

TEST_P(ContentsLogInNarrownessTest, ItIsCutEarly) {
  EXPECT_LT(WriteTexts(), SHORT);
}

}  // namespace fileindexd
