// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/belonging.h"

#include <fcntl.h>
#include <sys/fsuid.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>

#include "base/scoped_fd.h"
#include "state/filesystem.h"
#include "state/open_path.h"
#include "state/statx_look.h"
#include "tests/unit/state/mounts.h"
#include "tests/unit/state/slow_looks.h"

namespace fileindexd {
namespace {

class BelongingTest : public MountTest {
 protected:
  // The look with its folder seen anew, and the one after it, have to say the same.
  Verdict At(const std::string& below) {
    const Look look = LookAt(settings, root + below);
    FolderView view;
    for (int again = 0; again < 2; ++again) {
      const Look near = LookNear(settings, root + below, view);
      EXPECT_EQ(near.verdict, look.verdict) << below;
      EXPECT_EQ(near.thing, look.thing) << below;
      EXPECT_EQ(near.inode, look.inode) << below;
      EXPECT_EQ(near.mount_root, look.mount_root) << below;
    }
    return look.verdict;
  }
};

TEST(NameRuleTest, PreservedAndPassingNames) {
  for (const char* name : {"#snapshot", ".snapshots", "lost+found"}) {
    EXPECT_TRUE(IsPreservedName(name)) << name;
    EXPECT_FALSE(IsPassingName(name)) << name;
  }
  for (const char* name : {".nfs", ".nfs0001", ".fuse_hidden", ".fuse_hidden01", "~$", "~$a.docx",
                           ".~lock.a.odt#", ".~lock.#"}) {
    EXPECT_TRUE(IsPassingName(name)) << name;
    EXPECT_FALSE(IsPreservedName(name)) << name;
  }
}

TEST(NameRuleTest, OtherNamesAreOrdinary) {
  for (const char* name : {"",
                           "a",
                           "snapshot",
                           "#snapshots",
                           "#snapshot ",
                           "#Snapshot",
                           ".snapshot",
                           "snapshots",
                           "lost+found2",
                           "LOST+FOUND",
                           "nfs0001",
                           "x.nfs",
                           "fuse_hidden",
                           "~a",
                           "$a",
                           "a~$",
                           ".~lock.a.odt",
                           ".~lock",
                           "~lock.a#",
                           ".lock.a#",
                           "a#"}) {
    EXPECT_FALSE(IsPreservedName(name)) << name;
    EXPECT_FALSE(IsPassingName(name)) << name;
  }
}

TEST(JudgeNameTest, PatternsOfTheDeepestFolderKeepOut) {
  Settings settings;
  settings.shares = {{"s", "/v/s", ""}};
  settings.folders = {{"s", "/v/s", {}}, {"s", "/v/s/build/inner", {}}};
  std::string error;
  ASSERT_TRUE(settings.folders[0].excludes.Add("build/", error));
  ASSERT_TRUE(settings.folders[0].excludes.Add("*.o", error));
  ASSERT_TRUE(settings.folders[1].excludes.Add("/x", error));
  for (const auto& [path, verdict] : std::vector<std::pair<std::string, Verdict>>{
           {"/v/s", Verdict::BELONGS},
           {"/v/s/a", Verdict::BELONGS},
           {"/v/s/a.o", Verdict::EXCLUDED},
           {"/v/s//d/a.o/", Verdict::EXCLUDED},
           {"/v/s/build", Verdict::BELONGS},  // may be a file
           {"/v/s/build/a", Verdict::EXCLUDED},
           {"/v/s/build/.nfs1", Verdict::SKIPPED_NAME},
           {"/v/s/build/inner", Verdict::BELONGS},
           {"/v/s/build/inner/a.o", Verdict::BELONGS},
           {"/v/s/build/inner/x/y", Verdict::EXCLUDED},
           {"/v/s/build/inner2", Verdict::EXCLUDED},
       }) {
    EXPECT_EQ(JudgeName(settings, path), verdict) << path;
  }
  EXPECT_TRUE(settings.HasFolderBelow("/v/s/build"));
  EXPECT_TRUE(settings.HasFolderBelow("/"));
  EXPECT_FALSE(settings.HasFolderBelow("/v/s/build/inner"));
  EXPECT_FALSE(settings.HasFolderBelow("/v/s/buil"));
}

int64_t At(int64_t seconds, uint32_t nanoseconds) {
  statx_timestamp time{};
  time.tv_sec = seconds;
  time.tv_nsec = nanoseconds;
  return Nanoseconds(time);
}

TEST(StatxLookTest, TimesBeyondSixtyFourBitsAreTheLastAndTheFirst) {
  constexpr int64_t LAST_SECOND = 9'223'372'036;  // in April 2262
  EXPECT_EQ(At(LAST_SECOND, 854'775'807), INT64_MAX);
  EXPECT_EQ(At(LAST_SECOND, 854'775'808), INT64_MAX);
  EXPECT_EQ(At(253'402'300'799, 0), INT64_MAX);
  EXPECT_EQ(At(-LAST_SECOND - 2, 0), INT64_MIN);
  EXPECT_EQ(At(-1, 5), -999'999'995);
}

// The time that it is kept for begins when it was seen, not when it was asked for.
TEST_F(BelongingTest, AFolderThatWasSeenSlowlyIsKept) {
  MakeFile(root + "/d/a");
  MakeFile(root + "/d/b");
  struct statx host {};
  ASSERT_EQ(statx(AT_FDCWD, root.c_str(), 0, UNIQUE_MOUNT_ID, &host), 0);
  if ((host.stx_mask & UNIQUE_MOUNT_ID) == 0) {
    GTEST_SKIP() << "mount numbers are given again here";
  }
  FolderView view;
  const SlowLooks slow(4'000'000);
  LookNear(settings, root + "/d/a", view);
  ASSERT_NE(view.seen_time, 0);
  const int looks = SlowLooks::Count();

  EXPECT_EQ(LookNear(settings, root + "/d/b", view).verdict, Verdict::BELONGS);

  EXPECT_EQ(SlowLooks::Count(), looks + 1);
}

TEST_F(BelongingTest, APatternForDirectoriesAsksTheDisk) {
  MakeFolder(root + "/build");
  MakeFile(root + "/d/build");
  std::string error;
  ASSERT_TRUE(settings.folders[0].excludes.Add("build/", error));

  EXPECT_EQ(At("/build"), Verdict::EXCLUDED);
  EXPECT_EQ(At("/build/none"), Verdict::EXCLUDED);
  EXPECT_EQ(At("/d/build"), Verdict::BELONGS);
  EXPECT_EQ(LookPastExcludes(settings, root + "/build").verdict, Verdict::BELONGS);
  EXPECT_EQ(LookPastExcludes(settings, root + "/build").thing, Thing::DIRECTORY);
  EXPECT_EQ(LookPastExcludes(settings, root + "/none").verdict, Verdict::GONE);
}

TEST_F(BelongingTest, APatternThatTakesInDirectoriesAsksTheDisk) {
  MakeFile(root + "/file");
  MakeFile(root + "/d/file");
  MakeFile(root + "/d/a.txt");
  std::string error;
  for (const char* pattern : {"*", "!*/", "!*.txt"}) {
    ASSERT_TRUE(settings.folders[0].excludes.Add(pattern, error));
  }

  EXPECT_EQ(At("/d"), Verdict::BELONGS);
  EXPECT_EQ(At("/d/a.txt"), Verdict::BELONGS);
  EXPECT_EQ(At("/file"), Verdict::EXCLUDED);
  EXPECT_EQ(At("/d/file"), Verdict::EXCLUDED);
  EXPECT_EQ(At("/none"), Verdict::GONE);
  FolderView view;
  EXPECT_EQ(LookNear(settings, root + "/d", view).verdict, Verdict::BELONGS);
  EXPECT_EQ(LookNear(settings, root + "/d/file", view).verdict, Verdict::EXCLUDED);
}

TEST(JudgeNameTest, EveryVerdictThatLettersCanGive) {
  Settings settings;
  settings.shares = {{"lost+found", "/v/lost+found", ""}, {"s", "/v/s", ""}};
  settings.folders = {{"lost+found", "/v/lost+found", {}}, {"s", "/v/s/a", {}}};
  settings.state_root = "/v/s/a/state";
  const struct {
    std::string path;
    Verdict verdict;
  } rows[] = {
      {"/v/s/a", Verdict::BELONGS},
      {"/v/s/a/b", Verdict::BELONGS},
      {"/v//s/a/b/", Verdict::BELONGS},
      {"/v/lost+found", Verdict::BELONGS},
      {"/v/lost+found/x", Verdict::BELONGS},
      {"/v/s/a/statement", Verdict::BELONGS},
      {"", Verdict::BAD_PATH},
      {"v/s/a", Verdict::BAD_PATH},
      {"/v/s/a/.", Verdict::BAD_PATH},
      {"/v/s/a/../a/b", Verdict::BAD_PATH},
      {std::string("/v/s/a/\0b", 9), Verdict::BAD_PATH},
      {"/", Verdict::NO_SHARE},
      {"/v", Verdict::NO_SHARE},
      {"/v/ss/a", Verdict::NO_SHARE},
      {"/v/s/a/state", Verdict::OWN_STATE},
      {"/v/s/a/state/#snapshot", Verdict::OWN_STATE},
      {"/v/s", Verdict::NOT_COVERED},
      {"/v/s/ab", Verdict::NOT_COVERED},
      {"/v/s/b/~$x", Verdict::NOT_COVERED},
      {"/v/s/a/~$x", Verdict::SKIPPED_NAME},
      {"/v/s/a/#snapshot/b/c", Verdict::SKIPPED_NAME},
      {"/v/lost+found/lost+found", Verdict::SKIPPED_NAME},
      {"/v/s/a/b/.nfs1/c", Verdict::SKIPPED_NAME},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(JudgeName(settings, row.path), row.verdict) << row.path;
    if (row.verdict != Verdict::BELONGS) {
      EXPECT_EQ(LookAt(settings, row.path).verdict, row.verdict) << row.path;
    }
  }
}

TEST_F(BelongingTest, ThingsOfAllKindsAreSeenAsTheyAre) {
  MakeFile(root + "/dir/file");
  std::filesystem::create_hard_link(root + "/dir/file", root + "/dir/second");
  std::filesystem::create_symlink("nowhere", root + "/link");
  struct stat st {};
  ASSERT_EQ(stat((root + "/dir/file").c_str(), &st), 0);

  const Look file = LookAt(settings, root + "/dir/file");
  EXPECT_EQ(file.verdict, Verdict::BELONGS);
  EXPECT_EQ(file.thing, Thing::FILE);
  EXPECT_EQ(file.inode, st.st_ino);
  EXPECT_EQ(file.links, 2U);
  EXPECT_EQ(file.size, 4);
  EXPECT_EQ(file.mtime, st.st_mtim.tv_sec * 1'000'000'000 + st.st_mtim.tv_nsec);
  EXPECT_EQ(file.mode, st.st_mode & 07777);
  EXPECT_EQ(file.device, st.st_dev);
  EXPECT_EQ(LookAt(settings, root).thing, Thing::DIRECTORY);
  EXPECT_EQ(LookAt(settings, root + "/dir").thing, Thing::DIRECTORY);
  EXPECT_EQ(At("/link"), Verdict::BELONGS);
  EXPECT_EQ(LookAt(settings, root + "/link").thing, Thing::LINK);
}

TEST_F(BelongingTest, WhatIsNotThereIsGone) {
  MakeFile(root + "/file");
  EXPECT_EQ(At("/none"), Verdict::GONE);
  EXPECT_EQ(At("/none/none"), Verdict::GONE);
  EXPECT_EQ(At("/file/none"), Verdict::GONE);
  EXPECT_EQ(At("/" + std::string(256, 'x')), Verdict::GONE);
  EXPECT_EQ(At("/" + std::string(5000, 'x')), Verdict::GONE);
  std::filesystem::remove_all(root);
  EXPECT_EQ(At(""), Verdict::GONE);
}

TEST_F(BelongingTest, SpecialFilesDoNotBelong) {
  ASSERT_EQ(mkfifo((root + "/pipe").c_str(), 0600), 0);
  ASSERT_EQ(mknod((root + "/device").c_str(), S_IFCHR | 0600, makedev(1, 3)), 0);
  const ScopedFd socket_fd(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  ASSERT_LT((root + "/socket").copy(address.sun_path, sizeof address.sun_path - 1),
            sizeof address.sun_path);
  ASSERT_EQ(bind(socket_fd.fd, reinterpret_cast<sockaddr*>(&address), sizeof address), 0);

  for (const char* name : {"/pipe", "/device", "/socket"}) {
    EXPECT_EQ(At(name), Verdict::SPECIAL_FILE) << name;
    EXPECT_EQ(ThingAt(settings, root + name), Thing::NONE) << name;
  }
}

TEST_F(BelongingTest, NothingBehindALinkInTheShareBelongs) {
  MakeFile(root + "/dir/file");
  std::filesystem::create_symlink(root + "/dir", root + "/link");
  std::filesystem::create_symlink("loop", root + "/loop");

  EXPECT_EQ(At("/link/file"), Verdict::BEHIND_LINK);
  EXPECT_EQ(At("/link/none"), Verdict::BEHIND_LINK);
  EXPECT_EQ(At("/loop/file"), Verdict::BEHIND_LINK);
  EXPECT_EQ(At("/loop"), Verdict::BELONGS);
  EXPECT_EQ(ThingAt(settings, root + "/link/file"), Thing::NONE);
}

TEST_F(BelongingTest, LinksAtAndAboveTheRootAreAllowed) {
  MakeFile(root + "/dir/file");
  std::filesystem::create_symlink("dir", root + "/inner");
  std::filesystem::create_symlink(folder, folder + "/above");
  std::filesystem::create_symlink(root, folder + "/at");
  std::filesystem::create_symlink("cycle", folder + "/cycle");
  for (const std::string& path : {folder + "/above/share", folder + "/at"}) {
    settings.shares[0].path = path;
    settings.folders[0].path = path;
    EXPECT_EQ(LookAt(settings, path).thing, Thing::DIRECTORY) << path;
    EXPECT_EQ(LookAt(settings, path + "/dir/file").verdict, Verdict::BELONGS) << path;
    EXPECT_EQ(LookAt(settings, path + "/none").verdict, Verdict::GONE) << path;
    EXPECT_EQ(LookAt(settings, path + "/inner").verdict, Verdict::BELONGS) << path;
    EXPECT_EQ(LookAt(settings, path + "/inner/file").verdict, Verdict::BEHIND_LINK) << path;
    EXPECT_EQ(ThingAt(settings, path + "/dir/file"), Thing::FILE) << path;
  }
  settings.shares[0].path = settings.folders[0].path = folder + "/cycle";
  EXPECT_EQ(LookAt(settings, folder + "/cycle/file").verdict, Verdict::GONE);
  EXPECT_EQ(LookAtRoot(settings.shares[0]), RootState::MISSING);
}

TEST_F(BelongingTest, OpeningByComponentsSaysTheSame) {
  MakeFile(root + "/dir/file");
  std::filesystem::create_symlink("dir", root + "/link");
  std::filesystem::create_symlink(root, folder + "/at");
  for (const std::string& top : {root, folder + "/at", std::string("/")}) {
    const std::string prefix = top == "/" ? root : top;
    for (const char* below : {"", "/dir", "/dir/file", "/link", "/link/file", "/none", "/none/x",
                              "/dir/file/x", "/link/none"}) {
      const ScopedFd one(OpenInShare(top, prefix + below));
      const int reason = one.fd < 0 ? errno : 0;
      const ScopedFd other(OpenByComponents(top, prefix + below));
      EXPECT_EQ(other.fd < 0 ? errno : 0, reason) << top << " " << below;
      struct stat a {};
      struct stat b {};
      if (reason == 0) {
        ASSERT_TRUE(fstat(one.fd, &a) == 0 && fstat(other.fd, &b) == 0);
        EXPECT_EQ(a.st_ino, b.st_ino) << below;
      }
    }
  }
}

TEST_F(BelongingTest, ACallThatFailsNeverMeansGone) {
  MakeFile(root + "/dir/file");
  std::filesystem::permissions(root + "/dir", std::filesystem::perms::none);
  setfsuid(65534);  // takes root's rights over files along, for this thread

  const Verdict verdict = At("/dir/file");
  const int reason = errno;

  setfsuid(0);
  EXPECT_EQ(verdict, Verdict::UNKNOWN);
  EXPECT_EQ(reason, EACCES);
}

TEST_F(BelongingTest, AMountPointBelongsAndNothingBelowIt) {
  MakeFile(root + "/a/file");
  MakeFile(root + "/b");
  MountTmpfs(root + "/mnt");
  MakeFile(root + "/mnt/deep/file");
  MountTmpfs(root + "/mnt/deep2");

  EXPECT_EQ(At("/mnt"), Verdict::BELONGS);
  EXPECT_EQ(LookAt(settings, root + "/mnt").thing, Thing::DIRECTORY);
  EXPECT_EQ(At("/mnt/deep"), Verdict::BELOW_MOUNT);
  EXPECT_EQ(At("/mnt/deep/file"), Verdict::BELOW_MOUNT);
  EXPECT_EQ(At("/mnt/deep2"), Verdict::BELOW_MOUNT);
  EXPECT_EQ(At("/mnt/none"), Verdict::GONE);
  Bind(root + "/a", root + "/mnt");  // over the first one
  EXPECT_EQ(At("/mnt"), Verdict::BELONGS);
  EXPECT_EQ(At("/mnt/file"), Verdict::BELOW_MOUNT);
  Bind(root + "/a/file", root + "/b");
  EXPECT_EQ(At("/b"), Verdict::BELONGS);
  EXPECT_EQ(LookAt(settings, root + "/b").thing, Thing::FILE);
}

TEST_F(BelongingTest, MountsAreNoticedAtOnce) {
  MakeFile(root + "/x/file");
  ASSERT_EQ(At("/x/file"), Verdict::BELONGS);

  MountTmpfs(root + "/x");
  MakeFile(root + "/x/file");
  EXPECT_EQ(At("/x/file"), Verdict::BELOW_MOUNT);
  Unmount(root + "/x");
  EXPECT_EQ(At("/x/file"), Verdict::BELONGS);

  MountTmpfs(root);  // another file system at the share itself
  EXPECT_EQ(At("/x/file"), Verdict::GONE);
  MakeFile(root + "/x/file");
  EXPECT_EQ(At("/x/file"), Verdict::BELONGS);
  Unmount(root);
  EXPECT_EQ(At("/x/file"), Verdict::BELONGS);
}

TEST_F(BelongingTest, TheRootIsSoundForeignOrMissing) {
  const std::string place = folder + "/disk";
  MountImage("ext4", place);
  MakeFile(place + "/file");
  const Share share = {"s", place, FilesystemIdentity(place)};
  ASSERT_FALSE(share.filesystem.empty());
  EXPECT_EQ(LookAtRoot(share), RootState::SOUND);

  Unmount(place);
  EXPECT_EQ(LookAtRoot(share), RootState::FOREIGN);
  std::filesystem::remove(place);
  EXPECT_EQ(LookAtRoot(share), RootState::MISSING);
  WriteFile(place, "a file in its place");
  EXPECT_EQ(LookAtRoot(share), RootState::MISSING);
  EXPECT_EQ(LookAtRoot({"s", place + "/below", "x"}), RootState::MISSING);

  std::filesystem::remove(place);
  std::filesystem::create_directory(place);
  Run("mount -o loop " + last_image + " " + place);
  mounted.push_back(place);
  EXPECT_EQ(LookAtRoot(share), RootState::SOUND);
}

TEST_F(BelongingTest, ARootThatCannotBeReachedIsUnknown) {
  MakeFolder(folder + "/closed/share");
  std::filesystem::permissions(folder + "/closed", std::filesystem::perms::none);
  setfsuid(65534);
  const RootState state = LookAtRoot({"s", folder + "/closed/share", "x"});
  setfsuid(0);
  EXPECT_EQ(state, RootState::UNKNOWN);
}

TEST_F(BelongingTest, ExistenceNeedsNoCoverage) {
  MakeFile(root + "/dir/file");
  MakeFile(folder + "/outside/file");
  std::filesystem::create_symlink("outside", folder + "/link");
  settings.folders.clear();

  EXPECT_EQ(ThingAt(settings, root + "/dir/file"), Thing::FILE);
  EXPECT_EQ(ThingAt(settings, root + "/dir"), Thing::DIRECTORY);
  EXPECT_EQ(ThingAt(settings, folder + "/outside/file"), Thing::FILE);
  EXPECT_EQ(ThingAt(settings, folder + "/link"), Thing::LINK);
  EXPECT_EQ(ThingAt(settings, folder + "/link/file"), Thing::FILE);
  EXPECT_EQ(ThingAt(settings, root + "/none"), Thing::NONE);
  EXPECT_EQ(ThingAt(settings, "relative"), Thing::NONE);
  EXPECT_EQ(ThingAt(settings, root + "/../share"), Thing::NONE);
}

TEST_F(BelongingTest, APathOfFourThousandBytesBelongs) {
  std::string path = root;
  ScopedFd at(open(root.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  while (path.size() + 201 < 4000) {
    const std::string name(200, 'd');
    ASSERT_EQ(mkdirat(at.fd, name.c_str(), 0700), 0);
    ScopedFd next(openat(at.fd, name.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    at.Swap(next);
    path += "/" + name;
  }
  const std::string last(4000 - path.size() - 1, 'f');
  const ScopedFd file(openat(at.fd, last.c_str(), O_CREAT | O_WRONLY | O_CLOEXEC, 0600));
  ASSERT_GE(file.fd, 0);
  path += "/" + last;
  ASSERT_EQ(path.size(), 4000U);

  EXPECT_EQ(LookAt(settings, path).thing, Thing::FILE);
  EXPECT_EQ(LookAt(settings, path).verdict, Verdict::BELONGS);
  EXPECT_EQ(ThingAt(settings, path), Thing::FILE);
  EXPECT_EQ(LookAt(settings, path + std::string(90, 'x')).verdict, Verdict::GONE);
}

}  // namespace
}  // namespace fileindexd
