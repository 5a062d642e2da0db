// SPDX-License-Identifier: GPL-2.0-or-later
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "ctl/values.h"

namespace fileindexd {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

SearchArguments Split(const std::vector<std::string>& arguments) {
  return SplitSearchArguments(arguments, {"--share", "--limit"});
}

TEST(SearchArgumentsTest, WordsAndOptionsMayBeMixed) {
  const SearchArguments split = Split({"tax", "--json", "2025", "-0", "return"});

  EXPECT_THAT(split.options, ElementsAre("--json", "-0"));
  EXPECT_THAT(split.words, ElementsAre("tax", "2025", "return"));
}

TEST(SearchArgumentsTest, OneDashBelongsToTheQuery) {
  const SearchArguments split = Split({"tax", "-draft", "-", "-h", "-00"});

  EXPECT_THAT(split.options, IsEmpty());
  EXPECT_THAT(split.words, ElementsAre("tax", "-draft", "-", "-h", "-00"));
}

TEST(SearchArgumentsTest, AnOptionTakesItsValueAlong) {
  const SearchArguments split = Split({"--share", "--data", "--limit=5", "word", "--share", "-0"});

  EXPECT_THAT(split.options, ElementsAre("--share=--data", "--limit=5", "--share=-0"));
  EXPECT_THAT(split.words, ElementsAre("word"));
}

TEST(SearchArgumentsTest, AnOptionWithoutItsValueStaysAlone) {
  const SearchArguments split = Split({"word", "--share"});

  EXPECT_THAT(split.options, ElementsAre("--share"));
  EXPECT_THAT(split.words, ElementsAre("word"));
}

TEST(SearchArgumentsTest, AfterTwoDashesEverythingIsTheQuery) {
  const SearchArguments split = Split({"--json", "--", "--share", "-0", "--"});

  EXPECT_THAT(split.options, ElementsAre("--json"));
  EXPECT_THAT(split.words, ElementsAre("--share", "-0", "--"));
}

TEST(SearchArgumentsTest, AnEmptyArgumentIsAWord) {
  const SearchArguments split = Split({"", "[a,b]"});

  EXPECT_THAT(split.words, ElementsAre("", "[a,b]"));
}

}  // namespace
}  // namespace fileindexd
