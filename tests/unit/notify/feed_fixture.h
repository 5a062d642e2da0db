// SPDX-License-Identifier: GPL-2.0-or-later
// One share "s" with indexed folders in it, and time that only the test moves.
#pragma once

#include <sys/stat.h>

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <string>
#include <vector>

#include "notify/change.h"
#include "state/queue_folding.h"
#include "state/settings.h"
#include "tests/unit/state/fixture.h"

namespace fileindexd {

class FeedTest : public StateTest {
 protected:
  FeedTest() : share(folder + "/share"), home(share + "/home") {
    settings.state_root = state_root;
    settings.shares = {{"other", folder + "/other", ""}, {"s", share, ""}};
    settings.folders = {{"s", home, {}}};
    std::filesystem::create_directories(home);
    std::filesystem::create_directories(folder + "/other");
  }

  void AddFolder(const std::string& path) {
    settings.folders.push_back({"s", path, {}});
    std::sort(settings.folders.begin(), settings.folders.end(),
              [](const IndexedFolder& a, const IndexedFolder& b) { return a.path < b.path; });
  }

  void Exclude(const std::string& pattern) {
    std::string error;
    ASSERT_TRUE(settings.folders[0].excludes.Add(pattern, error)) << error;
  }

  // `name` lies in the indexed folder.
  std::string Path(const std::string& name) const { return home + "/" + name; }
  void Make(const std::string& name) const { WriteFile(Path(name), "x"); }
  void MakeDirectory(const std::string& name) const {
    ASSERT_TRUE(std::filesystem::create_directories(Path(name)));
  }
  Change File(uint32_t what, const std::string& name) const { return {what, false, Path(name)}; }
  Change Directory(uint32_t what, const std::string& name) const {
    return {what, true, Path(name)};
  }
  Change Rename(const std::string& from, const std::string& to, bool directory = false) const {
    return {MOVED_TO, directory, Path(to), Path(from)};
  }

  const std::string share;
  const std::string home;
  Settings settings;
  std::chrono::steady_clock::time_point now{std::chrono::hours(1)};
};

}  // namespace fileindexd
