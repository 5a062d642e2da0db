// SPDX-License-Identifier: GPL-2.0-or-later
#include <archive.h>

#include "extract/nested.h"
#include "tests/unit/extract/documents/fixture.h"
#include "tests/unit/extract/documents/packing.h"

namespace fileindexd {

namespace {

const std::vector<Member> TWO{{"notes/first.txt", "the red harbour"},
                              {"M\u00e4rz/\u8ba1\u5212.txt", "a green gate"}};

struct Case {
  const char* name;
  Packing packing;
};

const Case CASES[] = {
    {"a.zip", {ARCHIVE_FORMAT_ZIP, ARCHIVE_FILTER_NONE, "", ""}},
    {"a.tar", {ARCHIVE_FORMAT_TAR_PAX_RESTRICTED, ARCHIVE_FILTER_NONE, "", ""}},
    {"a.tgz", {ARCHIVE_FORMAT_TAR_GNUTAR, ARCHIVE_FILTER_GZIP, "", ""}},
    {"a.tar.bz2", {ARCHIVE_FORMAT_TAR_USTAR, ARCHIVE_FILTER_BZIP2, "", ""}},
    {"a.tar.xz", {ARCHIVE_FORMAT_TAR_PAX_RESTRICTED, ARCHIVE_FILTER_XZ, "", ""}},
    {"a.tar.zst", {ARCHIVE_FORMAT_TAR_PAX_RESTRICTED, ARCHIVE_FILTER_ZSTD, "", ""}},
    {"a.tar.lz4", {ARCHIVE_FORMAT_TAR_PAX_RESTRICTED, ARCHIVE_FILTER_LZ4, "", ""}},
    {"a.tar.lz", {ARCHIVE_FORMAT_TAR_PAX_RESTRICTED, ARCHIVE_FILTER_LZIP, "", ""}},
    {"a.tar.Z", {ARCHIVE_FORMAT_TAR_PAX_RESTRICTED, ARCHIVE_FILTER_COMPRESS, "", ""}},
    {"a.7z", {ARCHIVE_FORMAT_7ZIP, ARCHIVE_FILTER_NONE, "", ""}},
    {"a.iso", {ARCHIVE_FORMAT_ISO9660, ARCHIVE_FILTER_NONE, "", ""}},
};

class ArchiveFormatTest : public testing::TestWithParam<Case> {};

std::string Nested(int depth) {
  std::string bytes = Zipped({{"core.txt", "kernel"}});
  for (int i = 1; i < depth; ++i) {
    bytes = Zipped({{"inner.zip", bytes}});
  }
  return bytes;
}

}  // namespace

TEST_P(ArchiveFormatTest, NamesAndTextOfMembersAreFound) {
  const Reading reading = ReadBytes(ReadArchive, GetParam().name, Packed(GetParam().packing, TWO));

  ASSERT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.content.kind, Kind::DOCUMENT);
  const std::string names = reading.Text(ContentField::MEMBERS);
  EXPECT_THAT(names, testing::HasSubstr("notes/first.txt"));
  EXPECT_THAT(names, testing::HasSubstr("\u00e4rz/\u8ba1\u5212.txt"));
  EXPECT_THAT(reading.content.text, testing::HasSubstr("the red harbour"));
  EXPECT_THAT(reading.content.text, testing::HasSubstr("a green gate"));
}

TEST_P(ArchiveFormatTest, DamageIsSurvived) {
  ExpectSurvivesDamage(ReadArchive, GetParam().name, Packed(GetParam().packing, TWO));
}

INSTANTIATE_TEST_SUITE_P(All, ArchiveFormatTest, testing::ValuesIn(CASES));

TEST(ArchiveTest, TheLastNamesOfADamagedArchiveAreMissingTheFirstAreThere) {
  const std::string bytes = Packed({ARCHIVE_FORMAT_TAR_USTAR, ARCHIVE_FILTER_NONE, "", ""}, TWO);

  const Reading reading = ReadBytes(ReadArchive, "a.tar", bytes.substr(0, 1300));

  EXPECT_EQ(reading.why, "damaged");
  EXPECT_EQ(reading.Text(ContentField::MEMBERS), "notes/first.txt");
  EXPECT_EQ(reading.content.text, "the red harbour");
}

TEST(ArchiveTest, OneCompressedFileIsReadAsThatFile) {
  const std::string bytes =
      Packed({ARCHIVE_FORMAT_RAW, ARCHIVE_FILTER_GZIP, "", ""}, {{"x", "lonely words"}});

  const Reading reading = ReadBytes(ReadArchive, "story.txt.gz", bytes);

  ASSERT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.content.text, "lonely words");
  EXPECT_EQ(reading.Text(ContentField::MEMBERS), "");
}

TEST(ArchiveTest, WhatIsNoArchiveIsSaidInWords) {
  EXPECT_EQ(ReadBytes(ReadArchive, "a.zip", "").why, "not an archive");
  EXPECT_EQ(ReadBytes(ReadArchive, "a.zip", "some words").why, "not an archive");
  EXPECT_EQ(ReadBytes(ReadArchive, "a.zip", std::string("PK\3\4", 4)).why, "not an archive");
}

TEST(ArchiveTest, AnEncryptedArchiveKeepsItsNames) {
  const Reading reading = ReadBytes(
      ReadArchive, "a.zip",
      Packed({ARCHIVE_FORMAT_ZIP, ARCHIVE_FILTER_NONE, "zip:encryption=zipcrypt", "secret"}, TWO));

  EXPECT_FALSE(reading.is_good);
  EXPECT_EQ(reading.why, "encrypted");
  EXPECT_THAT(reading.Text(ContentField::MEMBERS), testing::HasSubstr("first.txt"));
  EXPECT_EQ(reading.content.text, "");
}

TEST(ArchiveTest, ArchivesInArchivesAreReadToTheirDepth) {
  EXPECT_EQ(ReadBytes(ReadArchive, "a.zip", Nested(Allowance::MAX_DEPTH)).content.text, "kernel");
  const Reading deeper = ReadBytes(ReadArchive, "a.zip", Nested(Allowance::MAX_DEPTH + 1));
  EXPECT_TRUE(deeper.is_good) << deeper.why;
  EXPECT_EQ(deeper.content.text, "");
}

TEST(ArchiveTest, MembersFieldsAreNotTheArchives) {
  const Reading reading = ReadBytes(ReadArchive, "a.zip", Nested(2));

  EXPECT_EQ(reading.Text(ContentField::MEMBERS), "inner.zip");
}

TEST(ArchiveTest, ABadMemberDoesNotHideItsNeighbours) {
  const Reading reading =
      ReadBytes(ReadArchive, "a.zip",
                Zipped({{"a.pdf", "no such thing"}, {"b.zip", "PK"}, {"c.txt", "survivor"}}));

  EXPECT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.content.text, "survivor");
}

TEST(ArchiveTest, OnlySoManyMembersAreRead) {
  std::vector<Member> members;
  for (int i = 0; i <= Allowance::MAX_MEMBERS; ++i) {
    members.push_back({std::to_string(i) + ".txt", "w" + std::to_string(i)});
  }

  const Reading reading = ReadBytes(ReadArchive, "a.zip", Zipped(members));

  EXPECT_TRUE(reading.is_good) << reading.why;
  EXPECT_THAT(reading.content.text, testing::EndsWith(" w999"));
  EXPECT_THAT(reading.Text(ContentField::MEMBERS), testing::EndsWith("\n1000.txt"));
}

// Blanks fill no text: 600 MiB of them in archives in one of a few KiB.
TEST(ArchiveTest, ABombIsUnpackedUpToABound) {
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
