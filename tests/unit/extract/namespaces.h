// SPDX-License-Identifier: GPL-2.0-or-later
// What this host lets its processes have, for tests that cannot go without.
#pragma once

#include <gtest/gtest.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/wait.h>
#include <unistd.h>

namespace fileindexd {

inline bool SucceedsInChild(bool (*attempt)()) {
  const pid_t child = fork();
  if (child == 0) {
    _exit(attempt() ? 0 : 1);
  }
  int status = 1;
  EXPECT_EQ(waitpid(child, &status, 0), child);
  return status == 0;
}

inline bool MayMount() {
  return mount(nullptr, "/", nullptr, MS_PRIVATE | MS_REC, nullptr) == 0;
}

// Whether everybody may have a user namespace, and mount in it.
inline bool HasUserNamespaces() {
  return SucceedsInChild([] {
    return (geteuid() != 0 || setresuid(65534, 65534, 65534) == 0) &&
           unshare(CLONE_NEWUSER | CLONE_NEWNS) == 0 && MayMount();
  });
}

// Whether whoever runs the tests may have a root folder of its own.
inline bool HasOwnRoots() {
  return SucceedsInChild([] { return unshare(CLONE_NEWNS) == 0 && MayMount(); }) ||
         HasUserNamespaces();
}

}  // namespace fileindexd
