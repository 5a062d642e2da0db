// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/tree_watch.h"

#include <fcntl.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <csignal>
#include <filesystem>

#include "base/scoped_fd.h"
#include "tests/unit/notify/watching.h"
#include "tests/unit/state/mounts.h"

namespace fileindexd {
namespace {

class TreeWatchTest : public MountTest {
 protected:
  void Open() {
    error.clear();
    watch = TreeWatch::Open(std::make_shared<const Settings>(settings), settings.shares[0], error);
  }
  void OpenSound() {
    Open();
    ASSERT_NE(watch, nullptr) << error;
  }

  // What is told, paths from the share's root on. Each text holds the root once or twice.
  Texts Told() {
    if (watch == nullptr || !WaitFor(*watch)) {
      return {"nothing"};
    }
    bool failed = false;
    Texts told = ReadAll(*watch, failed);
    EXPECT_FALSE(failed) << watch->Error();
    EXPECT_EQ(watch->Waiting(), 0U);
    for (std::string& text : told) {
      for (size_t at = text.find(root); at != std::string::npos; at = text.find(root)) {
        text.erase(at, root.size());
      }
    }
    return told;
  }
  std::string Failure() {
    bool failed = false;
    if (WaitFor(*watch)) {
      (void)ReadAll(*watch, failed);
    }
    return failed ? watch->Error() : "none";
  }

  void Put(const std::string& path) const {
    const ScopedFd file(open((root + path).c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
    ASSERT_GE(file.fd, 0) << path;
    ASSERT_EQ(write(file.fd, "x", 1), 1);
  }
  void Folder(const std::string& path) { MakeFolder(root + path); }
  void Rename(const std::string& from, const std::string& to) const {
    ASSERT_EQ(rename((root + from).c_str(), (root + to).c_str()), 0) << from;
  }
  static Texts PutTexts(const std::string& path) {
    return {"create " + path, "modify " + path, "write " + path};
  }

  std::string error;
  std::unique_ptr<TreeWatch> watch;
};

TEST_F(TreeWatchTest, FilesAndDirectoriesOfAnyName) {
  Folder("/d");
  OpenSound();
  Put("/d/\xff\n");
  EXPECT_EQ(Told(), PutTexts("/d/\xff\n"));
  ASSERT_EQ(chmod((root + "/d").c_str(), 0750), 0);
  ASSERT_EQ(chmod(root.c_str(), 0750), 0);
  EXPECT_EQ(Told(), (Texts{"attrib /d/", "attrib /"}));
  ASSERT_EQ(symlink("x", (root + "/d/soft").c_str()), 0);
  ASSERT_EQ(unlink((root + "/d/soft").c_str()), 0);
  EXPECT_EQ(Told(), (Texts{"create /d/soft", "delete /d/soft"}));
}

TEST_F(TreeWatchTest, AFileThatIsHeldOpenIsOnlyModified) {
  Put("/f");
  OpenSound();
  const ScopedFd file(open((root + "/f").c_str(), O_WRONLY | O_APPEND | O_CLOEXEC));
  ASSERT_EQ(write(file.fd, "y", 1), 1);
  EXPECT_EQ(Told(), Texts{"modify /f"});
}

TEST_F(TreeWatchTest, DirectoriesMadeAndFilledAtOnceAreWatched) {
  OpenSound();
  Folder("/a/b/c");
  Put("/a/b/c/early");
  const Texts told = Told();
  EXPECT_EQ(told, Texts{"create /a/"});
  EXPECT_EQ(watch->Directories(), 4U);

  Put("/a/b/c/late");
  EXPECT_EQ(Told(), PutTexts("/a/b/c/late"));
}

TEST_F(TreeWatchTest, ARenamedDirectoryTellsUnderItsNewName) {
  Folder("/a/b");
  Folder("/other");
  OpenSound();
  Rename("/a", "/other/z");
  Put("/other/z/b/f");
  Texts expected = {"to /a/ -> /other/z/"};
  for (const std::string& text : PutTexts("/other/z/b/f")) {
    expected.push_back(text);
  }
  EXPECT_EQ(Told(), expected);
  EXPECT_EQ(watch->Directories(), 4U);
}

TEST_F(TreeWatchTest, RenamesOfFiles) {
  Put("/a");
  Put("/b");
  OpenSound();
  Rename("/a", "/b");
  EXPECT_EQ(Told(), Texts{"to /a -> /b"});
}

TEST_F(TreeWatchTest, RenamesInARowAndSwaps) {
  Folder("/a/in");
  Folder("/b");
  OpenSound();
  Rename("/a", "/tmp");
  Rename("/b", "/a");
  Rename("/tmp", "/b");
  Rename("/b/in", "/a/in");
  EXPECT_EQ(Told(),
            (Texts{"to /a/ -> /tmp/", "to /b/ -> /a/", "to /tmp/ -> /b/", "to /b/in/ -> /a/in/"}));
  Put("/a/in/f");
  EXPECT_EQ(Told(), PutTexts("/a/in/f"));
  Put("/b/g");
  EXPECT_EQ(Told(), PutTexts("/b/g"));
  EXPECT_EQ(watch->Directories(), 4U);
}

TEST_F(TreeWatchTest, ANameThatIsUsedAgainAtOnce) {
  OpenSound();
  Folder("/p/d");
  Rename("/p/d", "/p/e");
  Folder("/p/d");
  (void)Told();
  Put("/p/d/f");
  EXPECT_EQ(Told(), PutTexts("/p/d/f"));
  Put("/p/e/f");
  EXPECT_EQ(Told(), PutTexts("/p/e/f"));
  EXPECT_EQ(watch->Directories(), 4U);
}

TEST_F(TreeWatchTest, OutOfTheShareAndBack) {
  Folder("/a/b");
  OpenSound();
  const std::string outside = folder + "/outside";
  ASSERT_EQ(rename((root + "/a").c_str(), outside.c_str()), 0);
  EXPECT_EQ(Told(), Texts{"from /a/"});
  EXPECT_EQ(watch->Directories(), 1U);
  WriteFile(outside + "/b/f", "x");

  ASSERT_EQ(rename(outside.c_str(), (root + "/z").c_str()), 0);
  EXPECT_EQ(Told(), Texts{"to /z/"});
  EXPECT_EQ(watch->Directories(), 3U);
  Put("/z/b/g");
  EXPECT_EQ(Told(), PutTexts("/z/b/g"));
}

TEST_F(TreeWatchTest, WhatDoesNotBelongIsNotWatched) {
  for (const char* name : {"/keep", "/no/deep/folder/x", "/#snapshot/x", "/state/x"}) {
    Folder(name);
  }
  settings.state_root = root + "/state";
  Excludes excludes;
  ASSERT_TRUE(excludes.Add("no/", error));
  settings.folders = {{"s", root, {}, excludes}, {"s", root + "/no/deep/folder", {}}};
  OpenSound();
  // The root, keep, no, no/deep, no/deep/folder and its x.
  EXPECT_EQ(watch->Directories(), 6U);

  Rename("/keep", "/no/keep");
  EXPECT_EQ(Told(), Texts{"to /keep/ -> /no/keep/"});
  EXPECT_EQ(watch->Directories(), 5U);
  Rename("/no/keep", "/keep");
  EXPECT_EQ(Told(), Texts{"to /no/keep/ -> /keep/"});
  EXPECT_EQ(watch->Directories(), 6U);
}

TEST_F(TreeWatchTest, MountsInsideAreNotEntered) {
  Folder("/a");
  MountTmpfs(root + "/m");
  MakeFolder(root + "/m/inside");
  OpenSound();
  EXPECT_EQ(watch->Directories(), 2U);
}

TEST_F(TreeWatchTest, AfterAnOverflowEverythingIsWatched) {
  Folder("/a");
  OpenSound();
  const int many = std::stoi(ReadFile("/proc/sys/fs/inotify/max_queued_events"));
  for (int i = 0; i <= many / 3; ++i) {
    Put("/a/" + std::to_string(i));
  }
  Folder("/late/r");
  Rename("/a", "/late/r/a");

  bool failed = false;
  (void)ReadAll(*watch, failed);

  EXPECT_FALSE(failed);
  EXPECT_TRUE(watch->TakeOverflow());
  EXPECT_FALSE(watch->TakeOverflow());
  EXPECT_EQ(watch->Directories(), 4U);
  Put("/late/r/a/f");
  EXPECT_EQ(Told(), PutTexts("/late/r/a/f"));
}

TEST_F(TreeWatchTest, ARootThatGoesIsAFailure) {
  OpenSound();
  ASSERT_EQ(rmdir(root.c_str()), 0);
  EXPECT_EQ(Failure(), root + " was removed");

  Folder("");
  OpenSound();
  ASSERT_EQ(rename(root.c_str(), (folder + "/moved").c_str()), 0);
  EXPECT_EQ(Failure(), root + " was moved");

  MountTmpfs(root);
  OpenSound();
  ASSERT_EQ(umount2(root.c_str(), 0), 0);
  mounted.pop_back();
  EXPECT_EQ(Failure(), root + " was unmounted");
}

TEST_F(TreeWatchTest, ADirectoryAboveThatIsMovedIsAFailure) {
  MakeFolder(folder + "/up/share");
  settings.shares[0].path = folder + "/up/share";
  OpenSound();
  ASSERT_EQ(rename((folder + "/up").c_str(), (folder + "/gone").c_str()), 0);
  EXPECT_EQ(Failure(), "a directory above " + folder + "/up/share was moved or removed");
}

TEST_F(TreeWatchTest, ARootThatIsNotThereIsRefused) {
  settings.shares[0].path = root + "/none";
  Open();
  EXPECT_EQ(watch, nullptr);
  EXPECT_EQ(error, "cannot watch " + root + "/none: No such file or directory");
}

// In a user namespace with limits of its own. Returns what `body` returns. The child is made in the
// namespace: one that has threads, as the thread sanitizer's has, cannot move into it later.
int Limited(const std::string& name, int limit, const std::function<int()>& body) {
  const auto child = static_cast<pid_t>(syscall(SYS_clone, CLONE_NEWUSER | SIGCHLD, 0, 0, 0, 0));
  if (child != 0) {
    return child < 0 ? 100 : WaitFor(child);
  }
  const ScopedFd file(open(("/proc/sys/user/" + name).c_str(), O_WRONLY | O_CLOEXEC));
  const std::string text = std::to_string(limit);
  _exit(write(file.fd, text.data(), text.size()) < 0 ? 101 : body());
}

TEST_F(TreeWatchTest, TooFewWatchesAreToldWithTheLimit) {
  Folder("/a/b/c/d/e/f/g/h/i/j/k/l/m/n/o/p");
  const int result = Limited("max_inotify_watches", 10, [&] {
    Open();
    return watch == nullptr && error.find("no watches are left (fs.inotify.max_user_watches is ") !=
                                   std::string::npos
               ? 0
               : 1;
  });
  EXPECT_EQ(result, 0);
}

TEST_F(TreeWatchTest, WatchesThatRunOutLaterAreAFailure) {
  const int result = Limited("max_inotify_watches", 10, [&] {
    Open();
    if (watch == nullptr) {
      return 1;
    }
    for (int i = 0; i < 10; ++i) {
      Folder("/" + std::to_string(i));
    }
    return Failure().find("no watches are left") != std::string::npos ? 0 : 2;
  });
  EXPECT_EQ(result, 0);
}

TEST_F(TreeWatchTest, TooFewInstancesAreToldWithTheLimit) {
  const int result = Limited("max_inotify_instances", 0, [&] {
    Open();
    return watch == nullptr && error.find("(fs.inotify.max_user_instances is ") != std::string::npos
               ? 0
               : 1;
  });
  EXPECT_EQ(result, 0);
}

}  // namespace
}  // namespace fileindexd
