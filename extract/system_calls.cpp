// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/system_calls.h"

#include <fcntl.h>
#include <seccomp.h>
#include <sys/resource.h>
#include <unistd.h>

#include <cerrno>
#include <memory>

#include "extract/error_text.h"
#include "extract/sanitized.h"

namespace fileindexd {

namespace {

// By name: not every machine has each of them.
constexpr const char* ALWAYS[] = {
    // its files, its socket, files in memory
    "read", "pread64", "readv", "preadv", "preadv2", "write", "pwrite64", "writev", "pwritev",
    "lseek", "_llseek", "close", "dup", "dup2", "dup3", "ftruncate", "ftruncate64", "memfd_create",
    "recvmsg", "poll", "ppoll", "ppoll_time64", "fadvise64", "fadvise64_64", "arm_fadvise64_64",
    // looking at files
    "fstat", "fstat64", "fstatfs", "fstatfs64", "getcwd",
    // memory
    "mmap", "mmap2", "munmap", "mprotect", "mremap", "madvise", "brk",
    // the process itself
    "exit", "exit_group", "rt_sigaction", "rt_sigprocmask", "rt_sigreturn", "sigreturn",
    "sigaltstack", "restart_syscall", "futex", "futex_time64", "set_robust_list", "get_robust_list",
    "set_tid_address", "rseq", "arch_prctl", "set_tls", "set_thread_area", "get_thread_area",
    "cacheflush", "sched_yield", "sched_getaffinity", "getpid", "getppid", "gettid", "getuid",
    "geteuid", "getgid", "getegid", "getuid32", "geteuid32", "getgid32", "getegid32", "getrusage",
    "getrlimit", "ugetrlimit",
    // time, chance, the machine
    "clock_gettime", "clock_gettime64", "clock_getres", "clock_getres_time64", "gettimeofday",
    "time", "nanosleep", "clock_nanosleep", "clock_nanosleep_time64", "getrandom", "uname",
    "sysinfo"};

// What goes by a path: needs the walls of Landlock or of an own root around it. Landlock hides what
// is in files and folders, but not that they are there, nor their attributes; libraries ask for
// those of their own files, and a filter cannot see for which.
constexpr const char* BY_PATH[] = {"stat",       "stat64",     "lstat",    "lstat64",   "fstatat64",
                                   "newfstatat", "statx",      "statfs",   "statfs64",  "access",
                                   "faccessat",  "faccessat2", "getdents", "getdents64"};

// About a descriptor of its own. Not its mode, locks, seals, owner: those of a file that it was
// handed are the service's, too, and an owner is sent signals.
constexpr scmp_datum_t FILE_COMMANDS[] = {F_GETFD, F_SETFD, F_GETFL, F_DUPFD, F_DUPFD_CLOEXEC};

// Any of these bits writes, or makes a file.
constexpr scmp_datum_t WRITING = O_WRONLY | O_RDWR | O_CREAT | O_TRUNC | (O_TMPFILE & ~O_DIRECTORY);

class Filter {
 public:
  Filter() : context(seccomp_init(SCMP_ACT_ERRNO(EPERM)), &seccomp_release) {
    result = context == nullptr ? -ENOMEM : 0;
  }

  template <typename... Conditions>
  void Allow(const char* name, Conditions... conditions) {
    const int number = seccomp_syscall_resolve_name(name);
    if (result != 0 || number == __NR_SCMP_ERROR) {
      return;
    }
    const int added = seccomp_rule_add(context.get(), SCMP_ACT_ALLOW, number, sizeof...(conditions),
                                       conditions...);
    // Of another machine's.
    result = added == -EDOM || added == -EINVAL ? 0 : added;
  }

  // glibc has a second way for what it is told is not there.
  void Deny(const char* name, int failure) {
    const int number = seccomp_syscall_resolve_name(name);
    if (result == 0 && number >= 0) {
      result = seccomp_rule_add(context.get(), SCMP_ACT_ERRNO(static_cast<uint32_t>(failure)),
                                number, 0);
    }
  }

  int Load() { return result != 0 ? result : seccomp_load(context.get()); }

 private:
  std::unique_ptr<void, decltype(&seccomp_release)> context;
  int result = 0;
};

}  // namespace

bool LimitSystemCalls(const SystemCalls& calls, std::string& error) {
  Filter filter;
  for (const char* name : ALWAYS) {
    filter.Allow(name);
  }
  for (const scmp_datum_t command : FILE_COMMANDS) {
    filter.Allow("fcntl", SCMP_A1(SCMP_CMP_EQ, command));
    filter.Allow("fcntl64", SCMP_A1(SCMP_CMP_EQ, command));
  }
  if (calls.can_open_files) {
    for (const char* name : BY_PATH) {
      filter.Allow(name);
    }
    filter.Allow("openat", SCMP_A2(SCMP_CMP_MASKED_EQ, WRITING, 0));
    filter.Allow("open", SCMP_A1(SCMP_CMP_MASKED_EQ, WRITING, 0));
  } else {
    // The C library looks at descriptors through one of these, with this flag and an empty path.
    // Other attributes can be asked for so, as behind Landlock: a filter cannot see the path.
    filter.Allow("newfstatat", SCMP_A3(SCMP_CMP_MASKED_EQ, AT_EMPTY_PATH, AT_EMPTY_PATH));
    filter.Allow("fstatat64", SCMP_A3(SCMP_CMP_MASKED_EQ, AT_EMPTY_PATH, AT_EMPTY_PATH));
    filter.Allow("statx", SCMP_A2(SCMP_CMP_MASKED_EQ, AT_EMPTY_PATH, AT_EMPTY_PATH));
  }
  // Its own limits can be asked for; of them processor time alone is set anew, for each file.
  filter.Allow("prlimit64", SCMP_A0(SCMP_CMP_EQ, 0), SCMP_A2(SCMP_CMP_EQ, 0));
  filter.Allow("prlimit64", SCMP_A0(SCMP_CMP_EQ, 0), SCMP_A1(SCMP_CMP_EQ, RLIMIT_CPU));
  filter.Allow("setrlimit", SCMP_A0(SCMP_CMP_EQ, RLIMIT_CPU));
  // abort() sends its signal to itself.
  filter.Allow("tgkill", SCMP_A0(SCMP_CMP_EQ, static_cast<scmp_datum_t>(getpid())));
  if (calls.can_execute) {
    filter.Allow("execve");
  }
  if (IS_SANITIZED) {  // looks with them whether memory can be read
    filter.Allow("pipe");
    filter.Allow("pipe2");
  }
  filter.Deny("clone3", ENOSYS);
  filter.Deny("openat2", ENOSYS);

  const int failure = filter.Load();
  if (failure != 0) {
    error = "system calls: " + ErrorText(-failure);
  }
  return failure == 0;
}

}  // namespace fileindexd
