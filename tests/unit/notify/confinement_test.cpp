// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/confinement.h"

#include <fcntl.h>
#include <linux/landlock.h>
#include <sys/fanotify.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <fstream>

#include "base/scoped_fd.h"
#include "state/layout.h"
#include "tests/unit/state/mounts.h"

namespace fileindexd {
namespace {

constexpr uint64_t SYS_ADMIN = uint64_t{1} << 21;
constexpr uint64_t DAC_READ_SEARCH = uint64_t{1} << 2;
constexpr uint64_t DAC_OVERRIDE = uint64_t{1} << 1;
constexpr int OTHER_USER = 65534;

long LandlockVersion() {
  return syscall(SYS_landlock_create_ruleset, nullptr, 0, LANDLOCK_CREATE_RULESET_VERSION);
}

// 0, or errno.
int Create(const std::string& path) {
  const ScopedFd file(open(path.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
  return file.fd < 0 ? errno : 0;
}

int OpenFor(const std::string& path, int flags) {
  const ScopedFd file(open(path.c_str(), flags | O_CLOEXEC));
  return file.fd < 0 ? errno : 0;
}

// The number behind "CapEff:" and the like.
uint64_t StatusNumber(const std::string& name) {
  std::ifstream status("/proc/self/status");
  for (std::string line; std::getline(status, line);) {
    if (line.starts_with(name + ":")) {
      return std::stoull(line.substr(name.size() + 1), nullptr, 16);
    }
  }
  return UINT64_MAX;
}

class ConfinementTest : public MountTest {
 protected:
  // In a child that is confined; the name of the first thing that is not as it should be goes to
  // standard error.
  static void Confined(const std::function<bool()>& body) {
    const pid_t child = Fork([&body] {
      std::string missing;
      std::string error;
      if (!Confine(missing, error)) {
        (void)fprintf(stderr, "%s\n", error.c_str());
        return 2;
      }
      if (missing.empty() != (LandlockVersion() >= 1)) {
        (void)fprintf(stderr, "missing: '%s'\n", missing.c_str());
        return 3;
      }
      return body() ? 0 : 1;
    });
    EXPECT_EQ(WaitFor(child), 0);
  }
  static bool Is(const char* what, int64_t found, int64_t wanted) {
    if (found != wanted) {
      (void)fprintf(stderr, "%s: %lld, not %lld\n", what, static_cast<long long>(found),
                    static_cast<long long>(wanted));
    }
    return found == wanted;
  }
};

TEST_F(ConfinementTest, CapabilitiesAreTheseAndNoOthers) {
  Confined([] {
    const auto wanted = static_cast<int64_t>(SYS_ADMIN | DAC_READ_SEARCH);
    bool good = true;
    for (const char* set : {"CapEff", "CapPrm", "CapBnd"}) {
      good = Is(set, static_cast<int64_t>(StatusNumber(set)), wanted) && good;
    }
    return Is("CapInh", static_cast<int64_t>(StatusNumber("CapInh")), 0) &&
           Is("CapAmb", static_cast<int64_t>(StatusNumber("CapAmb")), 0) &&
           Is("NoNewPrivs", static_cast<int64_t>(StatusNumber("NoNewPrivs")), 1) && good;
  });
}

TEST_F(ConfinementTest, ForeignStateFolderCanStillBeWritten) {
  MakeFolder(state_root);
  ASSERT_EQ(chown(state_root.c_str(), OTHER_USER, OTHER_USER), 0);
  ASSERT_EQ(chmod(state_root.c_str(), 0700), 0);

  Confined([this] {
    const auto wanted = static_cast<int64_t>(SYS_ADMIN | DAC_READ_SEARCH | DAC_OVERRIDE);
    return Is("CapEff", static_cast<int64_t>(StatusNumber("CapEff")), wanted) &&
           Is("CapBnd", static_cast<int64_t>(StatusNumber("CapBnd")), wanted) &&
           Is("create", Create(state_root + "/x"), 0);
  });
}

TEST_F(ConfinementTest, OnlyItsOwnFoldersAreWritten) {
  if (LandlockVersion() < 1) {
    GTEST_SKIP() << "the kernel has no Landlock";
  }
  MakeFile(folder + "/out/old");
  MakeFile(state_root + "/shares/a/old");

  Confined([this] {
    const std::string moved = state_root + "/moved";
    return Is("create outside", Create(folder + "/out/x"), EACCES) &&
           Is("write outside", OpenFor(folder + "/out/old", O_WRONLY), EACCES) &&
           Is("unlink outside", unlink((folder + "/out/old").c_str()) == 0 ? 0 : errno, EACCES) &&
           Is("mkdir outside", mkdir((folder + "/out/d").c_str(), 0700) == 0 ? 0 : errno, EACCES) &&
           Is("create inside", Create(state_root + "/x"), 0) &&
           Is("mkdir inside", mkdir((state_root + "/shares/b").c_str(), 0700), 0) &&
           Is("move inside", rename((state_root + "/shares/a/old").c_str(), moved.c_str()), 0) &&
           Is("cut inside", OpenFor(moved, O_WRONLY | O_TRUNC), 0) &&
           Is("unlink inside", unlink(moved.c_str()), 0) &&
           Is("/dev/null", OpenFor("/dev/null", O_WRONLY), 0);
  });
}

TEST_F(ConfinementTest, NothingElseIsCutShort) {
  if (LandlockVersion() < 3) {
    GTEST_SKIP() << "the kernel does not limit that";
  }
  MakeFile(folder + "/out/old");

  Confined([this] {
    return Is("cut", truncate((folder + "/out/old").c_str(), 0) == 0 ? 0 : errno, EACCES);
  });
}

TEST_F(ConfinementTest, RunIsWritten) {
  MountTmpfs("/run");

  Confined([] { return Is("create", Create("/run/x"), 0) && Is("unlink", unlink("/run/x"), 0); });
}

TEST_F(ConfinementTest, OthersFilesAreReadAndNotChanged) {
  const std::string path = folder + "/private/file";
  MakeFile(path);
  ASSERT_EQ(chown(path.c_str(), OTHER_USER, OTHER_USER), 0);
  ASSERT_EQ(chmod(path.c_str(), 0600), 0);
  ASSERT_EQ(chown((folder + "/private").c_str(), OTHER_USER, OTHER_USER), 0);
  ASSERT_EQ(chmod((folder + "/private").c_str(), 0700), 0);

  Confined([&path] {
    return Is("read", OpenFor(path, O_RDONLY), 0) && Is("write", OpenFor(path, O_WRONLY), EACCES) &&
           Is("chown", chown(path.c_str(), 0, 0) == 0 ? 0 : errno, EPERM) &&
           Is("chmod", chmod(path.c_str(), 0777) == 0 ? 0 : errno, EPERM);
  });
}

TEST_F(ConfinementTest, FileSystemsAreStillWatched) {
  const std::string at = folder + "/disk";
  MountTmpfs(at);

  Confined([&at] {
    const ScopedFd group(static_cast<int>(fanotify_init(
        FAN_CLASS_NOTIF | FAN_REPORT_DFID_NAME | FAN_CLOEXEC | FAN_NONBLOCK, O_RDONLY)));
    alignas(file_handle) std::array<char, sizeof(file_handle) + MAX_HANDLE_SZ> bytes = {};
    auto* handle = reinterpret_cast<file_handle*>(bytes.data());
    handle->handle_bytes = MAX_HANDLE_SZ;
    int mount_id = 0;
    const ScopedFd mount(open(at.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (!Is("mark",
            fanotify_mark(group.fd, FAN_MARK_ADD | FAN_MARK_FILESYSTEM,
                          FAN_CREATE | FAN_DELETE | FAN_ONDIR, AT_FDCWD, at.c_str()),
            0) ||
        !Is("handle", name_to_handle_at(AT_FDCWD, at.c_str(), handle, &mount_id, 0), 0)) {
      return false;
    }
    const ScopedFd opened(open_by_handle_at(mount.fd, handle, O_PATH | O_CLOEXEC));
    return Is("open by handle", opened.fd >= 0 ? 0 : errno, 0);
  });
}

TEST_F(ConfinementTest, PrivateMountsAreStillMade) {
  const std::string at = folder + "/disk";
  MountTmpfs(at);

  Confined([&at] {
    const ScopedFd clone(static_cast<int>(
        syscall(SYS_open_tree, AT_FDCWD, at.c_str(), OPEN_TREE_CLONE | O_CLOEXEC)));
    const ScopedFd context(static_cast<int>(syscall(SYS_fsopen, "tmpfs", FSOPEN_CLOEXEC)));
    if (!Is("open_tree", clone.fd >= 0 ? 0 : errno, 0) ||
        !Is("fsopen", context.fd >= 0 ? 0 : errno, 0) ||
        !Is("fsconfig", syscall(SYS_fsconfig, context.fd, FSCONFIG_CMD_CREATE, nullptr, nullptr, 0),
            0)) {
      return false;
    }
    const ScopedFd shown(static_cast<int>(syscall(SYS_fsmount, context.fd, FSMOUNT_CLOEXEC, 0)));
    return Is("fsmount", shown.fd >= 0 ? 0 : errno, 0) &&
           Is("a look", faccessat(shown.fd, ".", R_OK, 0), 0);
  });
}

}  // namespace
}  // namespace fileindexd
