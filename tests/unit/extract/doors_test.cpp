// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/doors.h"

#include <dirent.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <seccomp.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <string>

#include "base/landlock.h"
#include "base/scoped_fd.h"
#include "doors_fixture.h"
#include "extract/converters.h"
#include "extract/own_root.h"
#include "extract/sanitized.h"

namespace fileindexd {

namespace {

std::string OpenForReading() {
  std::string open_ones;
  for (const char* path : {"/etc/passwd", "/etc/shadow", "/proc/self/maps", "/proc/1/environ",
                           "/dev/zero", "/usr/bin/env", "/tmp", "/home", "/proc", "/dev", "/etc"}) {
    open_ones += Refused(open(path, O_RDONLY | O_CLOEXEC) >= 0, path);
  }
  return open_ones;
}

std::string LookAtFiles() {
  std::string seen;
  struct stat info = {};
  struct statx more = {};
  char target[64];
  seen += Refused(stat("/etc/passwd", &info) == 0, "stat");
  seen += Refused(lstat("/etc/passwd", &info) == 0, "lstat");
  seen += Refused(statx(AT_FDCWD, "/etc/passwd", 0, STATX_ALL, &more) == 0, "statx");
  seen += Refused(access("/etc/passwd", F_OK) == 0, "access");
  seen += Refused(readlink("/proc/self/cwd", target, sizeof(target)) >= 0, "readlink");
  seen += Refused(readlink("/etc/mtab", target, sizeof(target)) >= 0, "readlink");
  return seen;
}

std::string ChangeFiles(const std::string& folder) {
  const std::string file = folder + "/file";
  const std::string made = folder + "/made";
  std::string done;
  done += Refused(open(file.c_str(), O_WRONLY | O_CLOEXEC) >= 0, "write");
  done += Refused(open(file.c_str(), O_RDONLY | O_TRUNC | O_CLOEXEC) >= 0, "truncate");
  done += Refused(open(made.c_str(), O_CREAT | O_RDWR | O_CLOEXEC, 0600) >= 0, "create");
  done += Refused(open(folder.c_str(), O_TMPFILE | O_RDWR | O_CLOEXEC, 0600) >= 0, "tmpfile");
  done += Refused(mkdir(made.c_str(), 0700) == 0, "mkdir");
  done += Refused(unlink(file.c_str()) == 0, "unlink");
  done += Refused(rename(file.c_str(), made.c_str()) == 0, "rename");
  done += Refused(link(file.c_str(), made.c_str()) == 0, "link");
  done += Refused(symlink("x", made.c_str()) == 0, "symlink");
  done += Refused(chmod(file.c_str(), 0) == 0, "chmod");
  done += Refused(truncate(file.c_str(), 0) == 0, "truncate");
  return done;
}

INSTANTIATE_TEST_SUITE_P(Walls, DoorsTest, ::testing::Values(0, 1, 2));

TEST_P(DoorsTest, NothingOfTheSystemCanBeOpened) {
  EXPECT_EQ(Behind(Kind(), OpenForReading), "");
}

TEST_P(DoorsTest, FilesAreNotSeenButBehindLandlockThatTheyAreThere) {
  const bool is_landlock = GetParam() == 0 && LandlockVersion() >= 1;
  EXPECT_EQ(Behind(Kind(), LookAtFiles), is_landlock ? "stat lstat statx access " : "");
}

TEST_P(DoorsTest, NothingCanBeChanged) {
  EXPECT_EQ(Behind(Kind(), [this] { return ChangeFiles(folder); }), "");
}

TEST_P(DoorsTest, WhatWasOpenBeforeIsRead) {
  const ScopedFd file(open((folder + "/file").c_str(), O_RDONLY | O_CLOEXEC));
  EXPECT_EQ(Behind(Kind(),
                   [&] {
                     char bytes[8] = {};
                     return read(file.fd, bytes, sizeof(bytes)) == 5 ? std::string(bytes) : "?";
                   }),
            "words");
}

// By each of the ways that one C library or another has for it.
TEST_P(DoorsTest, WhatWasOpenBeforeIsLookedAt) {
  const ScopedFd file(open((folder + "/file").c_str(), O_RDONLY | O_CLOEXEC));
  EXPECT_EQ(Behind(Kind(),
                   [&] {
                     struct stat info = {};
                     struct statx more = {};
                     std::string refused;
                     refused += fstat(file.fd, &info) == 0 ? "" : "fstat ";
                     refused += fstatat(file.fd, "", &info, AT_EMPTY_PATH) == 0 ? "" : "fstatat ";
                     refused += statx(file.fd, "", AT_EMPTY_PATH, STATX_SIZE, &more) == 0 &&
                                        more.stx_size == 5
                                    ? ""
                                    : "statx ";
                     return refused;
                   }),
            "");
}

TEST_P(DoorsTest, TheRunTimeFilesOfLibrariesAreReadWhereWallsAreLeft) {
  const std::string told = Behind(Kind(), [] {
    DIR* maps = opendir("/usr/share/poppler");
    const bool is_there = maps != nullptr && readdir(maps) != nullptr;
    return std::string(is_there ? "read" : "refused");
  });
  const bool has_walls =
      (GetParam() == 0 && LandlockVersion() >= 1) || (GetParam() < 2 && HasOwnRoots());
  EXPECT_EQ(told, has_walls ? "read" : "refused");
}

TEST_P(DoorsTest, AmountsAreBounded) {
  const std::string told = Behind(Kind(), [] {
    std::string beyond;
    if (!IS_SANITIZED) {
      void* memory =
          mmap(nullptr, ADDRESS_SPACE, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
      beyond += Refused(memory != MAP_FAILED, "memory");
    }
    const int file = memfd_create("test", MFD_CLOEXEC);
    beyond += file >= 0 && pwrite(file, "x", 1, MEMORY_FILE - 1) == 1 ? "" : "no-memory-file ";
    beyond += Refused(pwrite(file, "xx", 2, MEMORY_FILE) > 0, "long-file");
    beyond += Refused(ftruncate(file, MEMORY_FILE + 1) == 0, "longer-file");
    for (uint64_t opened = 0; opened < OPEN_FILES; ++opened) {
      (void)!dup(file);
    }
    beyond += Refused(dup(file) >= 0, "files");
    rlimit limit = {};
    beyond += Refused(getrlimit(RLIMIT_CORE, &limit) != 0 || limit.rlim_max != 0, "core");
    limit = {RLIM_INFINITY, RLIM_INFINITY};
    beyond += Refused(setrlimit(RLIMIT_FSIZE, &limit) == 0, "raised");
    beyond += Refused(getrlimit(RLIMIT_CPU, &limit) != 0 || limit.rlim_cur > PROCESSOR_SECONDS + 10,
                      "processor");
    beyond += RefreshProcessorTime() ? "" : "no-refresh ";
    limit = {RLIM_INFINITY, RLIM_INFINITY};
    beyond += Refused(setrlimit(RLIMIT_CPU, &limit) == 0, "more-processor");
    return beyond;
  });
  EXPECT_EQ(told, "");
}

TEST_P(DoorsTest, ItIsNobodyWithoutAnyRight) {
  const std::string told = Behind(Kind(), [] {
    std::string wrong;
    wrong += Refused(getuid() == 0 || geteuid() == 0 || getgid() == 0, "root");
    wrong += Refused(prctl(PR_GET_NO_NEW_PRIVS, 0, 0, 0, 0) == 0, "privileges");
    return wrong;
  });
  EXPECT_EQ(told, "");
}

TEST(ConverterDoorsTest, ThatProgramAloneIsExecuted) {
  if (LandlockVersion() < 1 && !HasOwnRoots()) {
    GTEST_SKIP() << "neither Landlock nor mount namespaces here";
  }
  Doors doors;
  doors.converter = FindConverter("catdoc");
  const std::string told = Behind(doors, [] {
    std::string done;
    for (const char* path : {"/bin/true", "/usr/bin/unrtf", "/bin/sh", "/usr/bin/python3"}) {
      const char* arguments[] = {path, nullptr};
      const char* environment[] = {nullptr};
      done += Refused(
          execve(path, const_cast<char**>(arguments), const_cast<char**>(environment)) == 0, path);
      done += errno == EACCES || errno == ENOENT ? "" : "other ";
    }
    return done;
  });
  EXPECT_EQ(told, "");
}

TEST(ConverterDoorsTest, WithoutWallsThereIsNone) {
  Doors doors;
  doors.converter = FindConverter("catdoc");
  doors.has_landlock = false;
  doors.has_namespaces = false;
  EXPECT_TRUE(
      Behind(doors, [] { return std::string("closed"); }).starts_with("not closed: neither"));
}

bool Fail(const char* call, int number) {
  const scmp_filter_ctx filter = seccomp_init(SCMP_ACT_ALLOW);
  const bool is_set = seccomp_rule_add(filter, SCMP_ACT_ERRNO(static_cast<uint32_t>(number)),
                                       seccomp_syscall_resolve_name(call), 0) == 0 &&
                      seccomp_load(filter) == 0;
  seccomp_release(filter);
  return is_set;
}

TEST(OwnRootTest, TheFirstThingInItsWayIsTold) {
  if (geteuid() != 0) {
    GTEST_SKIP() << "only the superuser becomes another user";
  }
  const auto enter = [](const char* also, int number) {
    return InChild([&] {
      if (!Fail("unshare", EPERM) || (also != nullptr && !Fail(also, number))) {
        return std::string("no filter");
      }
      std::string error;
      return EnterOwnRoot({}, error) ? "entered" : error;
    });
  };
  EXPECT_EQ(enter(nullptr, 0), "mount namespace: Operation not permitted");
  EXPECT_EQ(enter("setresuid", EAGAIN), "user: Resource temporarily unavailable");
}

}  // namespace

}  // namespace fileindexd
