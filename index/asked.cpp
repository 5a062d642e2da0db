// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/asked.h"

#include <ctime>
#include <utility>

#include "base/utf8.h"
#include "index/contents_schema.h"
#include "index/name_marker.h"
#include "index/query_reach.h"
#include "index/search.h"
#include "index/text_tokenizer.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

// Adds what the options say to what the text says.
void AddOptions(const Question& question, size_t end, QueryNode& tree) {
  std::vector<QueryNode> options;
  if (question.kind.has_value()) {
    QueryNode& kind = options.emplace_back();
    kind.part = Part::KIND;
    kind.numbers = {static_cast<int64_t>(*question.kind)};
  }
  if (!question.under.empty()) {
    QueryNode& under = options.emplace_back();
    under.part = Part::UNDER;
    under.names = {question.under};
  }
  if (options.empty()) {
    return;
  }
  if (tree.part != Part::AND) {
    QueryNode all;
    all.part = Part::AND;
    all.end = end;
    all.below.push_back(std::move(tree));
    tree = std::move(all);
  }
  for (QueryNode& option : options) {
    option.start = option.end = end;
    tree.below.push_back(std::move(option));
  }
}

// Where the character begins that is at `at` of ToUtf8(bytes).
size_t ByteOf(std::string_view bytes, size_t at) {
  size_t byte = 0;
  for (size_t done = 0; done < at && byte < bytes.size();) {
    const size_t length = FirstCharacter(bytes.substr(byte)).length;
    done += ToUtf8(bytes.substr(byte, length)).size();
    byte += length;
  }
  return byte;
}

// A path is its bytes, and they need not be UTF-8: they are taken from the question as it came.
void TakePaths(const std::string& bytes, QueryNode& node) {
  for (QueryNode& below : node.below) {
    TakePaths(bytes, below);
  }
  if (node.part == Part::UNDER) {
    const size_t start = ByteOf(bytes, node.text_at);
    const size_t end = ByteOf(bytes, node.text_at + node.text.size());
    node.names = {NormalPath(bytes.substr(start, end - start)).value_or(node.names.front())};
  }
}

void ReadLeaves(const QueryNode& node, bool is_positive, const NameTokenizer& tokenizer,
                NameFolder& folder, Asked& asked) {
  for (const QueryNode& below : node.below) {
    ReadLeaves(below, is_positive != (node.part == Part::NOT), tokenizer, folder, asked);
  }
  switch (node.part) {
    case Part::WORD:
    case Part::NAME_PATTERN:
    case Part::EXACT_NAME:
      break;
    case Part::NEAR:
    case Part::HAS:
    case Part::CONTENT:
    case Part::KIND:
      asked.needs_contents = true;
      return;
    case Part::RANGE:
      asked.needs_contents = asked.needs_contents || node.column == Column::FIELD;
      return;
    case Part::IS:
      asked.needs_contents = asked.needs_contents || node.property == Property::DUPLICATE;
      return;
    default:
      return;
  }

  WordLeaf& leaf = asked.leaves.emplace_back();
  leaf.node = &node;
  leaf.is_positive = is_positive;
  if (node.part == Part::NAME_PATTERN) {
    return;
  }
  if (node.scope == Scope::ANY || node.scope == Scope::NAME) {
    const std::string words = folder.Words(node.text);
    leaf.tokens = tokenizer.Tokens(words);
    leaf.names_query = node.part == Part::EXACT_NAME
                           ? Quoted(words + " " + NAME_END)
                           : Quoted(words) + (node.is_beginning ? " *" : "");
  }
  if (node.part == Part::WORD) {
    leaf.text_query = TextQueryOf(node);
    asked.needs_contents = asked.needs_contents || node.scope != Scope::NAME;
  }
}

}  // namespace

bool Asked::Read(const Question& question, NameMarker& names, std::string& error) {
  if (!question.under.empty() && NormalPath(question.under) != question.under) {
    error = "not a plain absolute path: " + question.under;
    return false;
  }
  text = ToUtf8(question.text);
  QueryError wrong;
  if (!ParseQuery(text, time(nullptr), tree, wrong)) {
    error = wrong.Line(text);
    return false;
  }
  if (text != question.text) {
    TakePaths(question.text, tree);
  }
  if (!names.Open()) {
    error = "out of memory";
    return false;
  }
  AddOptions(question, text.size(), tree);
  ReadLeaves(tree, true, names.tokenizer, names.folder, *this);
  shares = ReachedShares(tree, question);
  return true;
}

const WordLeaf* Asked::LeafOf(const QueryNode& node) const {
  for (const WordLeaf& leaf : leaves) {
    if (leaf.node == &node) {
      return &leaf;
    }
  }
  return nullptr;
}

std::string ColumnName(ContentField field) {
  return ColumnAt(WORD_COLUMNS, FIRST_FIELD_COLUMN + static_cast<size_t>(field) - 1);
}

std::string TextQueryOf(const QueryNode& node) {
  std::string query =
      TextQuery(node.is_beginning && !node.text.ends_with('*') ? node.text + "*" : node.text);
  switch (node.scope) {
    case Scope::ANY:
      return query;
    case Scope::TEXT:
      return "{text} : " + query;
    case Scope::FIELD:
      return "{" + ColumnName(node.field) + "} : " + query;
    case Scope::NAME:
      break;
  }
  return "";
}

}  // namespace fileindexd
