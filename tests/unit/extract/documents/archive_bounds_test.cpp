// SPDX-License-Identifier: GPL-2.0-or-later
// What reading an archive may cost.
#include <archive.h>
#include <archive_entry.h>

#include "extract/nested.h"
#include "tests/unit/extract/documents/fixture.h"
#include "tests/unit/extract/documents/packing.h"

namespace fileindexd {

namespace {

// One member of so many zeros, then another.
std::string LongOnesFirst(const Packing& packing, int64_t zeros) {
  std::string bytes(4 << 20, '\0');
  size_t used = 0;
  struct archive* made = archive_write_new();
  EXPECT_EQ(archive_write_set_format(made, packing.format), ARCHIVE_OK);
  EXPECT_EQ(archive_write_add_filter(made, packing.filter), ARCHIVE_OK);
  EXPECT_EQ(archive_write_open_memory(made, bytes.data(), bytes.size(), &used), ARCHIVE_OK);
  struct archive_entry* entry = archive_entry_new();
  for (const auto& [name, size] :
       {std::pair<const char*, int64_t>{"film.mp4", zeros}, {"after.txt", 0}}) {
    archive_entry_clear(entry);
    archive_entry_set_pathname(entry, name);
    archive_entry_set_filetype(entry, AE_IFREG);
    archive_entry_set_perm(entry, 0644);
    archive_entry_set_size(entry, size);
    EXPECT_EQ(archive_write_header(made, entry), ARCHIVE_OK);
    const std::string block(1 << 20, '\0');
    for (int64_t left = size; left > 0; left -= static_cast<int64_t>(block.size())) {
      EXPECT_GT(archive_write_data(made, block.data(), block.size()), 0);
    }
  }
  archive_entry_free(entry);
  EXPECT_EQ(archive_write_close(made), ARCHIVE_OK);
  archive_write_free(made);
  bytes.resize(used);
  return bytes;
}

std::string Nested(int depth) {
  std::string bytes = Zipped({{"core.txt", "kernel"}});
  for (int i = 1; i < depth; ++i) {
    bytes = Zipped({{"inner.zip", bytes}});
  }
  return bytes;
}

}  // namespace

TEST(ArchiveBoundsTest, ArchivesInArchivesAreReadToTheirDepth) {
  EXPECT_EQ(ReadBytes(ReadArchive, "a.zip", Nested(Allowance::MAX_DEPTH)).content.text, "kernel");
  const Reading deeper = ReadBytes(ReadArchive, "a.zip", Nested(Allowance::MAX_DEPTH + 1));
  EXPECT_TRUE(deeper.is_good) << deeper.why;
  EXPECT_EQ(deeper.content.text, "");
}

TEST(ArchiveBoundsTest, OnlySoManyMembersAreRead) {
  std::vector<Member> members;
  for (int i = 0; i <= Allowance::MAX_MEMBERS; ++i) {
    members.push_back({std::to_string(i) + ".txt", "w" + std::to_string(i)});
  }

  const Reading reading = ReadBytes(ReadDocument, "a.zip", Zipped(members));

  EXPECT_TRUE(reading.is_good) << reading.why;
  EXPECT_TRUE(reading.content.is_cut);
  EXPECT_THAT(reading.content.text, testing::EndsWith(" w999"));
  EXPECT_THAT(reading.Text(ContentField::MEMBERS), testing::EndsWith("\n1000.txt"));
}

TEST(ArchiveBoundsTest, OnlySoManyNamesAreTaken) {
  constexpr size_t MAX_NAMES = 10'000;
  std::vector<Member> members(MAX_NAMES, {"a.jpg", ""});
  EXPECT_FALSE(ReadBytes(ReadDocument, "a.zip", Zipped(members)).content.is_cut);
  members.push_back({"b.jpg", ""});

  const Reading reading = ReadBytes(ReadDocument, "a.zip", Zipped(members));

  EXPECT_TRUE(reading.is_good) << reading.why;
  EXPECT_TRUE(reading.content.is_cut);
  EXPECT_EQ(reading.Text(ContentField::MEMBERS), "a.jpg");
}

TEST(ArchiveBoundsTest, OfALongMemberTheBeginningIsRead) {
  const std::string blanks(Allowance::MAX_MEMBER_BYTES + 1, ' ');
  const Packing bare = {ARCHIVE_FORMAT_RAW, ARCHIVE_FILTER_GZIP, "", ""};
  for (const auto& [name, bytes] :
       {std::pair<const char*, std::string>{"a.zip", Zipped({{"a.txt", "begin" + blanks}})},
        {"a.txt.gz", Packed(bare, {{"x", "begin" + blanks}})}}) {
    const Reading reading = ReadBytes(ReadDocument, name, bytes);

    EXPECT_TRUE(reading.is_good) << reading.why;
    EXPECT_EQ(reading.content.text, "begin") << name;
    EXPECT_TRUE(reading.content.is_cut) << name;
  }
}

// Passing it over would take minutes where it is long enough.
TEST(ArchiveBoundsTest, WhatHasToBeUnpackedToBePassedOverCounts) {
  const Packing stream = {ARCHIVE_FORMAT_TAR_USTAR, ARCHIVE_FILTER_ZSTD, "", ""};
  const int64_t bound = Allowance::MAX_BYTES;
  const Reading beyond =
      ReadBytes(ReadDocument, "a.tar.zst", LongOnesFirst(stream, bound + (8 << 20)));
  EXPECT_TRUE(beyond.is_good) << beyond.why;
  EXPECT_EQ(beyond.Text(ContentField::MEMBERS), "film.mp4");
  EXPECT_TRUE(beyond.content.is_cut);

  const Reading within = ReadBytes(ReadDocument, "a.tar.zst", LongOnesFirst(stream, 8 << 20));
  EXPECT_TRUE(within.is_good) << within.why;
  EXPECT_EQ(within.Text(ContentField::MEMBERS), "film.mp4\nafter.txt");
  EXPECT_FALSE(within.content.is_cut);
}

// Blanks fill no text: 600 MiB of them in archives in one of a few KiB.
TEST(ArchiveBoundsTest, ABombIsUnpackedUpToABound) {
  const std::string blanks(50 << 20, ' ');
  std::string inner = Zipped({{"blank.txt", blanks}, {"blank2.txt", blanks}});
  std::vector<Member> members;
  for (int i = 0; i < 6; ++i) {
    members.push_back({std::to_string(i) + ".zip", inner});
  }
  members.push_back({"last.txt", "out of reach"});

  const Reading reading = ReadBytes(ReadArchive, "a.zip", Zipped(members));

  EXPECT_EQ(reading.content.text, "");
  EXPECT_THAT(reading.Text(ContentField::MEMBERS), testing::StartsWith("0.zip\n1.zip\n"));
}

}  // namespace fileindexd
