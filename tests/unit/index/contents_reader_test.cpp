// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/contents_reader.h"

#include <gmock/gmock.h>

#include "index/content_terms.h"
#include "index/contents_schema.h"
#include "index/text_tokenizer.h"
#include "state/layout.h"
#include "tests/unit/index/contents_fixture.h"

namespace fileindexd {
namespace {

using testing::ElementsAre;

class ContentsReaderTest : public ContentsTest {};

TEST_F(ContentsReaderTest, BeforeThereAreWordsThereAreNoContents) {
  contents.reset();
  RemoveTree(ContentsPath("s"));
  {
    IndexDatabase database;  // as its writer makes it, before it knows the language
    ASSERT_EQ(database.OpenForWriting(ContentsPath("s"), true, CONTENTS_FORM), IndexError::NONE);
  }

  ContentsReader reader;
  EXPECT_EQ(reader.Open("s"), IndexError::PATH_NOT_FOUND);
}

TEST_F(ContentsReaderTest, TellsTheLanguageOfItsWords) {
  ContentsReader reader;

  ASSERT_EQ(reader.Open("s"), IndexError::NONE);
  EXPECT_EQ(reader.Language(), DEFAULT_LANGUAGE);
}

std::vector<std::string> TermTexts(const Content& content, const std::string& language) {
  std::vector<std::string> texts;
  for (const ContentTerm& term : TermsOf(content, language)) {
    texts.push_back(term.term + " " + std::to_string(term.count));
  }
  return texts;
}

TEST(ContentTermsTest, AreInByteOrderWithTheirNumbers) {
  Content content = TextContent("two One two");
  content.texts.push_back({ContentField::TITLE, "One"});
  content.texts.push_back({ContentField::AUTHOR, "three"});

  EXPECT_THAT(TermTexts(content, NO_LANGUAGE), ElementsAre("one 2", "three 1", "two 2"));
  EXPECT_THAT(TermTexts({}, NO_LANGUAGE), ElementsAre());
}

TEST(ContentTermsTest, StemsStandBesideTheirWords) {
  const std::vector<std::string> terms = TermTexts(TextContent("lighthouses"), "english");

  EXPECT_GE(terms.size(), 2u);
  EXPECT_THAT(terms, testing::Contains("lighthouses 1"));
}

}  // namespace
}  // namespace fileindexd
