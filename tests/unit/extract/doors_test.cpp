// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/doors.h"

#include <arpa/inet.h>
#include <dirent.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <linux/bpf.h>
#include <seccomp.h>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/ptrace.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <functional>
#include <string>

#include "base/landlock.h"
#include "base/scoped_fd.h"
#include "extract/converters.h"
#include "extract/own_root.h"
#include "extract/sanitized.h"

namespace fileindexd {

namespace {

// Said after everything else: who has become another program, or has died, does not say it.
constexpr char END_MARK = '.';

// Everything here is tried by a process of its own, and told through a pipe.
std::string InChild(const std::function<std::string()>& attempt) {
  int ends[2] = {-1, -1};
  EXPECT_EQ(pipe2(ends, O_CLOEXEC), 0);
  ScopedFd reading(ends[0]);
  ScopedFd writing(ends[1]);
  const pid_t child = fork();
  if (child == 0) {
    const std::string told = attempt() + END_MARK;
    (void)!write(writing.fd, told.data(), told.size());
    _exit(0);
  }

  writing.Close();
  std::string told;
  char buffer[512];
  for (ssize_t length = 0; (length = read(reading.fd, buffer, sizeof(buffer))) > 0;) {
    told.append(buffer, static_cast<size_t>(length));
  }
  int status = 0;
  waitpid(child, &status, 0);
  if (!told.ends_with(END_MARK)) {
    return told + " ended early, with " + std::to_string(status);
  }
  told.pop_back();
  return status == 0 ? told : told + " ended with " + std::to_string(status);
}

std::string Behind(Doors doors, const std::function<std::string()>& attempt) {
  doors.parent = getpid();
  return InChild([&] {
    std::string error;
    return CloseDoors(doors, error) ? attempt() : "not closed: " + error;
  });
}

// "" when it was refused.
std::string Refused(bool succeeded, const char* what) {
  return succeeded ? std::string(what) + " " : "";
}

// "" when no system call came of it. Other errors are those of a call that was let through.
std::string Forbidden(long result, const char* what) {
  const int number = errno;
  if (result >= 0) {
    return std::string(what) + " ";
  }
  return number == EPERM ? "" : std::string(what) + "(" + std::to_string(number) + ") ";
}

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

std::string Communicate(int before, const sockaddr_un& listener, socklen_t length) {
  std::string done;
  for (const int family : {AF_INET, AF_INET6, AF_UNIX, AF_NETLINK, AF_PACKET}) {
    done += Forbidden(socket(family, SOCK_STREAM, 0), "stream");
    done += Forbidden(socket(family, SOCK_RAW, 0), "raw");
  }
  done +=
      Forbidden(connect(before, reinterpret_cast<const sockaddr*>(&listener), length), "connect");
  done += Forbidden(sendto(before, "x", 1, 0, reinterpret_cast<const sockaddr*>(&listener), length),
                    "send");
  int pair[2];
  done += Forbidden(socketpair(AF_UNIX, SOCK_STREAM, 0, pair), "socketpair");
  return done;
}

std::string Start() {
  std::string done;
  const pid_t forked = fork();
  done += Forbidden(forked, "fork");
  if (forked == 0) {
    _exit(0);
  }
  const char* arguments[] = {"true", nullptr};
  done += Forbidden(execv("/bin/true", const_cast<char**>(arguments)), "execve");
  done += Forbidden(syscall(SYS_execveat, -100, "/bin/true", arguments, nullptr, 0), "execveat");
  return done;
}

// At itself, where anybody may in the open.
std::string Reach() {
  std::string done;
  done += Forbidden(ptrace(PTRACE_TRACEME, 0, nullptr, nullptr), "ptrace");
  done += Forbidden(kill(getpid(), 0), "kill");
  done += Forbidden(syscall(SYS_tgkill, getppid(), getppid(), 0), "tgkill");
  done += Forbidden(syscall(SYS_pidfd_open, getpid(), 0), "pidfd");
  char from = 0;
  char into = 0;
  iovec ours = {&into, 1};
  iovec other = {&from, 1};
  done += Forbidden(syscall(SYS_process_vm_readv, getpid(), &ours, 1, &other, 1, 0), "vm_readv");
  done += Forbidden(mount("none", "/tmp", "tmpfs", 0, nullptr), "mount");
  done += Forbidden(unshare(CLONE_NEWUSER), "unshare");
  done += Forbidden(setuid(getuid()), "setuid");
  return done;
}

std::string AskTheKernelForMore() {
  std::string done;
  bpf_attr map = {};
  map.map_type = BPF_MAP_TYPE_ARRAY;
  map.key_size = map.value_size = 4;
  map.max_entries = 1;
  done += Forbidden(syscall(SYS_bpf, BPF_MAP_CREATE, &map, sizeof(map)), "bpf");
  done += Forbidden(syscall(SYS_bpf, BPF_MAP_CREATE, nullptr, 0), "bpf");
  alignas(8) char parameters[256] = {};  // more than an io_uring_params
  done += Forbidden(syscall(SYS_io_uring_setup, 1, parameters), "io_uring");
  done += Forbidden(syscall(SYS_io_uring_setup, 1, nullptr), "io_uring");
  done += Forbidden(syscall(SYS_perf_event_open, nullptr, 0, -1, -1, 0), "perf");
  done += Forbidden(syscall(SYS_keyctl, 0, -3, 1), "keyctl");
  return done;
}

std::string Handle(int file) {
  std::string done;
  flock lock = {};
  lock.l_type = F_RDLCK;
  done += Forbidden(fcntl(file, F_SETFL, O_NONBLOCK), "mode");
  done += Forbidden(fcntl(file, F_SETLK, &lock), "lock");
  done += Forbidden(fcntl(file, F_OFD_SETLK, &lock), "lock");
  done += Forbidden(fcntl(file, F_SETOWN, getpid()), "owner");
  done += Forbidden(fcntl(file, F_SETSIG, SIGTERM), "signal");
  done += Forbidden(fcntl(file, F_SETLEASE, F_RDLCK), "lease");
  done += Forbidden(fcntl(file, F_NOTIFY, DN_MODIFY), "notify");
  done += Forbidden(fcntl(file, F_SETPIPE_SZ, 1 << 20), "pipe");
  const int memory = memfd_create("test", MFD_CLOEXEC | MFD_ALLOW_SEALING);
  done += Forbidden(fcntl(memory, F_ADD_SEALS, F_SEAL_WRITE), "seal");
  // The C library's streams look at these.
  done += fcntl(file, F_GETFL) >= 0 && fcntl(file, F_GETFD) >= 0 ? "" : "no-look ";
  done += fcntl(file, F_DUPFD_CLOEXEC, 0) >= 0 ? "" : "no-copy ";
  return done;
}

class DoorsTest : public ::testing::TestWithParam<int> {
 public:
  // 0: as this kernel has them; 1: without Landlock; 2: without namespaces too.
  static Doors Kind() {
    Doors doors;
    doors.has_landlock = GetParam() == 0;
    doors.has_namespaces = GetParam() < 2;
    return doors;
  }

  void SetUp() override {
    char made[] = "/tmp/extract-doors-XXXXXX";
    ASSERT_NE(mkdtemp(made), nullptr);
    folder = made;
    ASSERT_EQ(chmod(made, 0777), 0);
    const std::string file = folder + "/file";
    ScopedFd opened(open(file.c_str(), O_CREAT | O_RDWR | O_CLOEXEC, 0666));
    ASSERT_EQ(fchmod(opened.fd, 0666), 0);
    ASSERT_EQ(write(opened.fd, "words", 5), 5);
  }
  void TearDown() override {
    (void)unlink((folder + "/file").c_str());
    EXPECT_EQ(rmdir(folder.c_str()), 0);
  }

  std::string folder;
};

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

TEST_P(DoorsTest, ThereIsNoNetwork) {
  // Of a name that no folder holds: what is in the way is not that the name is not seen.
  const ScopedFd listener(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  sockaddr_un name = {AF_UNIX, ""};
  ASSERT_EQ(bind(listener.fd, reinterpret_cast<sockaddr*>(&name), sizeof(sa_family_t)), 0);
  socklen_t length = sizeof(name);
  ASSERT_EQ(getsockname(listener.fd, reinterpret_cast<sockaddr*>(&name), &length), 0);
  const ScopedFd before(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  EXPECT_EQ(Behind(Kind(), [&] { return Communicate(before.fd, name, length); }), "");
}

TEST_P(DoorsTest, NothingCanBeStarted) {
  EXPECT_EQ(Behind(Kind(), Start), "");
}

TEST_P(DoorsTest, NobodyElseCanBeReached) {
  EXPECT_EQ(Behind(Kind(), Reach), "");
}

TEST_P(DoorsTest, NothingElseOfTheKernelCanBeAskedFor) {
  EXPECT_EQ(Behind(Kind(), AskTheKernelForMore), "");
}

TEST_P(DoorsTest, NothingIsSetOnAFileThatWasHandedOver) {
  const ScopedFd file(open((folder + "/file").c_str(), O_RDWR | O_CLOEXEC));
  EXPECT_EQ(Behind(Kind(), [&] { return Handle(file.fd); }), "");
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
  EXPECT_EQ(told, GetParam() < 2 ? "read" : "refused");
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
