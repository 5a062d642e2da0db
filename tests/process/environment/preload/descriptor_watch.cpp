// SPDX-License-Identifier: GPL-2.0-or-later
// Watches who opens and who closes each descriptor of the daemon. Wrong is to close
//
//   - a number that nothing is open under, or that the C library has opened for itself;
//   - on a Worker's thread, what is not of its own share;
//   - on the main thread, what a Worker's thread has opened, but for the share's index, which goes
//     with the Worker.
//
// Whose a descriptor is tells its path, below shares/NAME or the folder NAME of the disk; that of a
// pipe, the thread that made it. A thread is of the share that it opens something of first.
#include <dirent.h>
#include <sys/inotify.h>
#include <sys/socket.h>

#include <atomic>
#include <climits>
#include <cstdarg>
#include <cstdint>
#include <cstdio>
#include <mutex>

#include "tests/process/environment/preload/next.h"

namespace {

constexpr int MAX_DESCRIPTORS = 4096;
constexpr size_t NAME_SIZE = 32;
constexpr size_t PATH_SIZE = 256;

struct Page {
  std::atomic<uint64_t> closed;
  std::atomic<uint64_t> wrong;
  char first[4000];  // what was wrong first
};

struct Opened {
  bool open = false;
  pid_t opener = 0;
  char share[NAME_SIZE] = {};  // empty: of none
  char path[PATH_SIZE] = {};
};

Page* watch_log = nullptr;  // set before main; what is opened earlier is not watched

[[gnu::constructor]] void MapLog() {
  watch_log = preload::MapPage<Page>("DESCRIPTOR_WATCH");
}

std::mutex& Mutex() {
  static std::mutex& mutex = *new std::mutex;  // threads may outlive main
  return mutex;
}

Opened table[MAX_DESCRIPTORS];
thread_local char thread_share[NAME_SIZE] = {};

pid_t ThisThread() {
  return static_cast<pid_t>(syscall(SYS_gettid));
}

bool IsMainThread() {
  return ThisThread() == getpid();
}

// The share that a path is of: the component behind "/shares/" or "/data/"; empty for none.
void ShareOfPath(const char* path, char* share) {
  share[0] = '\0';
  for (const char* place : {"/shares/", "/data/"}) {
    const char* found = strstr(path, place);
    if (found != nullptr) {
      const char* name = found + strlen(place);
      snprintf(share, NAME_SIZE, "%.*s", static_cast<int>(strcspn(name, "/ ")), name);
    }
  }
}

// What it leads to.
void ReadLink(int fd, char* path) {
  char link[32];
  snprintf(link, sizeof(link), "/proc/self/fd/%d", fd);
  const ssize_t size = readlink(link, path, PATH_SIZE - 1);
  path[size > 0 ? size : 0] = '\0';
}

void Describe(int fd, Opened& opened) {
  ReadLink(fd, opened.path);
  opened.open = true;
  opened.opener = ThisThread();
  ShareOfPath(opened.path, opened.share);
  if (IsMainThread()) {
    return;
  }
  if (thread_share[0] == '\0') {
    memcpy(thread_share, opened.share, NAME_SIZE);
  }
}

int NoteOpened(int fd) {
  if (watch_log != nullptr && fd >= 0 && fd < MAX_DESCRIPTORS) {
    const int error = errno;
    const std::lock_guard guard(Mutex());
    table[fd] = {};
    Describe(fd, table[fd]);
    errno = error;
  }
  return fd;
}

const char* WhatIsWrong(const Opened& opened) {
  if (!opened.open) {
    return "nobody opened it";
  }
  if (opened.opener == ThisThread()) {
    return nullptr;
  }
  if (IsMainThread()) {
    return opened.share[0] != '\0' && strstr(opened.path, "/index/") == nullptr ? "a Worker's"
                                                                                : nullptr;
  }
  return opened.share[0] == '\0' || strcmp(opened.share, thread_share) != 0 ? "a stranger's"
                                                                            : nullptr;
}

// Before the close: after it the number may be another's.
void NoteClosing(int fd) {
  Page* log = watch_log;
  if (log == nullptr || fd < 0 || fd >= MAX_DESCRIPTORS) {
    return;
  }
  const int error = errno;
  const std::lock_guard guard(Mutex());
  Opened& opened = table[fd];
  const char* wrong = WhatIsWrong(opened);
  ++log->closed;
  if (wrong != nullptr && log->wrong++ == 0) {
    char now[PATH_SIZE];
    ReadLink(fd, now);
    snprintf(log->first, sizeof(log->first),
             "%d: %s, closed by thread %d of '%s', opened by %d of '%s' as %s, now %s", fd, wrong,
             ThisThread(), thread_share, opened.opener, opened.share, opened.path, now);
  }
  opened = {};
  errno = error;
}

template <typename Function>
Function* Library(const char* name, Function* like) {
  return preload::Next(name, like);
}

mode_t ModeOf(int flags, va_list arguments) {
  return (flags & (O_CREAT | O_TMPFILE)) != 0 ? va_arg(arguments, mode_t) : 0;
}

using Open = int(const char*, int, ...);
using OpenAt = int(int, const char*, int, ...);
using Control = int(int, int, ...);
using OpenStream = FILE*(const char*, const char*);

}  // namespace

// By their names in the library: headers may have given a name another meaning.
extern "C" {

#define WATCHED_OPEN(ours, name)                            \
  int ours(const char* path, int flags, ...) __asm__(name); \
  int ours(const char* path, int flags, ...) {              \
    va_list arguments;                                      \
    va_start(arguments, flags);                             \
    const mode_t mode = ModeOf(flags, arguments);           \
    va_end(arguments);                                      \
    static Open* const next = Library<Open>(name, nullptr); \
    return NoteOpened(next(path, flags, mode));             \
  }
WATCHED_OPEN(WatchedOpen, "open")
WATCHED_OPEN(WatchedOpen64, "open64")
WATCHED_OPEN(WatchedOpen2, "__open_2")
WATCHED_OPEN(WatchedOpen642, "__open64_2")

#define WATCHED_OPENAT(ours, name)                                      \
  int ours(int folder, const char* path, int flags, ...) __asm__(name); \
  int ours(int folder, const char* path, int flags, ...) {              \
    va_list arguments;                                                  \
    va_start(arguments, flags);                                         \
    const mode_t mode = ModeOf(flags, arguments);                       \
    va_end(arguments);                                                  \
    static OpenAt* const next = Library<OpenAt>(name, nullptr);         \
    return NoteOpened(next(folder, path, flags, mode));                 \
  }
WATCHED_OPENAT(WatchedOpenAt, "openat")
WATCHED_OPENAT(WatchedOpenAt64, "openat64")
WATCHED_OPENAT(WatchedOpenAt2, "__openat_2")
WATCHED_OPENAT(WatchedOpenAt642, "__openat64_2")

#define WATCHED_STREAM(ours, name)                                      \
  FILE* ours(const char* path, const char* mode) __asm__(name);         \
  FILE* ours(const char* path, const char* mode) {                      \
    static OpenStream* const next = Library<OpenStream>(name, nullptr); \
    FILE* stream = next(path, mode);                                    \
    if (stream != nullptr) {                                            \
      NoteOpened(fileno(stream));                                       \
    }                                                                   \
    return stream;                                                      \
  }
WATCHED_STREAM(WatchedStream, "fopen")
WATCHED_STREAM(WatchedStream64, "fopen64")

int WatchedControl(int fd, int command, ...) __asm__("fcntl64");
int WatchedControl(int fd, int command, ...) {
  va_list arguments;
  va_start(arguments, command);
  void* argument = va_arg(arguments, void*);
  va_end(arguments);
  static auto* const next = Library<Control>("fcntl64", nullptr);
  const int result = next(fd, command, argument);
  return command == F_DUPFD || command == F_DUPFD_CLOEXEC ? NoteOpened(result) : result;
}

DIR* opendir(const char* path) {
  static auto* const next = Library("opendir", opendir);
  DIR* folder = next(path);
  if (folder != nullptr) {
    NoteOpened(dirfd(folder));
  }
  return folder;
}

int socket(int domain, int type, int protocol) noexcept {
  static auto* const next = Library("socket", socket);
  return NoteOpened(next(domain, type, protocol));
}

int accept4(int fd, sockaddr* address, socklen_t* size, int flags) {
  static auto* const next = Library("accept4", accept4);
  return NoteOpened(next(fd, address, size, flags));
}

int inotify_init() noexcept {
  static auto* const next = Library("inotify_init", inotify_init);
  return NoteOpened(next());
}

int pipe2(int* ends, int flags) noexcept {
  static auto* const next = Library("pipe2", pipe2);
  const int result = next(ends, flags);
  if (result == 0) {
    NoteOpened(ends[0]);
    NoteOpened(ends[1]);
  }
  return result;
}

// Puts one in the place of another, which it closes.
int dup3(int from, int to, int flags) noexcept {
  static auto* const next = Library("dup3", dup3);
  NoteClosing(to);
  return NoteOpened(next(from, to, flags));
}

int close(int fd) {
  static auto* const next = Library("close", close);
  NoteClosing(fd);
  return next(fd);
}

int closedir(DIR* folder) {
  static auto* const next = Library("closedir", closedir);
  NoteClosing(dirfd(folder));
  return next(folder);
}

int fclose(FILE* stream) {
  static auto* const next = Library("fclose", fclose);
  NoteClosing(fileno(stream));
  return next(stream);
}

long syscall(long number, ...) noexcept {
  va_list arguments;
  va_start(arguments, number);
  long given[6];
  for (long& argument : given) {
    argument = va_arg(arguments, long);
  }
  va_end(arguments);

  static auto* const next = Library("syscall", syscall);
  if (number == SYS_close) {
    NoteClosing(static_cast<int>(given[0]));
  }
  const long result = next(number, given[0], given[1], given[2], given[3], given[4], given[5]);
  if (number == SYS_openat || number == SYS_openat2 || number == SYS_pidfd_open) {
    NoteOpened(static_cast<int>(result));
  }
  return result;
}

}  // extern "C"
