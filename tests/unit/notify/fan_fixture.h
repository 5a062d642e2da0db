// SPDX-License-Identifier: GPL-2.0-or-later
// A watch on a file system, and changes made there.
#pragma once

#include <fcntl.h>
#include <unistd.h>

#include <cstdio>
#include <memory>
#include <string>

#include "base/scoped_fd.h"
#include "notify/fan_group.h"
#include "tests/unit/notify/watching.h"
#include "tests/unit/state/mounts.h"

namespace fileindexd {

class FanGroupTest : public MountTest {
 protected:
  // A watch on what shows `path`.
  void Open(const std::string& path) {
    MountTable table;
    ASSERT_TRUE(table.Read());
    const Mount* mount = table.MountOf(path);
    ASSERT_NE(mount, nullptr);
    error.clear();
    group = FanGroup::Open(*mount, error);
  }
  void OpenSound(const std::string& path) {
    Open(path);
    ASSERT_NE(group, nullptr) << error;
    EXPECT_EQ(error, "");
  }

  Texts Told() {
    if (group == nullptr || !WaitFor(*group)) {
      return {"nothing"};
    }
    bool failed = false;
    Texts told = ReadAll(*group, failed);
    EXPECT_FALSE(failed);
    EXPECT_FALSE(group->TakeOverflow());
    EXPECT_EQ(group->Waiting(), 0U);
    return told;
  }

  // The target of what is told at `path`.
  std::string ToldTarget(const std::string& path) {
    std::string target;
    EXPECT_TRUE(WaitFor(*group));
    while (group->Read([&](const Change& change) {
      if (change.path == path && !change.target.empty()) {
        target = change.target;
      }
    }) == FanGroup::Result::MORE) {
    }
    return target;
  }

  void Put(const std::string& path) const {
    const ScopedFd file(open((root + path).c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
    ASSERT_GE(file.fd, 0) << path;
    ASSERT_EQ(write(file.fd, "x", 1), 1);
  }
  void Rename(const std::string& from, const std::string& to) const {
    ASSERT_EQ(rename((root + from).c_str(), (root + to).c_str()), 0) << from;
  }

  std::string error;
  std::unique_ptr<FanGroup> group;
};

// The same on each kind of file system that can be watched.
class OnEach : public FanGroupTest, public testing::WithParamInterface<const char*> {
 protected:
  void SetUp() override {
    MountTest::SetUp();
    if (IsSkipped() || HasFatalFailure()) {
      return;
    }
    if (GetParam() == std::string("tmpfs")) {
      MountTmpfs(root);
    } else {
      MountImage(GetParam(), root);
    }
    for (const char* name : {"/d", "/e"}) {
      MakeFolder(root + name);
    }
    Put("/d/old");
    OpenSound(root);
  }
};

}  // namespace fileindexd
