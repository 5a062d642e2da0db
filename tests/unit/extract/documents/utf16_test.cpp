// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/utf16.h"

#include <gtest/gtest.h>

namespace fileindexd {

TEST(Utf16Test, LettersOfEveryLengthBecomeUtf8) {
  EXPECT_EQ(Utf16ToUtf8(std::string("a\0\xe4\0\x2d\x4e\x3d\xd8\x00\xde", 10)),
            "a\u00e4\u4e2d\U0001F600");
}

TEST(Utf16Test, HalvesOfPairsAndHalvesOfUnitsAreLeftOut) {
  EXPECT_EQ(Utf16ToUtf8(std::string("\x3d\xd8"
                                    "a\0\x00\xde"
                                    "b\0c",
                                    9)),
            "ab");
}

TEST(Utf16Test, BytesOfTheWesternCodePageHaveTheirLetters) {
  EXPECT_EQ(FromWestern(0x41), u'A');
  EXPECT_EQ(FromWestern(0x80), u'\u20AC');
  EXPECT_EQ(FromWestern(0x9F), u'\u0178');
  EXPECT_EQ(FromWestern(0xE4), u'\u00E4');
  EXPECT_EQ(FromWestern(0x81), 0x81);
}

}  // namespace fileindexd
