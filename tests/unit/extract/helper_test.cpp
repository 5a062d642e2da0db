// SPDX-License-Identifier: GPL-2.0-or-later
// The helper itself, through the pool.
#include <fcntl.h>
#include <signal.h>
#include <sys/mount.h>
#include <sys/syscall.h>
#include <sys/wait.h>

#include <cerrno>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <sstream>

#include "pool_fixture.h"

namespace fileindexd {

namespace {

// The one child that this process has, whichever of its threads started it.
pid_t ChildOf(pid_t process) {
  pid_t child = -1;
  for (const auto& task :
       std::filesystem::directory_iterator("/proc/" + std::to_string(process) + "/task")) {
    std::ifstream children(task.path() / "children");
    pid_t found = -1;
    child = children >> found ? found : child;
  }
  return child;
}

std::string StatusLine(pid_t process, const std::string& key) {
  std::ifstream status("/proc/" + std::to_string(process) + "/status");
  for (std::string line; std::getline(status, line);) {
    if (line.starts_with(key + ":\t")) {
      return line.substr(key.size() + 2);
    }
  }
  return "";
}

std::string FieldOf(const ExtractOutcome& outcome, ContentField field) {
  for (const TextField& text : outcome.content.texts) {
    if (text.field == field) {
      return text.text;
    }
  }
  return "";
}

// With room for its root and one page. -1, with errno, where it cannot be made.
int SmallFilesystem() {
  const ScopedFd made(static_cast<int>(syscall(SYS_fsopen, "tmpfs", FSOPEN_CLOEXEC)));
  if (made.fd < 0 || syscall(SYS_fsconfig, made.fd, FSCONFIG_SET_STRING, "size", "4096", 0) != 0 ||
      syscall(SYS_fsconfig, made.fd, FSCONFIG_CMD_CREATE, nullptr, nullptr, 0) != 0) {
    return -1;
  }
  return static_cast<int>(syscall(SYS_fsmount, made.fd, FSMOUNT_CLOEXEC, 0));
}

class HelperTest : public PoolFixture {
 public:
  void SetUp() override { OpenOwn(); }

  // Each process needs its own.
  void OpenOwn(const char* program = HELPER) {
    PoolOptions options;
    options.program = program;
    options.text_cap = 1000;
    OpenPool(options);
  }

  ExtractOutcome RunFile(const std::string& name, ScopedFd& file) {
    ExtractJob job;
    job.id = 1;
    job.name = name;
    job.file = std::make_shared<ScopedFd>(file.Release());
    pool->Submit(std::move(job));
    return std::move(Await(1)[1]);
  }
};

TEST_F(HelperTest, ItStandsBehindItsDoors) {
  ASSERT_EQ(Told(Run("a.txt", "words")), "done");
  const pid_t helper = ChildOf(getpid());
  ASSERT_GT(helper, 0);
  EXPECT_EQ(StatusLine(helper, "Seccomp"), "2");
  EXPECT_EQ(StatusLine(helper, "NoNewPrivs"), "1");
  EXPECT_EQ(StatusLine(helper, "CapEff"), "0000000000000000");
  EXPECT_EQ(StatusLine(helper, "CapPrm"), "0000000000000000");
  EXPECT_EQ(StatusLine(helper, "CapBnd"), "0000000000000000");
  std::string score;
  std::ifstream("/proc/" + std::to_string(helper) + "/oom_score_adj") >> score;
  EXPECT_EQ(score, "1000");
  if (geteuid() == 0) {
    EXPECT_EQ(StatusLine(helper, "Uid"), "65534\t65534\t65534\t65534");
    EXPECT_EQ(StatusLine(helper, "Groups"), " ");
  }
}

TEST_F(HelperTest, ItDoesNotOutliveTheService) {
  const pid_t service = fork();
  if (service == 0) {
    OpenOwn();
    (void)Run("a.txt", "words");
    raise(SIGSTOP);
    _exit(0);
  }
  int status = 0;
  ASSERT_EQ(waitpid(service, &status, WUNTRACED), service);
  ASSERT_TRUE(WIFSTOPPED(status));
  const pid_t helper = ChildOf(service);
  ASSERT_GT(helper, 0);
  const ScopedFd ended(static_cast<int>(syscall(SYS_pidfd_open, helper, 0)));
  ASSERT_GE(ended.fd, 0);

  ASSERT_EQ(kill(service, SIGKILL), 0);
  ASSERT_EQ(waitpid(service, &status, 0), service);
  pollfd waiting = {ended.fd, POLLIN, 0};
  EXPECT_EQ(poll(&waiting, 1, 600'000), 1);
}

TEST_F(HelperTest, TheSampleTellsWhetherFilesAreTheSame) {
  std::string bytes(500'000, 'x');
  const uint64_t sample = Run("a.txt", bytes).content.sample;
  EXPECT_EQ(Run("b.dat", bytes).content.sample, sample);
  EXPECT_NE(Run("a.txt", bytes + "x").content.sample, sample);
  for (const size_t at : {size_t{0}, bytes.size() / 2, bytes.size() - 1}) {
    std::string other = bytes;
    other[at] = 'y';
    EXPECT_NE(Run("a.txt", other).content.sample, sample) << at;
  }
  EXPECT_NE(Run("a.txt", "").content.sample, Run("a.txt", "x").content.sample);
}

TEST_F(HelperTest, TextIsCutAtTheCap) {
  std::string long_text;
  while (long_text.size() < 5'000'000) {
    long_text += "words and more ";
  }
  const ExtractOutcome outcome = Run("a.txt", long_text);
  EXPECT_EQ(Told(outcome), "done");
  EXPECT_TRUE(outcome.content.is_cut);
  EXPECT_LE(outcome.content.text.size(), 1000u);
  EXPECT_GT(outcome.content.text.size(), 980u);
}

TEST_F(HelperTest, WhatNoReaderIsForIsDoneWithoutContent) {
  const std::string rows[] = {std::string("\x7F"
                                          "ELF\2\1\1\0\0\0\0\0\0\0\0\0\2\0\x3E\0",
                                          20),
                              std::string(100, '\0'), "\x01\x02\x03\x04\x80\x81\xFE\xFF\x05\x06"};
  for (const std::string& bytes : rows) {
    const ExtractOutcome outcome = Run("thing", bytes);
    EXPECT_EQ(Told(outcome), "done");
    EXPECT_EQ(outcome.content.kind, Kind::OTHER);
    EXPECT_TRUE(outcome.content.text.empty());
  }
}

TEST_F(HelperTest, WhatTheDiskDoesNotGiveIsNoFailureOfTheFile) {
  for (const char* name : {"a.txt", "a", "a.pdf", "a.mp3"}) {
    const ScopedFd file = FileOf("words");
    ScopedFd unreadable(open(("/proc/self/fd/" + std::to_string(file.fd)).c_str(), O_WRONLY));
    ASSERT_GE(unreadable.fd, 0);
    const ExtractOutcome outcome = RunFile(name, unreadable);
    EXPECT_EQ(Told(outcome), "unread: cannot be read: Bad file descriptor") << name;
    EXPECT_EQ(outcome.content.sample, 0U);
  }
}

// Beyond the parts that are sampled: what has no size has none. Nothing lies at the beginning of a
// process's memory.
TEST_F(HelperTest, WhatTheDiskDoesNotGiveAReaderIsNoFailureOfTheFile) {
  ScopedFd memory(open("/proc/self/mem", O_RDONLY | O_CLOEXEC));
  ASSERT_GE(memory.fd, 0);
  EXPECT_EQ(Told(RunFile("README", memory)), "unread: cannot be read: Input/output error");
}

// The library is given a mapping. No page is left for the second part of this file: reading finds a
// hole there, and looking at it fails as it does on a disk that is gone.
TEST_F(HelperTest, APageThatTheDiskDoesNotGiveIsNoFailureOfTheFile) {
  const ScopedFd folder(SmallFilesystem());
  if (folder.fd < 0) {
    GTEST_SKIP() << "no file system can be made here: " << strerror(errno);
  }
  ScopedFd file(openat(folder.fd, "a.tif", O_RDWR | O_CREAT | O_CLOEXEC, 0600));
  constexpr std::string_view HEAD("II*\0\0\0\x08\0", 8);  // where the rest lies
  ASSERT_EQ(write(file.fd, HEAD.data(), HEAD.size()), static_cast<ssize_t>(HEAD.size()));
  ASSERT_EQ(ftruncate(file.fd, 1 << 20), 0);

  EXPECT_EQ(Told(RunFile("a.tif", file)), "unread: cannot be read: Input/output error");
  EXPECT_EQ(Told(Run("a.txt", "words")), "done");
}

TEST_F(HelperTest, ContentTellsWhereTheNameDoesNot) {
  const struct {
    const char* name;
    const char* bytes;
    const char* text;
  } rows[] = {
      {"README", "some plain words\n", "some plain words"},
      {"page", "<!DOCTYPE html><html><body><p>A pa<b>ge</b></body></html>", "A page"},
      {"drawing.pdf", "just a few words of text\n", "just a few words of text"},
      {"main.ts", "import quay from 'sea';\nexport const tide = 1;\n",
       "import quay from 'sea'; export const tide = 1;"},
      {"old.xml", "this is no markup\n", "this is no markup"},
      {"letter.txt", "{\\rtf1\\ansi\\pard Dear Sir\\par}", "{\\rtf1\\ansi\\pard Dear Sir\\par}"},
  };
  for (const auto& row : rows) {
    const ExtractOutcome outcome = Run(row.name, row.bytes);
    EXPECT_EQ(Told(outcome), "done") << row.name;
    EXPECT_EQ(outcome.content.text, row.text) << row.name;
    EXPECT_EQ(outcome.content.kind, Kind::DOCUMENT) << row.name;
  }
}

// As a note it would count as read, and not be read when the kernel has what confines its reader.
TEST_F(HelperTest, WhatIsLeftOutIsNoNoteThoughItsNameHasNoEnding) {
  OpenOwn(WITHOUT_WALLS);
  for (const char* bytes :
       {"{\\rtf1\\ansi\\pard Dear Sir\\par}", "%PDF-1.4\n1 0 obj <</Type /Catalog>> endobj\n"}) {
    const ExtractOutcome outcome = Run("letter", bytes);
    EXPECT_TRUE(Told(outcome).starts_with("failed: left out: ")) << Told(outcome);
    EXPECT_EQ(outcome.content.text, "");
  }
  EXPECT_EQ(Run("letter", "Xref: see the other list\n").content.text, "Xref: see the other list");
}

TEST_F(HelperTest, AConverterReadsBehindTheSameDoors) {
  const ExtractOutcome outcome =
      Run("letter.rtf",
          "{\\rtf1\\ansi\\ansicpg1252{\\info{\\title A title}{\\author Me}}"
          "Caf\\'e9 w\\u1086\\'3f {\\b bo}ld\\par next}");
  EXPECT_EQ(Told(outcome), "done");
  EXPECT_EQ(outcome.content.text, "Caf\xC3\xA9 w\xD0\xBE bold next");
  EXPECT_EQ(FieldOf(outcome, ContentField::TITLE), "A title");
  EXPECT_EQ(outcome.content.kind, Kind::DOCUMENT);
  EXPECT_NE(outcome.content.sample, 0u);
}

}  // namespace

}  // namespace fileindexd
