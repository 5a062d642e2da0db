// SPDX-License-Identifier: GPL-2.0-or-later
// What stands behind a function that a preloaded library defines in front of it.
#pragma once

#include <dlfcn.h>
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>

namespace preload {

// The definition behind ours, of the type of `like`.
template <typename Function>
Function* Next(const char* name, Function* /*like*/) {
  return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

// The page of the file that the variable names, shared with the test; null outside the daemon. The
// test has made the file.
template <typename Page>
Page* MapPage(const char* variable) {
  const char* path = getenv(variable);  // NOLINT(concurrency-mt-unsafe): before main
  if (path == nullptr || strcmp(program_invocation_short_name, "fileindexd") != 0) {
    return nullptr;
  }

  const auto fd = static_cast<int>(syscall(SYS_openat, AT_FDCWD, path, O_RDWR | O_CLOEXEC));
  void* page = mmap(nullptr, sizeof(Page), PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
  syscall(SYS_close, fd);
  return page == MAP_FAILED ? nullptr : static_cast<Page*>(page);
}

}  // namespace preload
