// SPDX-License-Identifier: GPL-2.0-or-later
// System calls that no file can want of its reader.
#include <fcntl.h>
#include <linux/bpf.h>
#include <sched.h>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/ptrace.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/uio.h>
#include <sys/un.h>
#include <unistd.h>

#include <csignal>
#include <string>

#include "base/scoped_fd.h"
#include "doors_fixture.h"

namespace fileindexd {

namespace {

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

class DoorsCallsTest : public DoorsTest {};

INSTANTIATE_TEST_SUITE_P(Walls, DoorsCallsTest, ::testing::Values(0, 1, 2));

TEST_P(DoorsCallsTest, ThereIsNoNetwork) {
  // Of a name that no folder holds: what is in the way is not that the name is not seen.
  const ScopedFd listener(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  sockaddr_un name = {AF_UNIX, ""};
  ASSERT_EQ(bind(listener.fd, reinterpret_cast<sockaddr*>(&name), sizeof(sa_family_t)), 0);
  socklen_t length = sizeof(name);
  ASSERT_EQ(getsockname(listener.fd, reinterpret_cast<sockaddr*>(&name), &length), 0);
  const ScopedFd before(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  EXPECT_EQ(Behind(Kind(), [&] { return Communicate(before.fd, name, length); }), "");
}

TEST_P(DoorsCallsTest, NothingCanBeStarted) {
  EXPECT_EQ(Behind(Kind(), Start), "");
}

TEST_P(DoorsCallsTest, NobodyElseCanBeReached) {
  EXPECT_EQ(Behind(Kind(), Reach), "");
}

TEST_P(DoorsCallsTest, NothingElseOfTheKernelCanBeAskedFor) {
  EXPECT_EQ(Behind(Kind(), AskTheKernelForMore), "");
}

TEST_P(DoorsCallsTest, NothingIsSetOnAFileThatWasHandedOver) {
  const ScopedFd file(open((folder + "/file").c_str(), O_RDWR | O_CLOEXEC));
  EXPECT_EQ(Behind(Kind(), [&] { return Handle(file.fd); }), "");
}

}  // namespace

}  // namespace fileindexd
