// SPDX-License-Identifier: GPL-2.0-or-later
// What a reader met is told to who writes: by a note of damage, and by a wake-up of the Worker.
#include "index/suspicion.h"

#include <sys/stat.h>
#include <utime.h>

#include <ctime>
#include <filesystem>

#include "index/contents_reader.h"
#include "index/schema.h"
#include "state/layout.h"
#include "tests/unit/index/fixture.h"

namespace fileindexd {

class SuspicionTest : public IndexTest {
 protected:
  void SetUp() override {
    IndexTest::SetUp();
    (void)remove(QueuePath("s").c_str());
    note = IndexPath("s") + "/" + SUSPICION_NOTE;
  }

  static bool Wakes(IndexError error, const std::string& share = "s") {
    TellWriter(share, error);
    return remove(QueuePath(share).c_str()) == 0;
  }
  // The name of a share of which nothing was told in this process.
  static std::string FreshShare() {
    static int shares = 0;
    std::string name = "fresh" + std::to_string(++shares);
    std::filesystem::create_directories(IndexPath(name));
    return name;
  }
  bool HasNote() const { return access(note.c_str(), F_OK) == 0; }
  void SetNoteBack(time_t seconds) {
    const time_t then = time(nullptr) - seconds;
    const utimbuf times{then, then};
    ASSERT_EQ(utime(note.c_str(), &times), 0);
  }

  std::string note;
};

TEST_F(SuspicionTest, DamageLeavesANoteAndWakesOnceAMinute) {
  EXPECT_TRUE(Wakes(IndexError::DAMAGED));
  EXPECT_TRUE(HasNote());
  EXPECT_FALSE(Wakes(IndexError::DAMAGED));
  SetNoteBack(40);
  EXPECT_FALSE(Wakes(IndexError::DAMAGED));
  SetNoteBack(61);
  EXPECT_TRUE(Wakes(IndexError::DAMAGED));
  EXPECT_FALSE(Wakes(IndexError::DAMAGED));
}

TEST_F(SuspicionTest, ANoteFromTheFutureHoldsNothingBack) {
  EXPECT_TRUE(Wakes(IndexError::DAMAGED));
  SetNoteBack(-86'400);
  EXPECT_TRUE(Wakes(IndexError::DAMAGED));
}

TEST_F(SuspicionTest, AFailedDiskAndAMissingDatabaseWakeWithoutANote) {
  const std::string share = FreshShare();
  for (const IndexError error : {IndexError::IO, IndexError::PATH_NOT_FOUND}) {
    EXPECT_TRUE(Wakes(error, share));
    EXPECT_TRUE(std::filesystem::is_empty(IndexPath(share)));
  }
}

// Who looks again whenever something happens to a share would otherwise wake itself without end.
TEST_F(SuspicionTest, WhatWasJustToldOfAShareWakesNobodyAgain) {
  for (const IndexError error : {IndexError::IO, IndexError::PATH_NOT_FOUND}) {
    const std::string share = FreshShare();
    EXPECT_TRUE(Wakes(error, share));
    EXPECT_FALSE(Wakes(error, share));
    EXPECT_TRUE(Wakes(error, FreshShare()));
  }
}

// Of no database nothing is told: it may never have been made.
TEST_F(SuspicionTest, WhatKeepsTheEntriesFromBeingOpenedIsTold) {
  const std::string share = FreshShare();
  IndexDatabase entries;
  EXPECT_EQ(OpenAndTell(entries, share), IndexError::PATH_NOT_FOUND);
  EXPECT_EQ(ContentsReader().Open(share), IndexError::PATH_NOT_FOUND);
  EXPECT_FALSE(std::filesystem::exists(QueuePath(share)));

  WriteFile(IndexPath(share) + "/" + ENTRIES_FILE, "no database at all");
  EXPECT_EQ(OpenAndTell(entries, share), IndexError::DAMAGED);
  EXPECT_TRUE(std::filesystem::exists(QueuePath(share)));
}

TEST_F(SuspicionTest, AllElseWakesNobody) {
  for (const IndexError error : {IndexError::NONE, IndexError::BUSY}) {
    EXPECT_FALSE(Wakes(error));
    EXPECT_FALSE(HasNote());
  }
}

TEST_F(SuspicionTest, NothingIsMadeOfAShareThatWasRemoved) {
  writer.reset();
  std::filesystem::remove_all(ShareFolder("s"));
  for (const IndexError error : {IndexError::DAMAGED, IndexError::PATH_NOT_FOUND}) {
    EXPECT_FALSE(Wakes(error));
  }
  EXPECT_FALSE(std::filesystem::exists(ShareFolder("s")));
}

TEST_F(SuspicionTest, DamagedContentsGetANoteOfTheirOwn) {
  std::filesystem::create_directories(ContentsPath("s"));
  TellContentsWriter("s", IndexError::IO);
  EXPECT_TRUE(std::filesystem::is_empty(ContentsPath("s")));
  TellContentsWriter("s", IndexError::DAMAGED);
  EXPECT_TRUE(std::filesystem::exists(ContentsPath("s") + "/" + SUSPICION_NOTE));
  EXPECT_FALSE(HasNote());
  EXPECT_FALSE(std::filesystem::exists(QueuePath("s")));
}

// It is looked at as a whole, and the note goes; where the note is, damage is no news any more.
TEST_F(SuspicionTest, ASoundDatabaseLosesItsNote) {
  WriteFile(At("a"), "");
  AddAll();
  writer.reset();
  EXPECT_TRUE(Wakes(IndexError::DAMAGED));
  OpenWriter();

  EXPECT_TRUE(writer->IsOpen());
  EXPECT_FALSE(HasNote());
}

}  // namespace fileindexd
