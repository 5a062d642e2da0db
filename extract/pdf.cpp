// SPDX-License-Identifier: GPL-2.0-or-later
#include <poppler-document.h>
#include <poppler-global.h>
#include <poppler-page.h>

#include <algorithm>
#include <memory>

#include "base/utf8.h"
#include "extract/format.h"
#include "extract/memory_file.h"
#include "extract/nested.h"
#include "extract/utf16.h"

namespace fileindexd {

namespace {

constexpr int64_t MAX_PDF = 256LL << 20;
// A page count is the file's own claim. Pages without text fill no cap, so they are counted.
constexpr int MAX_PAGES = 50'000;
constexpr int MAX_MISSING_PAGES = 100;

std::string ToUtf8(const poppler::ustring& from) {
  std::string text;
  text.reserve(from.size());
  Utf16Joiner joiner;
  for (const auto unit : from) {
    joiner.Add(unit, text);
  }
  return text;
}

// poppler takes "%PDF-" within the first KiB; anything else it searches for objects at length.
bool IsPdf(const std::string& bytes) {
  return bytes.substr(0, 1024).find("%PDF-") != std::string::npos;
}

void SetFields(const poppler::document& pdf, ContentSink& sink) {
  sink.Set(ContentField::TITLE, ToUtf8(pdf.get_title()));
  sink.Set(ContentField::AUTHOR, ToUtf8(pdf.get_author()));
  sink.Set(ContentField::SUBJECT, ToUtf8(pdf.get_subject()));
  sink.Set(ContentField::KEYWORDS, ToUtf8(pdf.get_keywords()));
  const time_t created = pdf.get_creation_date_t();
  if (created != time_t{-1}) {
    sink.Set(ContentField::CREATED, int64_t{created});
  }
}

// True when a page at least was there.
bool AddPages(const poppler::document& pdf, ContentSink& sink) {
  const Allowance allowance;
  const int pages = std::min(pdf.pages(), MAX_PAGES);
  int missing = 0;
  int found = 0;
  for (int i = 0; i < pages && !sink.IsFull() && !allowance.IsSpent(); ++i) {
    const std::unique_ptr<poppler::page> page(pdf.create_page(i));
    if (!page) {
      if (++missing == MAX_MISSING_PAGES) {
        break;
      }
      continue;
    }
    ++found;
    sink.AddText(ToUtf8(page->text({}, poppler::page::non_raw_non_physical_layout)));
    sink.AddText("\n");
  }
  return found > 0;
}

}  // namespace

bool ReadPdf(const Document& document, ContentSink& sink, std::string& why) {
  sink.SetKind(Kind::DOCUMENT);
  // Damaged files make poppler write a line for each object on standard error.
  poppler::set_debug_error_function([](const std::string&, void*) {}, nullptr);
  std::string bytes;
  if (!ReadWhole(document, MAX_PDF, bytes, why)) {
    return false;
  }
  if (!IsPdf(bytes)) {
    why = "not a PDF file";
    return false;
  }
  const std::unique_ptr<poppler::document> pdf(
      poppler::document::load_from_raw_data(bytes.data(), static_cast<int>(bytes.size())));
  if (!pdf) {
    why = "damaged";
    return false;
  }
  if (pdf->is_locked()) {
    why = "encrypted";
    return false;
  }

  SetFields(*pdf, sink);
  if (pdf->pages() > 0) {
    sink.Set(ContentField::PAGES, int64_t{pdf->pages()});
  }
  if (!AddPages(*pdf, sink)) {
    why = "damaged";
    return false;
  }
  return true;
}

}  // namespace fileindexd
