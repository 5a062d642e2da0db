// SPDX-License-Identifier: GPL-2.0-or-later
// The least that the readers under test ask of the others.
#include "extract/format.h"
#include "extract/memory_file.h"

namespace fileindexd {

void ContentSink::AddText(std::string_view bytes) {
  for (const char c : bytes) {
    if (content.text.size() >= text_cap) {
      content.is_cut = true;
      return;
    }
    const bool is_blank = static_cast<unsigned char>(c) <= ' ';
    if (!is_blank) {
      content.text += c;
    } else if (!content.text.empty() && content.text.back() != ' ') {
      content.text += ' ';
    }
  }
}

void ContentSink::Set(ContentField field, std::string_view text) {
  const bool gathers = field == ContentField::KEYWORDS || field == ContentField::MEMBERS ||
                       field == ContentField::ATTACHMENTS || field == ContentField::TO;
  const char* separator =
      field == ContentField::MEMBERS || field == ContentField::ATTACHMENTS ? "\n" : ", ";
  if (text.empty()) {
    return;
  }
  for (TextField& known : content.texts) {
    if (known.field == field) {
      if (gathers && known.text.size() + text.size() < MAX_FIELD) {
        known.text.append(separator).append(text);
      }
      return;
    }
  }
  content.texts.push_back({field, std::string(text.substr(0, MAX_FIELD))});
}

void ContentSink::Set(ContentField field, int64_t number) {
  for (const NumberField& known : content.numbers) {
    if (known.field == field) {
      return;
    }
  }
  content.numbers.push_back({field, number});
}

bool ReadText(const Document& document, ContentSink& sink, std::string& why) {
  std::string bytes;
  if (!ReadWhole(document, 1 << 26, bytes, why)) {
    return false;
  }
  sink.AddText(bytes);
  return true;
}

bool ReadHtml(const Document& document, ContentSink& sink, std::string& why) {
  std::string bytes;
  if (!ReadWhole(document, 1 << 26, bytes, why)) {
    return false;
  }
  bool is_tag = false;
  for (const char c : bytes) {
    is_tag = c == '<' || is_tag;
    sink.AddText(is_tag ? " " : std::string_view(&c, 1));
    is_tag = is_tag && c != '>';
  }
  return true;
}

}  // namespace fileindexd
