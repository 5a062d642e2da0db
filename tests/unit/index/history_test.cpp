// SPDX-License-Identifier: GPL-2.0-or-later
// Random histories: whatever happened on disk and whatever order the events came in, once every
// changed path had its event, index and disk agree.
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <random>

#include "tests/unit/index/fixture.h"

namespace fileindexd {

class HistoryTest : public IndexTest, public testing::WithParamInterface<int> {
 protected:
  void MountRoot() override {
    static const char* const TYPES[] = {"tmpfs", "ext4", "no_birth_times"};
    MountRootAs(TYPES[GetParam() % 3]);
  }

  int Pick(int below) { return static_cast<int>(random() % static_cast<unsigned>(below)); }

  std::string RandomName() {
    static const char* const PARTS[] = {"a", "a!b", "a.b", "b", "c.txt"};
    std::string name = PARTS[Pick(5)];
    for (int depth = Pick(3); depth > 0; --depth) {
      name += std::string("/") + PARTS[Pick(5)];
    }
    return name;
  }

  // Failures are part of the history: the events come all the same.
  void ChangeDisk() {
    const std::string name = RandomName();
    const std::string other = RandomName();
    std::error_code failure;
    switch (Pick(6)) {
      case 0:
        std::filesystem::create_directory(At(name), failure);
        break;
      case 1:
        if (FILE* file = fopen(At(name).c_str(), "a"); file != nullptr) {
          fputs("x", file);
          fclose(file);
        }
        break;
      case 2:
        if (Exists(At(name))) {
          RemoveTree(At(name));
        }
        break;
      case 3:
        std::filesystem::rename(At(name), At(other), failure);
        break;
      case 4:
        std::filesystem::create_hard_link(At(name), At(other), failure);
        break;
      case 5:
        // Into nowhere: a change through a link is one of a path that had no event.
        std::filesystem::create_symlink("nowhere/x", At(name), failure);
        break;
      default:
        break;
    }
    events.push_back(name);
    events.push_back(other);
  }

  void TakeEvent(const std::string& name) {
    switch (Pick(4)) {
      case 0:
        Refresh(name);
        break;
      case 1:
        Add(name);
        break;
      case 2:
        Delete(name, DeleteMode::STALE);
        break;
      default:
        Delete(name);
        Add(name);
        break;
    }
  }

  // A directory that appears is reindexed: stale entries leave, then all below is added.
  void Reindex(const std::string& name) {
    struct stat st {};
    Delete(name, DeleteMode::STALE);
    Add(name);
    if (lstat(At(name).c_str(), &st) == 0 && S_ISDIR(st.st_mode)) {
      for (const char* part : {"a", "a!b", "a.b", "b", "c.txt"}) {
        if (Exists(At(name + "/" + part))) {
          Reindex(name + "/" + part);
        }
      }
    }
  }

  std::mt19937 random{static_cast<unsigned>(GetParam())};
  Names events;
};

INSTANTIATE_TEST_SUITE_P(Seeds, HistoryTest, testing::Range(0, 12));

TEST_P(HistoryTest, IndexAndDiskAgreeOnceItIsQuiet) {
  AddAll();
  for (int round = 0; round < 25; ++round) {
    for (int i = Pick(30); i >= 0; --i) {
      ChangeDisk();
      if (Pick(3) == 0) {
        TakeEvent(events[static_cast<size_t>(Pick(static_cast<int>(events.size())))]);
      }
      if (Pick(15) == 0) {
        Commit();
        OpenWriter();
      }
    }

    std::shuffle(events.begin(), events.end(), random);
    for (const std::string& name : events) {
      Reindex(name);
    }
    events.clear();
    Commit();
    ASSERT_EQ(Differences(), Names()) << "round " << round;
    OpenWriter();
  }
}

}  // namespace fileindexd
