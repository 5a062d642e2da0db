// SPDX-License-Identifier: GPL-2.0-or-later
#include "search/open_file.h"

#include <fcntl.h>
#include <sys/inotify.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <utility>
#include <vector>

#include "tests/unit/search/scripted.h"
#include "tests/unit/state/fixture.h"

namespace fileindexd {
namespace {

class OpenFileTest : public StateTest {
 protected:
  OpenFileTest() : path(folder + "/document.txt") {
    WriteFile(path, "some text");
    Know(path);
  }

  void Know(const std::string& known) { identity = IdentityOf(known); }
  Opening Open(const std::string& asked) {
    return OpenFile({"a", folder, ""}, asked, identity, file, reason);
  }

  // That were opened since the last call.
  static std::vector<std::string> NamesOpened(int watch) {
    std::vector<std::string> names;
    alignas(inotify_event) char events[4096];
    const ssize_t length = read(watch, events, sizeof(events));
    for (ssize_t at = 0; at < length;) {
      const auto* event = reinterpret_cast<const inotify_event*>(events + at);
      names.emplace_back(event->len != 0 ? event->name : "");
      at += static_cast<ssize_t>(sizeof(inotify_event) + event->len);
    }
    return names;
  }

  std::string path;
  FileIdentity identity;
  ScopedFd file;
  std::string reason;
};

TEST_F(OpenFileTest, TheFileThatIsKnownIsOpenedForReadingAlone) {
  ASSERT_EQ(Open(path), Opening::DONE);

  EXPECT_EQ(fcntl(file.fd, F_GETFL) & O_ACCMODE, O_RDONLY);
  EXPECT_NE(fcntl(file.fd, F_GETFD) & FD_CLOEXEC, 0);
  EXPECT_EQ(lseek(file.fd, 0, SEEK_CUR), 0);
  EXPECT_TRUE(IsStill(file.fd, identity));
}

TEST_F(OpenFileTest, AFileOfOtherIdentityIsNotOpened) {
  const FileIdentity right = identity;
  for (int64_t FileIdentity::*part :
       {&FileIdentity::birth_time, &FileIdentity::size, &FileIdentity::mtime}) {
    identity = right;
    identity.*part += 1;
    EXPECT_EQ(Open(path), Opening::CHANGED);
  }
  identity = right;
  identity.inode += 1;
  EXPECT_EQ(Open(path), Opening::CHANGED);
  EXPECT_LT(file.fd, 0);
}

TEST_F(OpenFileTest, APipeUnderADocumentsNameIsNotOpened) {
  const std::string pipe = folder + "/pipe.txt";
  ASSERT_EQ(mkfifo(pipe.c_str(), 0600), 0);
  Know(pipe);
  const ScopedFd watch(inotify_init1(IN_NONBLOCK | IN_CLOEXEC));
  ASSERT_GE(inotify_add_watch(watch.fd, folder.c_str(), IN_OPEN), 0);

  EXPECT_EQ(Open(pipe), Opening::CHANGED);
  EXPECT_EQ(NamesOpened(watch.fd), std::vector<std::string>());

  const ScopedFd opened(open(pipe.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
  EXPECT_EQ(NamesOpened(watch.fd), std::vector<std::string>{"pipe.txt"});  // it would be told
}

TEST_F(OpenFileTest, OnlyWhatTheFileIsToBlameForIsRefused) {
  const std::pair<Opening, std::vector<int>> cases[] = {
      {Opening::REFUSED, {EACCES, EPERM, EFBIG, EOVERFLOW}},
      {Opening::CHANGED, {ENOENT, ENOTDIR, ELOOP, ENAMETOOLONG, ESTALE, ENXIO, EAGAIN}},
      {Opening::UNREAD,
       {EIO, ENOTCONN, ETIMEDOUT, EHOSTDOWN, EHOSTUNREACH, ENODEV, ECONNREFUSED, EKEYEXPIRED,
        EREMOTEIO, EUCLEAN}},
      {Opening::LATER, {ENOMEM, ENOBUFS, EMFILE, ENFILE, EINTR}},
  };
  for (const auto& [opening, errors] : cases) {
    for (const int error : errors) {
      reason.clear();
      EXPECT_EQ(OpeningOfError(error, reason), opening) << error;
      EXPECT_EQ(reason.empty(), opening == Opening::CHANGED) << error;
    }
  }
}

TEST_F(OpenFileTest, LinksAreNotFollowed) {
  std::filesystem::create_symlink(path, folder + "/link.txt");
  std::filesystem::create_directory(folder + "/real");
  std::filesystem::rename(path, folder + "/real/document.txt");
  std::filesystem::create_symlink(folder + "/real", folder + "/other");

  EXPECT_EQ(Open(folder + "/link.txt"), Opening::CHANGED);
  EXPECT_EQ(Open(folder + "/other/document.txt"), Opening::CHANGED);
  EXPECT_EQ(Open(folder + "/real/document.txt"), Opening::DONE);
}

TEST_F(OpenFileTest, WhatIsGoneOrAFolderIsNotThere) {
  EXPECT_EQ(Open(folder + "/none.txt"), Opening::CHANGED);
  EXPECT_EQ(Open(folder), Opening::CHANGED);
}

TEST_F(OpenFileTest, AChangeAfterTheOpeningIsSeen) {
  ASSERT_EQ(Open(path), Opening::DONE);

  WriteFile(path, "some other text");

  EXPECT_FALSE(IsStill(file.fd, identity));
}

}  // namespace
}  // namespace fileindexd
