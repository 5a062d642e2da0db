// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/prepared_content.h"

#include <new>

#include "index/content_text.h"
#include "index/text_tokenizer.h"

namespace fileindexd {

ContentPreparer::ContentPreparer(const std::string& share_language)
    : language(LanguageOfWords(share_language)) {}

ContentPreparer::~ContentPreparer() = default;

void ContentPreparer::Prepare(PreparedContent& found) {
  try {
    if (WordsOf(found.content).IsEmpty()) {
      return;
    }
    if (cutter == nullptr) {
      cutter = std::make_unique<TextCutter>(language);
    }
    found.packed = PackTexts(found.content);
    found.cut_text = cutter->CutForTable(found.content.text);
    found.language = language;
  } catch (const std::bad_alloc&) {
    found.packed.clear();
    found.cut_text.clear();
  }
}

}  // namespace fileindexd
