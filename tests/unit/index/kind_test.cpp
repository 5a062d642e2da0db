// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/kind.h"

#include <gtest/gtest.h>

#include <set>
#include <sstream>
#include <string>

#include "index/kind_table.h"

namespace fileindexd {

TEST(KindTest, EndingTellsTheKind) {
  const std::pair<const char*, Kind> table[] = {{"a.txt", Kind::DOCUMENT},
                                                {"a.PDF", Kind::DOCUMENT},
                                                {"a.b.Docx", Kind::DOCUMENT},
                                                {"a.svg", Kind::DOCUMENT},
                                                {"a.cpp", Kind::DOCUMENT},
                                                {"a.tar.gz", Kind::DOCUMENT},
                                                {"a.eml", Kind::DOCUMENT},
                                                {"a.epub", Kind::DOCUMENT},
                                                {"a.html", Kind::DOCUMENT},
                                                {"a.mp3", Kind::AUDIO},
                                                {"a.FLAC", Kind::AUDIO},
                                                {"a.ts", Kind::VIDEO},
                                                {"a.mkv", Kind::VIDEO},
                                                {"a.JPG", Kind::PHOTO},
                                                {"a.CR2", Kind::PHOTO},
                                                {"a.psd", Kind::PHOTO},
                                                {"a.heic", Kind::PHOTO},
                                                {".a.txt", Kind::DOCUMENT},
                                                {"", Kind::OTHER},
                                                {"a", Kind::OTHER},
                                                {"a.", Kind::OTHER},
                                                {".txt", Kind::OTHER},
                                                {"txt", Kind::OTHER},
                                                {"a.txt ", Kind::OTHER},
                                                {"a.txtx", Kind::OTHER},
                                                {"a.t xt", Kind::OTHER},
                                                {"a.\xff\xfe", Kind::OTHER},
                                                {"a.aaaaaaaaaaaaaaaaaaaaaaaa", Kind::OTHER},
                                                {"a.docx~", Kind::OTHER},
                                                {"...", Kind::OTHER},
                                                {"a.t\xc3\x84", Kind::OTHER}};
  for (const auto& [name, kind] : table) {
    EXPECT_EQ(KindOfName(name), kind) << name;
  }
}

TEST(KindTest, NoEndingStandsTwice) {
  std::set<std::string> seen;
  for (const auto list : {DocumentEndings(), AudioEndings(), VideoEndings(), PhotoEndings()}) {
    std::istringstream words{std::string(list)};
    for (std::string ending; words >> ending;) {
      EXPECT_TRUE(seen.insert(ending).second) << ending;
      EXPECT_LE(ending.size(), 16U);
      EXPECT_NE(KindOfName("a." + ending), Kind::OTHER) << ending;
    }
  }
}

TEST(KindTest, TextsAreReadBack) {
  for (const Kind kind :
       {Kind::OTHER, Kind::DOCUMENT, Kind::AUDIO, Kind::VIDEO, Kind::PHOTO, Kind::FOLDER}) {
    EXPECT_EQ(KindFromText(KindText(kind)), kind);
  }
  for (const char* text : {"", "Document", "documents", " photo", "5"}) {
    EXPECT_EQ(KindFromText(text), std::nullopt) << text;
  }
}

TEST(KindTest, OtherIsWantedIfAnyKindIs) {
  EXPECT_FALSE(IsContentWanted(Kind::OTHER, {}));
  EXPECT_TRUE(IsContentWanted(Kind::OTHER, {.photo = true}));
  EXPECT_TRUE(IsContentWanted(Kind::PHOTO, {.photo = true}));
  EXPECT_FALSE(IsContentWanted(Kind::DOCUMENT, {.photo = true}));
  EXPECT_FALSE(IsContentWanted(Kind::FOLDER, {true, true, true, true}));
}

}  // namespace fileindexd
