// SPDX-License-Identifier: GPL-2.0-or-later
// Questions to one share whose files and contents a test makes up.
#pragma once

#include <map>
#include <string>
#include <vector>

#include "index/search.h"
#include "tests/unit/index/contents_fixture.h"

namespace fileindexd {

class QuestionTest : public ContentsTest {
 protected:
  // Files of the share's folder with these contents, read. `bytes`: what lies on the disk.
  void Store(const std::map<std::string, Content>& files);
  void StoreOne(const std::string& name, const Content& content, const std::string& bytes);
  void Empty(const Names& names);  // added, nothing read

  // Rows without files, in a share of their own.
  static bool TryToFill(const std::string& share, const Names& names);
  static void Fill(const std::string& share, const Names& names);

  std::string Suggested(const std::string& text);
  // Bytes of the hits' names that are marked, joined by '|'.
  std::string Marked(const std::string& text);
  // "part: where" of each reason, "-part" where it does not match.
  Names Reasons(const std::string& name, const std::string& text);

  Explanation explanation;
};

Content Tagged(ContentField field, const std::string& text);
Content Numbered(const std::vector<NumberField>& numbers, Kind kind = Kind::OTHER);

}  // namespace fileindexd
