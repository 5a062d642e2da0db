// SPDX-License-Identifier: GPL-2.0-or-later
// Calls of the C library that a test can let fail, by definitions of our own in front of it.
//
// The answer that a test gives for one of these names is the error that the call ends with; sleeps
// with any answer take no time. Without an answer the library's own function does the work. Calls
// are counted from the first thing that a test tells.
#include <dirent.h>
#include <dlfcn.h>
#include <poll.h>
#include <pthread.h>
#include <sys/file.h>
#include <sys/inotify.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <new>
#include <string>

#include "scripted/script.h"

namespace {

using fileindexd::scripted::TheScript;

template <typename Function>
Function* Library(const char* name, Function* /*kind*/) {
  return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

// True when the call shall fail, with errno set. `subject`: by which a test can tell calls apart.
bool Fails(const char* name, const std::string& subject = "") {
  const auto error = TheScript().EnterUnrecorded(name, subject);
  if (error) {
    errno = *error;
  }
  return error.has_value();
}

using CondWait = int(pthread_cond_t*, pthread_mutex_t*);

[[gnu::noinline]] CondWait* EnterCondWait(const pthread_cond_t* cond) {
  if (cond != &TheScript().changed) {
    TheScript().EnterUnrecorded("pthread_cond_wait", "");
  }
  return Library<CondWait>("pthread_cond_wait", nullptr);
}

}  // namespace

// The kind that answers null; any answer of a test fails it.
void* operator new(size_t size, const std::nothrow_t& /*kind*/) noexcept {
  if (Fails("operator new")) {
    return nullptr;
  }
  try {
    return ::operator new(size);
  } catch (const std::bad_alloc&) {
    return nullptr;
  }
}

extern "C" {

int flock(int fd, int operation) noexcept {
  return Fails("flock") ? -1 : Library("flock", flock)(fd, operation);
}

int rename(const char* from, const char* to) noexcept {
  return Fails("rename") ? -1 : Library("rename", rename)(from, to);
}

unsigned sleep(unsigned seconds) {
  TheScript().RecordWait("sleep", seconds);
  return Fails("sleep") ? 0 : Library("sleep", sleep)(seconds);
}

int usleep(useconds_t time) {
  TheScript().RecordWait("usleep", time);
  return Fails("usleep") ? 0 : Library("usleep", usleep)(time);
}

time_t time(time_t* now) noexcept {
  (void)Fails("time");  // only counted
  return Library("time", time)(now);
}

DIR* opendir(const char* path) {
  return Fails("opendir") ? nullptr : Library("opendir", opendir)(path);
}

int closedir(DIR* dir) {
  (void)Fails("closedir");  // only counted
  return Library("closedir", closedir)(dir);
}

#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wdeprecated-declarations"
int readdir64_r(DIR* dir, dirent64* entry, dirent64** result) {
  const auto error = TheScript().EnterUnrecorded("readdir64_r", "");
  return error ? *error : Library("readdir64_r", readdir64_r)(dir, entry, result);
}
#pragma GCC diagnostic pop

int daemon(int nochdir, int noclose) noexcept {
  const auto error = TheScript().EnterUnrecorded("daemon", "");
  if (!error) {
    return Library("daemon", daemon)(nochdir, noclose);
  }
  errno = *error;
  return *error == 0 ? 0 : -1;  // told to do nothing: a test stays in its own process
}

int socket(int domain, int type, int protocol) noexcept {
  return Fails("socket") ? -1 : Library("socket", socket)(domain, type, protocol);
}

int bind(int fd, const sockaddr* address, socklen_t size) noexcept {
  return Fails("bind") ? -1 : Library("bind", bind)(fd, address, size);
}

int listen(int fd, int backlog) noexcept {
  return Fails("listen", std::to_string(backlog)) ? -1 : Library("listen", listen)(fd, backlog);
}

int accept4(int fd, sockaddr* address, socklen_t* size, int flags) {
  return Fails("accept4") ? -1 : Library("accept4", accept4)(fd, address, size, flags);
}

int poll(pollfd* fds, nfds_t count, int timeout_ms) {
  return Fails("poll") ? -1 : Library("poll", poll)(fds, count, timeout_ms);
}

int ppoll(pollfd* fds, nfds_t count, const timespec* timeout, const sigset_t* mask) {
  const std::string time = std::to_string(timeout->tv_sec) + "." + std::to_string(timeout->tv_nsec);
  return Fails("ppoll", time) ? -1 : Library("ppoll", ppoll)(fds, count, timeout, mask);
}

int unlink(const char* path) noexcept {
  return Fails("unlink", path) ? -1 : Library("unlink", unlink)(path);
}

void srand(unsigned seed) noexcept {
  (void)Fails("srand");  // only counted
  Library("srand", srand)(seed);
}

int inotify_init() noexcept {
  return Fails("inotify_init") ? -1 : Library("inotify_init", inotify_init)();
}

// The two initialisers and the thread functions return their error.
int pthread_mutex_init(pthread_mutex_t* mutex, const pthread_mutexattr_t* kind) noexcept {
  const auto error = TheScript().EnterUnrecorded("pthread_mutex_init", "");
  return error ? *error : Library("pthread_mutex_init", pthread_mutex_init)(mutex, kind);
}

int pthread_cond_init(pthread_cond_t* cond, const pthread_condattr_t* kind) noexcept {
  const auto error = TheScript().EnterUnrecorded("pthread_cond_init", "");
  if (!error && kind == nullptr) {
    *cond = PTHREAD_COND_INITIALIZER;  // the library has two versions of this name
  }
  return error.value_or(kind == nullptr ? 0 : EINVAL);
}

int pthread_create(pthread_t* thread, const pthread_attr_t* kind, void* (*entry)(void*),
                   void* argument) noexcept {
  const auto error = TheScript().EnterUnrecorded("pthread_create", "");
  return error ? *error : Library("pthread_create", pthread_create)(thread, kind, entry, argument);
}

// Any answer: the wait for a thread ends at once when the thread has not ended. Without one it is
// longer than what was asked for: on a busy machine a thread may take as long.
int pthread_timedjoin_np(pthread_t thread, void** result, const timespec* until) {
  TheScript().RecordWait("pthread_timedjoin_np", until->tv_sec);
  const auto at_once = TheScript().EnterUnrecorded("pthread_timedjoin_np", "");
  timespec limit = *until;
  if (at_once) {
    clock_gettime(CLOCK_REALTIME, &limit);
  } else {
    limit.tv_sec += fileindexd::scripted::AWAIT_LIMIT_S;
  }
  return Library("pthread_timedjoin_np", pthread_timedjoin_np)(thread, result, &limit);
}

// Told about, so that a test knows that a thread waits: once it has the thread's mutex itself.
// Not instrumented: a cancelled thread unwinds through this frame, and the address sanitizer takes
// what such a frame leaves on the stack for an overflow.
__attribute__((no_sanitize("address"))) int pthread_cond_wait(pthread_cond_t* cond,
                                                              pthread_mutex_t* mutex) {
  return EnterCondWait(cond)(cond, mutex);
}

}  // extern "C"

// A Worker's start mutex is locked by one thread and unlocked by another, by design; the thread
// sanitizer's deadlock detector goes on counting it as held, and ends the process at 64.
extern "C" const char* __tsan_default_options() {
  return "detect_deadlocks=0";
}
