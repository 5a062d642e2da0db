// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/hit_display.h"

#include <algorithm>
#include <string_view>

#include "base/utf8.h"
#include "index/content_text.h"
#include "index/entry_table.h"
#include "index/name_pattern.h"
#include "index/text_tokenizer.h"

namespace fileindexd {

namespace {

// A name as questions see it, and where each of its bytes came from.
struct SeenName {
  std::string text;
  std::vector<uint32_t> origins;
};

// For each byte of ToUtf8(name) the byte of `name` that it came from, and one more for the end.
std::vector<uint32_t> PlacesOfText(std::string_view name) {
  std::vector<uint32_t> places;
  for (size_t at = 0; at < name.size();) {
    const Utf8Character character = FirstCharacter(name.substr(at));
    for (size_t i = 0; i < character.length; ++i, ++at) {
      const size_t bytes = character.is_wrong ? ToUtf8(name.substr(at, 1)).size() : 1;
      places.insert(places.end(), bytes, static_cast<uint32_t>(at));
    }
  }
  places.push_back(static_cast<uint32_t>(name.size()));
  return places;
}

// What of it is no UTF-8 is seen as the sign that stands for such bytes.
SeenName Seen(std::string_view name, NameFolder& folder,
              std::string (NameFolder::*fold)(std::string_view, std::vector<uint32_t>*)) {
  SeenName seen;
  const std::string text = ToUtf8(name);
  seen.text = (folder.*fold)(text, &seen.origins);
  if (text != name) {
    const std::vector<uint32_t> places = PlacesOfText(name);
    for (uint32_t& origin : seen.origins) {
      origin = places[origin];
    }
  }
  return seen;
}

void AddMark(const SeenName& name, size_t start, size_t end, std::vector<Snippet::Mark>& marks) {
  if (end > start && end < name.origins.size() && name.origins[end] > name.origins[start]) {
    marks.push_back({name.origins[start], name.origins[end]});
  }
}

// A beginning marks its own letters alone.
void MarkWords(const WordLeaf& leaf, const SeenName& name,
               const std::vector<NameTokenizer::Place>& places, std::vector<Snippet::Mark>& marks) {
  const size_t count = leaf.tokens.size();
  for (size_t at = 0; count > 0 && at + count <= places.size(); ++at) {
    bool same = true;
    for (size_t i = 0; i < count && same; ++i) {
      const bool begins = leaf.node->is_beginning && i + 1 == count;
      const std::string& word = places[at + i].token;
      same = begins ? word.starts_with(leaf.tokens[i]) : word == leaf.tokens[i];
    }
    if (same) {
      const NameTokenizer::Place& last = places[at + count - 1];
      const size_t end = leaf.node->is_beginning
                             ? std::min(last.start + leaf.tokens.back().size(), last.end)
                             : last.end;
      AddMark(name, places[at].start, end, marks);
    }
  }
}

void MarkPieces(const QueryNode& node, const SeenName& name, NameFolder& folder,
                std::vector<Snippet::Mark>& marks) {
  std::vector<NamePieces::Place> places;
  if (NamePieces(node, folder).Fits(name.text, &places)) {
    for (const NamePieces::Place& place : places) {
      AddMark(name, place.start, place.end, marks);
    }
  }
}

// The dot is not marked.
void MarkEnding(const QueryNode& node, const SeenName& name, NameFolder& folder,
                std::vector<Snippet::Mark>& marks) {
  for (const std::string& ending : node.names) {
    const std::string tail = folder.Parts(ending);
    if (HasEnding(name.text, tail)) {
      AddMark(name, name.text.size() - tail.size(), name.text.size(), marks);
    }
  }
}

// Sorted, and those that meet made one.
std::vector<Snippet::Mark> Joined(std::vector<Snippet::Mark> marks) {
  std::sort(marks.begin(), marks.end(), [](const Snippet::Mark& a, const Snippet::Mark& b) {
    return a.start != b.start ? a.start < b.start : a.end < b.end;
  });
  std::vector<Snippet::Mark> joined;
  for (const Snippet::Mark& mark : marks) {
    if (!joined.empty() && mark.start <= joined.back().end) {
      joined.back().end = std::max(joined.back().end, mark.end);
    } else {
      joined.push_back(mark);
    }
  }
  return joined;
}

SeenName PartsOf(std::string_view name, NameFolder& folder) {
  return Seen(name, folder, &NameFolder::Parts);
}

// Parts of the question that are no leaves: they need no word.
void MarkPathsAndEndings(const QueryNode& node, const Entry& entry, NameFolder& folder,
                         std::vector<Snippet::Mark>& marks) {
  const std::string_view name = LastComponent(entry.path);
  if (node.part == Part::EXT && entry.kind != Kind::FOLDER) {
    std::vector<Snippet::Mark> in_name;
    MarkEnding(node, PartsOf(name, folder), folder, in_name);
    const size_t before = entry.path.size() - name.size();
    for (const Snippet::Mark& mark : in_name) {
      marks.push_back({mark.start + before, mark.end + before});
    }
  } else if (node.part == Part::PATH) {
    MarkPieces(node, PartsOf(entry.path, folder), folder, marks);
  } else if (node.part == Part::AND || node.part == Part::OR) {
    for (const QueryNode& below : node.below) {
      MarkPathsAndEndings(below, entry, folder, marks);
    }
  }
}

std::vector<Snippet::Mark> MarksInName(const Asked& asked, const std::string& path,
                                       NameMarker& marker) {
  const std::string_view name = LastComponent(path);
  const SeenName words = Seen(name, marker.folder, &NameFolder::Words);
  const SeenName parts = PartsOf(name, marker.folder);
  const std::vector<NameTokenizer::Place> places = marker.tokenizer.Places(words.text);
  std::vector<Snippet::Mark> marks;
  for (const WordLeaf& leaf : asked.leaves) {
    if (!leaf.is_positive) {
      continue;
    }
    if (leaf.node->part == Part::EXACT_NAME) {
      const bool is_whole = parts.text == marker.folder.Parts(leaf.node->text);
      AddMark(parts, 0, is_whole ? parts.text.size() : 0, marks);
    } else if (leaf.node->part == Part::NAME_PATTERN) {
      MarkPieces(*leaf.node, parts, marker.folder, marks);
    } else {
      MarkWords(leaf, words, places, marks);
    }
  }
  const size_t before = path.size() - name.size();
  for (Snippet::Mark& mark : marks) {
    mark.start += before;
    mark.end += before;
  }
  return marks;
}

}  // namespace

std::vector<Snippet::Mark> MarksInPath(const Asked& asked, const Entry& entry, NameMarker& marker) {
  std::vector<Snippet::Mark> marks = MarksInName(asked, entry.path, marker);
  MarkPathsAndEndings(asked.tree, entry, marker.folder, marks);
  return Joined(std::move(marks));
}

int AddSnippet(CandidateRows& rows, const Asked& asked, Candidate& candidate, TextCutter& cutter,
               Snippet& snippet) {
  std::vector<const QueryNode*> words;
  for (const WordLeaf& leaf : asked.leaves) {
    if (leaf.is_positive && !leaf.text_query.empty()) {
      words.push_back(leaf.node);
    }
  }
  int code = rows.NeedFacts(candidate);
  if (code != SQLITE_OK || words.empty() || !candidate.facts.has_value() ||
      candidate.facts->text == 0) {
    return code;
  }
  Statement* read = nullptr;
  code = rows.statements.Find("SELECT packed FROM contents.texts WHERE id = ?1", read);
  if (code != SQLITE_OK) {
    return code;
  }
  read->BindInt(1, candidate.facts->text);
  code = read->Step();
  if (code != SQLITE_ROW) {
    return code == SQLITE_DONE ? SQLITE_OK : code;
  }
  Content content;
  if (!UnpackTexts(read->Bytes(0), content)) {
    return SQLITE_CORRUPT;
  }
  snippet = MakeSnippet(content, words, cutter);
  return SQLITE_OK;
}

}  // namespace fileindexd
