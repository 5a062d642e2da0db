// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/query_slips.h"

#include <algorithm>

#include "index/letter_case.h"
#include "index/query.h"
#include "index/query_fields.h"
#include "index/query_names.h"
#include "index/query_piece.h"

namespace fileindexd {

namespace {

// What was compared with: a quoted text, or up to a blank or a bracket.
std::string ValueAt(std::string_view text) {
  if (text.starts_with('"')) {
    return std::string(text.substr(0, text.find('"', 1))) + '"';
  }
  const std::string_view value =
      text.substr(0, std::min(NextBlank(text, 0), text.find_first_of("()")));
  return std::string(value.substr(0, value.find_last_not_of("<>=") + 1));  // "from <bob@home>"
}

// ":)", ":-(". What ":(" begins may be what is meant for a field.
bool IsFace(std::string_view text) {
  return text.starts_with(":)") || text.starts_with(":-)") || text.starts_with(":-(") ||
         (text.starts_with(":(") && (text.size() == 2 || BlankAt(text, 2) > 0));
}

// The sign between a field and its value that stands at that byte: a comparison, or a colon that a
// blank parts from its field. Not the eyes of a face, nor the colons of "std ::x".
size_t SignAt(std::string_view text, size_t at, bool is_apart) {
  const std::string_view rest = text.substr(at);
  if (rest.starts_with("!=")) {
    return 2;
  }
  if (rest.starts_with(':')) {
    return is_apart && !rest.starts_with("::") && !IsFace(rest) ? 1 : 0;
  }
  return std::min(rest.find_first_not_of("<>="), rest.size());
}

// As it should have been written: "size:>10M".
std::string WrittenForm(const NamedField& field, std::string_view compared, std::string_view text) {
  std::string form = compared == "!=" ? "-" : "";
  form.append(field.name).append(":");
  if (TakesRange(field.field)) {
    const size_t sign = compared.find_first_of("<>");
    const bool is_compared = sign != std::string_view::npos;
    form += is_compared ? std::string(1, compared[sign]) : "";
    form += is_compared && compared.find('=') != std::string_view::npos ? "=" : "";
  }
  return form + ValueAt(text);
}

// "size>10M", "size > 10M", "text : whale".
QueryError ColonIsMissing(std::string_view text) {
  const size_t letters = LettersAtStart(text);
  const size_t start = SkipBlanksAt(text, letters);
  const bool is_apart = start > letters;
  const size_t size = letters > 0 && start < text.size() ? SignAt(text, start, is_apart) : 0;
  const NamedField* field = size > 0 ? FindField(text.substr(0, letters)) : nullptr;
  if (field == nullptr) {
    return {};
  }
  const std::string_view compared = text.substr(start, size);
  const std::string name = Cited(text.substr(0, letters));
  QueryError error;
  error.what = is_apart ? "behind the field " + name + " stands a colon and no blank"
                        : "a colon is missing behind " + name;
  error.example = WrittenForm(*field, compared, text.substr(SkipBlanksAt(text, start + size)));
  error.example_at = error.what.size();
  error.what += is_apart ? " (as a word it stands in quotes)"
                         : std::string(" (a word with ") + compared.front() + " stands in quotes)";
  return error;
}

// "sise:10M", "foo:>3".
std::string WhyNoField(std::string_view text) {
  const size_t letters = LettersAtStart(text);
  if (letters == 0 || letters + 1 >= text.size() || text[letters] != ':' ||
      BlankAt(text, letters + 1) > 0) {
    return "";
  }
  const std::string_view value = text.substr(letters + 1);
  if (value.starts_with("//") || value.starts_with(':')) {
    return "";
  }
  const char* near = NearField(text.substr(0, letters));
  const char first = value.front();
  if (near == nullptr && first != '<' && first != '>' && first != '"') {
    return "";
  }
  return "there is no field " + Cited(text.substr(0, letters)) +
         (near == nullptr ? "" : "; '" + std::string(near) + "'?") +
         " (a word with a colon stands in quotes)";
}

std::string WhyLeftOutTwice(std::string_view text) {
  const size_t first = text.find_first_not_of('-');
  if (!text.starts_with("--") || first == std::string_view::npos) {
    return "";
  }
  const bool is_followed = text[first] == '"' || text[first] == '(' ||
                           HoldsWords(text.substr(first, NextBlank(text, first) - first));
  return is_followed ? "one '-' leaves out (a word that begins with two stands in quotes)" : "";
}

}  // namespace

QueryError MeantOtherwise(std::string_view text) {
  QueryError error = ColonIsMissing(text);
  if (error.what.empty()) {
    error.what = WhyNoField(text);
  }
  if (error.what.empty()) {
    error.what = WhyLeftOutTwice(text);
  }
  return error;
}

// Between two others, "not" in front of one at least. What an option says was not written there.
std::string SmallOperator(const QueryNode& node) {
  const auto is_written = [](const QueryNode& part) { return part.end > part.start; };
  for (size_t i = 0; i < node.below.size(); ++i) {
    const QueryNode& part = node.below[i];
    const bool is_bare = part.part == Part::WORD && !part.is_phrase &&
                         (part.scope == Scope::ANY || part.shared_field != nullptr);
    const bool has_next = i + 1 < node.below.size() && is_written(node.below[i + 1]);
    const bool is_two_sided = IsSameName(part.text, "or") || IsSameName(part.text, "and");
    const bool is_operator = (is_two_sided && i > 0) || IsSameName(part.text, "not");
    if (node.part == Part::AND && is_bare && has_next && is_operator) {
      return part.text;
    }
    std::string inner = SmallOperator(part);
    if (!inner.empty()) {
      return inner;
    }
  }
  return "";
}

}  // namespace fileindexd
