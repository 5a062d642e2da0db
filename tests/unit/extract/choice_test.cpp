// SPDX-License-Identifier: GPL-2.0-or-later
// Which reader a file gets.
#include "extract/choice.h"

#include <fcntl.h>

#include "index/kind.h"
#include "index/kind_table.h"
#include "tests/unit/extract/reader_fixture.h"

namespace fileindexd {

namespace {

// A table of the one says nothing against that of the other.
TEST(FormatTableTest, EndingsHaveTheKindThatTheIndexGivesThem) {
  const struct {
    Kind kind;
    std::string_view endings;
  } rows[] = {{Kind::DOCUMENT, DocumentEndings()},
              {Kind::AUDIO, AudioEndings()},
              {Kind::VIDEO, VideoEndings()},
              {Kind::PHOTO, PhotoEndings()}};
  const auto kind_of = [](Format format) {
    switch (format) {
      case Format::AUDIO:
        return Kind::AUDIO;
      case Format::VIDEO:
        return Kind::VIDEO;
      case Format::PHOTO:
        return Kind::PHOTO;
      default:
        return Kind::DOCUMENT;
    }
  };
  for (const auto& row : rows) {
    std::string_view rest = row.endings;
    while (!rest.empty()) {
      const std::string ending(rest.substr(0, rest.find(' ')));
      rest.remove_prefix(std::min(rest.size(), ending.size() + 1));
      const Format format = FormatOfName("a." + ending);
      // Lists of songs are text, and sound in a film's container is read as one.
      const bool is_other = format == Format::NONE || format == Format::TEXT ||
                            format == Format::XML ||
                            (format == Format::VIDEO && row.kind == Kind::AUDIO);
      if (!is_other) {
        EXPECT_EQ(kind_of(format), row.kind) << ending;
      }
    }
  }
}

TEST(FormatTableTest, EveryFormatOfDocumentsIsToldByItsEnding) {
  const struct {
    const char* names;
    Format format;
  } rows[] = {{"a.TXT", Format::TEXT},
              {"a.csv", Format::TEXT},
              {"a.log", Format::TEXT},
              {"a.md", Format::TEXT},
              {"a.cpp", Format::TEXT},
              {"a.htm", Format::HTML},
              {"a.svg", Format::XML},
              {"a.Pdf", Format::PDF},
              {"a.docx", Format::OFFICE_ZIP},
              {"a.xlsx", Format::OFFICE_ZIP},
              {"a.pptx", Format::OFFICE_ZIP},
              {"a.odt", Format::OFFICE_ZIP},
              {"a.ods", Format::OFFICE_ZIP},
              {"a.odp", Format::OFFICE_ZIP},
              {"a.epub", Format::EPUB},
              {"a.doc", Format::OLD_OFFICE},
              {"a.xls", Format::OLD_OFFICE},
              {"a.ppt", Format::OLD_OFFICE},
              {"a.rtf", Format::RTF},
              {"a.eml", Format::MESSAGE},
              {"a.mbox", Format::MAILBOX},
              {"a.tar.gz", Format::ARCHIVE},
              {"a.7z", Format::ARCHIVE},
              {"a.rar", Format::ARCHIVE},
              {"a.iso", Format::ARCHIVE},
              {"a.mp3", Format::AUDIO},
              {"a.wma", Format::AUDIO},
              {"a.mkv", Format::VIDEO},
              {"a.cr2", Format::PHOTO},
              {".txt", Format::NONE},
              {"a", Format::NONE},
              {"a.", Format::NONE},
              {"a.lzo", Format::NONE},  // its library reads it by a program alone
              {"a.exe", Format::NONE}};
  for (const auto& row : rows) {
    EXPECT_EQ(static_cast<int>(FormatOfName(row.names)), static_cast<int>(row.format)) << row.names;
  }
}

TEST(FormatTableTest, WhatNoReaderIsForIsNotClaimedByItsContent) {
  EXPECT_EQ(static_cast<int>(FormatOfMime("application/x-lzop")), static_cast<int>(Format::NONE));
  EXPECT_EQ(static_cast<int>(FormatOfMime("application/x-lzip")),
            static_cast<int>(Format::ARCHIVE));
}

class ChoiceTest : public testing::Test {
 public:
  void SetUp() override {
    std::string error;
    ASSERT_TRUE(LoadMagic(error)) << error;
  }

  static Found ReadNamed(const char* name, const std::string& bytes) {
    return Read(ReadDocument, bytes, 1000, name);
  }
};

// Magic numbers of a few letters begin notes as well.
TEST_F(ChoiceTest, ANoteWithoutAnEndingIsTextWhateverItBeginsWith) {
  for (const std::string begin :
       {"Xref: see the other list", "<?xml is how such files begin", "%PDF-word is a word",
        "GIF89a is an old format", "!<arch>", "RIFF is a container", "%!PS-Adobe is a printer's"}) {
    const std::string note = begin + "\nand so on, said the harbour master.\n";
    const Found found = ReadNamed("note", note);
    EXPECT_TRUE(found.is_read) << begin << ": " << found.why;
    EXPECT_NE(found.content.text.find("the harbour master"), std::string::npos) << begin;
    EXPECT_EQ(found.content.kind, Kind::DOCUMENT) << begin;
  }
}

TEST_F(ChoiceTest, WhatHasAnEndingOrWordsOfItsFormatIsNoNote) {
  for (const char* begin : {"GIF89a is an old format", "!<arch>"}) {
    const Found found =
        ReadNamed("note.unknown", begin + std::string("\nsaid the harbour master.\n"));
    EXPECT_EQ(found.content.text, "") << begin;
  }
  const Found damaged = ReadNamed("page", "<?xml version=\"1.0\"?>\n<a><b>some words</b>");
  EXPECT_EQ(damaged.why, "damaged XML");
  EXPECT_EQ(damaged.content.text, "some words");
  const Found encrypted =
      ReadNamed("letter",
                "Return-Path: <quay@example.org>\nMIME-Version: 1.0\nContent-Type: "
                "application/pkcs7-mime; smime-type=enveloped-data\n\nMIIB\n");
  EXPECT_EQ(encrypted.why, "encrypted");
  EXPECT_EQ(encrypted.content.text, "");
}

TEST_F(ChoiceTest, WhatTheDiskDoesNotGiveAnyReaderIsNoted) {
  const int file = memfd_create("test", MFD_CLOEXEC);
  ASSERT_EQ(write(file, "words", 5), 5);
  const ScopedFd readable(file);
  const ScopedFd unreadable(open(("/proc/self/fd/" + std::to_string(file)).c_str(), O_WRONLY));
  for (const char* name :
       {"a.txt", "a.html", "a.xml", "a.pdf", "a.docx", "a.fodt", "a.epub", "a.doc", "a.rtf",
        "a.eml", "a.mbox", "a.zip", "a.mp3", "a.mkv", "a.jpg", "a"}) {
    ContentSink sink(1000);
    std::string why;
    int fault = 0;

    (void)ReadDocument({unreadable.fd, name, 5, 0, &fault}, sink, why);

    EXPECT_EQ(fault, EBADF) << name;
  }
}

}  // namespace

}  // namespace fileindexd
