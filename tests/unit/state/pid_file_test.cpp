// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/pid_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <csignal>
#include <filesystem>

#include "tests/unit/state/fixture.h"

namespace fileindexd {
namespace {

class PidFileTest : public StateTest {
 protected:
  PidFileTest() : pid_file(folder + "/x.pid"), program(folder + "/sleeper") {
    std::filesystem::copy_file("/bin/sleep", program);
  }

  // Starts a copy of sleep under the name "sleeper"; returns when it runs that program.
  pid_t Start() {
    int ends[2];
    EXPECT_EQ(pipe2(ends, O_CLOEXEC), 0);
    const pid_t child = fork();
    if (child == 0) {
      execl(program.c_str(), "sleeper", "1000", nullptr);
      _exit(1);
    }
    close(ends[1]);
    char byte = 0;
    EXPECT_EQ(read(ends[0], &byte, 1), 0);  // the exec closes the child's end
    close(ends[0]);
    return child;
  }

  static void End(pid_t child) {
    kill(child, SIGKILL);
    waitpid(child, nullptr, 0);
  }

  std::string pid_file;
  std::string program;
};

TEST_F(PidFileTest, OwnRecordIsAliveUnderItsOwnName) {
  char self[PATH_MAX] = {};
  ASSERT_GT(readlink("/proc/self/exe", self, sizeof self - 1), 0);
  const mode_t before = umask(0077);
  ASSERT_TRUE(WritePidFile(pid_file));
  umask(before);

  EXPECT_EQ(ReadFile(pid_file), std::to_string(getpid()) + "\n");
  EXPECT_EQ(ModeOf(pid_file), 0644U);
  EXPECT_EQ(AliveByPidFile(pid_file, std::filesystem::path(self).filename()), getpid());
  EXPECT_EQ(AliveByPidFile(pid_file, "fileindexd"), 0);
}

TEST_F(PidFileTest, AProgramThatWasReplacedWhileItRunsCounts) {
  const pid_t child = Start();
  WriteFile(pid_file, std::to_string(child) + "\n");
  std::filesystem::remove(program);

  EXPECT_EQ(AliveByPidFile(pid_file, "sleeper"), child);
  EXPECT_EQ(AliveByPidFile(pid_file, "sleep"), 0);
  End(child);
}

TEST_F(PidFileTest, AProcessThatEndedIsNotAlive) {
  const pid_t child = Start();
  WriteFile(pid_file, std::to_string(child) + "\n");
  kill(child, SIGKILL);
  siginfo_t info;
  ASSERT_EQ(waitid(P_PID, static_cast<id_t>(child), &info, WEXITED | WNOWAIT), 0);

  EXPECT_EQ(AliveByPidFile(pid_file, "sleeper"), 0);  // ended, not collected
  waitpid(child, nullptr, 0);
  EXPECT_EQ(AliveByPidFile(pid_file, "sleeper"), 0);
}

TEST_F(PidFileTest, WithoutAFileNobodyIsAlive) {
  EXPECT_EQ(AliveByPidFile(pid_file, "x"), 0);
}

TEST_F(PidFileTest, AFileThatRecordsNobodyIsNobody) {
  for (const char* bad :
       {"", "\n", "0\n", "-1\n", "x\n", "12x\n", " 1\n", "1 2\n", "99999999999999999999\n"}) {
    WriteFile(pid_file, bad);
    EXPECT_EQ(AliveByPidFile(pid_file, "sleeper"), 0) << bad;
  }
}

TEST_F(PidFileTest, AFileThatCannotBeReadIsAFailure) {
  std::filesystem::create_directory(pid_file);
  EXPECT_LT(AliveByPidFile(pid_file, "x"), 0);
  EXPECT_EQ(errno, EISDIR);
}

TEST_F(PidFileTest, WritingReplacesWhatIsThereOrFails) {
  WriteFile(pid_file, "123456789012345678901234567890\n");
  EXPECT_TRUE(WritePidFile(pid_file));
  EXPECT_EQ(ReadFile(pid_file), std::to_string(getpid()) + "\n");

  EXPECT_FALSE(WritePidFile(folder + "/none/x.pid"));
  EXPECT_EQ(errno, ENOENT);
}

}  // namespace
}  // namespace fileindexd
