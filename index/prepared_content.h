// SPDX-License-Identifier: GPL-2.0-or-later
// What was found in a file, with what the writer makes of it before it stores anything: packing and
// cutting words take a third of its time, and can be done beside it.
#pragma once

#include <memory>
#include <string>
#include <utility>

#include "base/content.h"

namespace fileindexd {

class TextCutter;

struct PreparedContent {
  PreparedContent() = default;
  // Wanted: a content alone will do. The writer does what has not been done.
  PreparedContent(Content found) : content(std::move(found)) {}

  Content content;
  std::string packed;    // see PackTexts; empty: not done
  std::string cut_text;  // see TextCutter::CutForTable; empty: not done
  std::string language;  // of these words
};

// Of one share. One thread at a time.
class ContentPreparer {
 public:
  explicit ContentPreparer(const std::string& share_language);
  ~ContentPreparer();
  ContentPreparer(const ContentPreparer&) = delete;
  ContentPreparer& operator=(const ContentPreparer&) = delete;

  // Where memory runs out, nothing is done.
  void Prepare(PreparedContent& found);

 private:
  std::string language;
  std::unique_ptr<TextCutter> cutter;  // null until it is needed
};

}  // namespace fileindexd
