// SPDX-License-Identifier: GPL-2.0-or-later
#include <archive.h>

#include "tests/unit/extract/documents/compound.h"
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
    {"a.tar.lzma", {ARCHIVE_FORMAT_TAR_PAX_RESTRICTED, ARCHIVE_FILTER_LZMA, "", ""}},
    {"a.tar.Z", {ARCHIVE_FORMAT_TAR_PAX_RESTRICTED, ARCHIVE_FILTER_COMPRESS, "", ""}},
    {"a.7z", {ARCHIVE_FORMAT_7ZIP, ARCHIVE_FILTER_NONE, "", ""}},
    {"a.iso", {ARCHIVE_FORMAT_ISO9660, ARCHIVE_FILTER_NONE, "", ""}},
};

std::string FromHex(std::string_view digits) {
  std::string bytes;
  for (size_t at = 0; at + 1 < digits.size(); at += 2) {
    bytes += static_cast<char>(std::stoi(std::string(digits.substr(at, 2)), nullptr, 16));
  }
  return bytes;
}

// Made by an archiver: one file, password "secret", names encrypted as well.
const std::string CLOSED_7Z = FromHex(
    "377abcaf271c0004bbbdd21480000000000000002e00000000000000f0eddfe0afe4c9ac4323ef377281da972cfbf0"
    "725930ba2cd56bb12033cb3257a1186d03816058db98fde6a50c75dc232b351bc79a5128c0cd9d7cde8179bc92931d"
    "13c7a4e52dcb4ff0287ed764af252c3ef1580cdc0c54b15ac553f33f75776ae03451173caf9e103cf87c6be72d9342"
    "92498dfc40db20a059d76714e8511b652d535917061001097000070b0100012406f1070112530f4a1c54130520c449"
    "7eebdce031ae8f770c620a0199c5b23e0000");

uint32_t Crc32(std::string_view bytes) {
  uint32_t crc = ~0U;
  for (const char byte : bytes) {
    crc ^= static_cast<uint8_t>(byte);
    for (int bit = 0; bit < 8; ++bit) {
      crc = crc >> 1 ^ ((crc & 1) != 0 ? 0xEDB88320U : 0U);
    }
  }
  return ~crc;
}

std::string RarBlock(const std::string& head) {
  return Le16(Crc32(head) & 0xFFFF) + head;
}

// Members as they are; `flags` of the whole.
std::string Rar(const std::vector<Member>& members, uint32_t flags = 0) {
  std::string rar = std::string("Rar!\x1A\x07\0", 7) +
                    RarBlock('\x73' + Le16(flags) + Le16(13) + std::string(6, '\0'));
  for (const Member& member : members) {
    const auto size = static_cast<uint32_t>(member.bytes.size());
    const auto name_size = static_cast<uint32_t>(member.name.size());
    rar += RarBlock('\x74' + Le16(0x8000) + Le16(32 + name_size) + Le32(size) + Le32(size) + '\3' +
                    Le32(Crc32(member.bytes)) + Le32(0x58000000) + '\x14' + '\x30' +
                    Le16(name_size) + Le32(0x81A4) + member.name) +
           member.bytes;
  }
  return rar + RarBlock('\x7B' + Le16(0x4000) + Le16(7));
}

// Numbers of seven bits a byte.
std::string Vint(size_t number) {
  std::string bytes;
  for (; number >= 0x80; number >>= 7) {
    bytes += static_cast<char>(0x80 | (number & 0x7F));
  }
  return bytes + static_cast<char>(number);
}

std::string Rar5Block(const std::string& head) {
  const std::string block = Vint(head.size()) + head;
  return Le32(Crc32(block)) + block;
}

// Members as they are.
std::string Rar5(const std::vector<Member>& members) {
  std::string rar = std::string("Rar!\x1A\x07\1\0", 8) + Rar5Block(std::string("\1\0\0", 3));
  for (const Member& member : members) {
    const std::string size = Vint(member.bytes.size());
    rar += Rar5Block(std::string("\2\2", 2) + size + '\4' + size + Vint(0x81A4) +
                     Le32(Crc32(member.bytes)) + '\0' + '\1' + Vint(member.name.size()) +
                     member.name) +
           member.bytes;
  }
  return rar + Rar5Block(std::string("\5\0\0", 3));
}

// Of one member, packed by what nobody knows.
std::string ZipOfAnotherMethod() {
  std::string zip = Zipped({{"a.txt", "the red harbour"}});
  for (const auto& [mark, at] : {std::pair<const char*, size_t>{"PK\3\4", 8}, {"PK\1\2", 10}}) {
    zip[zip.find(mark) + at] = 97;
  }
  return zip;
}

std::string SevenZipOfAnotherCodec() {
  std::string bytes =
      Packed({ARCHIVE_FORMAT_7ZIP, ARCHIVE_FILTER_NONE, "7zip:compression=store", ""},
             {{"a.txt", "the red harbour"}});
  constexpr size_t HEAD = 32;                                  // of the file
  constexpr std::string_view ONE_FOLDER("\x0B\1\0\1\1\0", 6);  // one coder, the id of one byte
  bytes[bytes.find(ONE_FOLDER, HEAD) + ONE_FOLDER.size() - 1] = 5;
  const size_t rest = HEAD + std::string_view("the red harbour").size();
  bytes.replace(28, 4, Le32(Crc32(bytes.substr(rest))));
  return bytes.replace(8, 4, Le32(Crc32(bytes.substr(12, 20))));
}

class ArchiveFormatTest : public testing::TestWithParam<Case> {};

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

TEST(ArchiveTest, HalfOfACompressedFileIsReadAndSaidToBeDamaged) {
  std::string words;
  for (int i = 0; words.size() < 900'000; ++i) {
    words += "word" + std::to_string(i * 7919) + " ";
  }
  for (const int filter : {ARCHIVE_FILTER_GZIP, ARCHIVE_FILTER_XZ}) {
    const std::string bytes = Packed({ARCHIVE_FORMAT_RAW, filter, "", ""}, {{"x", words}});

    const Reading reading = ReadBytes(ReadArchive, "a.txt.gz", bytes.substr(0, bytes.size() / 2));

    EXPECT_FALSE(reading.is_good);
    EXPECT_EQ(reading.why, "damaged");
    EXPECT_THAT(reading.content.text, testing::StartsWith("word0 word7919 "));
  }
}

// The library takes it for no archive at all.
TEST(ArchiveTest, OfALittleCompressedFileTheBeginningIsSaidToBeDamaged) {
  for (const int filter :
       {ARCHIVE_FILTER_GZIP, ARCHIVE_FILTER_BZIP2, ARCHIVE_FILTER_XZ, ARCHIVE_FILTER_ZSTD}) {
    const std::string little = Packed({ARCHIVE_FORMAT_RAW, filter, "", ""}, {{"x", "a few words"}});
    EXPECT_EQ(ReadBytes(ReadArchive, "a.txt.gz", little.substr(0, little.size() / 2)).why,
              "damaged")
        << filter;
  }
}

TEST(ArchiveTest, AMemberThatCannotBeUnpackedDamagesTheArchive) {
  std::string bytes = Packed({ARCHIVE_FORMAT_ZIP, ARCHIVE_FILTER_NONE, "zip:compression=store", ""},
                             {{"a.txt", "the red harbour"}, {"b.txt", "kernel"}});
  bytes[bytes.find("harbour")] = 'b';

  const Reading reading = ReadBytes(ReadArchive, "a.zip", bytes);

  EXPECT_EQ(reading.why, "damaged");
  EXPECT_EQ(reading.Text(ContentField::MEMBERS), "a.txt\nb.txt");
}

TEST(ArchiveTest, WhatNobodyCanUnpackIsNotDamaged) {
  for (const std::string& bytes : {ZipOfAnotherMethod(), SevenZipOfAnotherCodec()}) {
    const Reading reading = ReadBytes(ReadArchive, "a.zip", bytes);

    EXPECT_TRUE(reading.is_good) << reading.why;
    EXPECT_EQ(reading.Text(ContentField::MEMBERS), "a.txt");
    EXPECT_EQ(reading.content.text, "");
  }
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

TEST(ArchiveTest, EncryptedNamesAreSaidToBe) {
  EXPECT_EQ(ReadBytes(ReadArchive, "a.7z", CLOSED_7Z).why, "encrypted");
  EXPECT_EQ(ReadBytes(ReadArchive, "a.rar", Rar({{"a.txt", "words"}}, 0x80)).why, "encrypted");
}

TEST(ArchiveTest, MembersOfARarAreFound) {
  const std::string rar = Rar({{"notes\\first.txt", "the red harbour"}, {"b.md", "a green gate"}});
  const Reading reading = ReadBytes(ReadArchive, "a.rar", rar);

  EXPECT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.Text(ContentField::MEMBERS), "notes/first.txt\nb.md");
  EXPECT_EQ(reading.content.text, "the red harbour a green gate");
  ExpectSurvivesDamage(ReadArchive, "a.rar", rar);
}

TEST(ArchiveTest, MembersOfALaterRarAreFound) {
  const std::string rar = Rar5({{"notes/first.txt", "the red harbour"}, {"b.md", "a green gate"}});
  const Reading reading = ReadBytes(ReadArchive, "a.rar", rar);

  EXPECT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.Text(ContentField::MEMBERS), "notes/first.txt\nb.md");
  EXPECT_EQ(reading.content.text, "the red harbour a green gate");
  ExpectSurvivesDamage(ReadArchive, "a.rar", rar);
}

TEST(ArchiveTest, NamesInAnotherCharsetAreGuessed) {
  const struct {
    const char* charset;
    const char* names[2];
  } rows[] = {{"CP437", {"Gr\u00fc\u00dfe.txt", "M\u00e4rz.txt"}},
              {"CP1252", {"Gr\u00fc\u00dfe.txt", "\u00c9t\u00e9.txt"}},
              {"CP932", {"\u65e5\u672c\u8a9e\u306e\u6587\u66f8.txt", "\u30c6\u30b9\u30c8.txt"}},
              {"GBK", {"\u8ba1\u5212\u62a5\u544a.txt", "\u8fd9\u662f\u4e2d\u6587.txt"}}};
  for (const auto& row : rows) {
    const Reading reading = ReadBytes(ReadArchive, "a.zip",
                                      Packed({ARCHIVE_FORMAT_ZIP, ARCHIVE_FILTER_NONE,
                                              "zip:hdrcharset=" + std::string(row.charset), ""},
                                             {{row.names[0], "x"}, {row.names[1], "y"}}));
    EXPECT_EQ(reading.Text(ContentField::MEMBERS), std::string(row.names[0]) + "\n" + row.names[1])
        << row.charset;
  }
}

TEST(ArchiveTest, MembersFieldsAreNotTheArchives) {
  const Reading reading =
      ReadBytes(ReadArchive, "a.zip", Zipped({{"inner.zip", Zipped({{"core.txt", "kernel"}})}}));

  EXPECT_EQ(reading.Text(ContentField::MEMBERS), "inner.zip");
}

TEST(ArchiveTest, ABadMemberDoesNotHideItsNeighbours) {
  const Reading reading = ReadBytes(ReadArchive, "a.zip",
                                    Zipped({{"a.pdf", "%PDF-1.4 no such thing"},
                                            {"b.zip", std::string("PK\3\4", 4)},
                                            {"c.txt", "survivor"}}));

  EXPECT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.content.text, "survivor");
}

TEST(ArchiveTest, AMemberUnderAWrongNameIsReadAsWhatItIsWhateverCameBefore) {
  const Reading reading = ReadBytes(ReadArchive, "a.zip",
                                    Zipped({{"a.txt", "first"},
                                            {"b.docx", Zipped({{"core.txt", "kernel"}})},
                                            {"c.pdf", "<html><body><p>a page</p></body></html>"}}));

  EXPECT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.content.text, "first kernel a page");
}

}  // namespace fileindexd
