// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/passed_files.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <sys/socket.h>
#include <sys/stat.h>

#include <array>
#include <cerrno>
#include <string>

#include "tests/scripted/few_descriptors.h"

namespace fileindexd {

namespace {

class PassedFilesTest : public ::testing::Test {
 public:
  void SetUp() override {
    int ends[2] = {-1, -1};
    ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends), 0);
    ours.fd = ends[0];
    theirs.fd = ends[1];
    for (ScopedFd& file : sent) {
      file.fd = memfd_create("sent", MFD_CLOEXEC);
      ASSERT_GE(file.fd, 0);
    }
    lowest_free = LowestFree();
  }

  bool Send(size_t files) {
    std::array<int, MOST_PASSED_FILES> numbers = {};
    for (size_t i = 0; i < files; ++i) {
      numbers[i] = sent[i].fd;
    }
    return SendWithFiles(ours.fd, "words", {numbers.data(), files});
  }

  ssize_t Receive(std::span<ScopedFd> files) { return ReceiveWithFiles(theirs.fd, bytes, files); }

  static bool IsSame(const ScopedFd& one, const ScopedFd& other) {
    struct stat of_one {};
    struct stat of_other {};
    return fstat(one.fd, &of_one) == 0 && fstat(other.fd, &of_other) == 0 &&
           of_one.st_ino == of_other.st_ino;
  }

  // What is left open by nobody shows in it.
  static int LowestFree() { return ScopedFd(fcntl(STDIN_FILENO, F_DUPFD_CLOEXEC, 0)).fd; }

  ScopedFd ours;
  ScopedFd theirs;
  std::array<ScopedFd, MOST_PASSED_FILES> sent;
  std::array<ScopedFd, MOST_PASSED_FILES> received;
  char bytes[16] = {};
  int lowest_free = -1;
};

TEST_F(PassedFilesTest, FilesComeInTheirOrderWithTheBytes) {
  ASSERT_TRUE(Send(2));
  ASSERT_EQ(Receive(received), 5);
  EXPECT_EQ(std::string(bytes, 5), "words");
  EXPECT_TRUE(IsSame(received[0], sent[0]));
  EXPECT_TRUE(IsSame(received[1], sent[1]));
  EXPECT_EQ(received[2].fd, -1);
  EXPECT_EQ(fcntl(received[0].fd, F_GETFD), FD_CLOEXEC);
}

TEST_F(PassedFilesTest, AMessageWithoutFilesTakesTheOldOnesAway) {
  ASSERT_TRUE(Send(3) && Send(0));
  ASSERT_EQ(Receive(received), 5);
  ASSERT_EQ(Receive(received), 5);
  EXPECT_EQ(received[0].fd, -1);
  EXPECT_EQ(LowestFree(), lowest_free);
}

TEST_F(PassedFilesTest, AMessageWithMoreFilesThanThereIsRoomForIsLost) {
  ASSERT_TRUE(Send(2));
  EXPECT_EQ(Receive({received.data(), 1}), -1);
  EXPECT_EQ(errno, EMFILE);
  EXPECT_EQ(received[0].fd, -1);
  EXPECT_EQ(LowestFree(), lowest_free);
}

TEST_F(PassedFilesTest, AMessageOfWhichAFileCannotBeHadIsLost) {
  ASSERT_TRUE(Send(3));
  ssize_t length = 0;
  int error = 0;
  {
    const scripted::FewDescriptors one(1);
    length = Receive(received);
    error = errno;
  }
  EXPECT_EQ(length, -1);
  EXPECT_EQ(error, EMFILE);
  EXPECT_EQ(received[0].fd, -1);
  EXPECT_EQ(LowestFree(), lowest_free);
}

TEST_F(PassedFilesTest, TheEndIsToldAndSendingToNobodyFails) {
  ours.Close();
  EXPECT_EQ(Receive(received), 0);
  ours.Swap(theirs);
  EXPECT_FALSE(Send(1));
  EXPECT_EQ(errno, EPIPE);
}

}  // namespace

}  // namespace fileindexd
