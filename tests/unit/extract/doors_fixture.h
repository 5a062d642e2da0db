// SPDX-License-Identifier: GPL-2.0-or-later
// What can be done behind closed doors, tried by processes that have closed theirs.
#pragma once

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <functional>
#include <string>

#include "base/scoped_fd.h"
#include "extract/doors.h"
#include "tests/unit/extract/namespaces.h"

namespace fileindexd {

// Said after everything else: who has become another program, or has died, does not say it.
constexpr char END_MARK = '.';

// Everything here is tried by a process of its own, and told through a pipe.
inline std::string InChild(const std::function<std::string()>& attempt) {
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

inline std::string Behind(Doors doors, const std::function<std::string()>& attempt) {
  doors.parent = getpid();
  return InChild([&] {
    std::string error;
    return CloseDoors(doors, error) ? attempt() : "not closed: " + error;
  });
}

// "" when it was refused.
inline std::string Refused(bool succeeded, const char* what) {
  return succeeded ? std::string(what) + " " : "";
}

// "" when no system call came of it. Other errors are those of a call that was let through.
inline std::string Forbidden(long result, const char* what) {
  const int number = errno;
  if (result >= 0) {
    return std::string(what) + " ";
  }
  return number == EPERM ? "" : std::string(what) + "(" + std::to_string(number) + ") ";
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
    if (GetParam() == 1 && !HasOwnRoots()) {
      GTEST_SKIP() << "no mount namespaces here";
    }
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
    if (folder.empty()) {
      return;
    }
    (void)unlink((folder + "/file").c_str());
    EXPECT_EQ(rmdir(folder.c_str()), 0);
  }

  std::string folder;
};

}  // namespace fileindexd
